// INI files: INIReader loads a whole file once, in its constructor, and answers look-ups by
// section and name as text, integer, real number or boolean, each with a caller's default.
#pragma once

#include "KelvraApi.h"

#include <map>
#include <string>

// File format, as the reader understands it:
// - The file is read byte by byte in text mode: each byte becomes the character of the same
//   value (UTF-8 is not decoded: U+00E9 arrives as U+00C3 U+00A9), CR LF becomes LF and a byte
//   0x1A ends the file. A UTF-8 byte-order mark on the first line is skipped. This assumes the
//   host keeps the C runtime's default "C" locale.
// - "[section]" starts a section (blanks inside the brackets belong to the name); "name = value"
//   or "name: value" is a pair ("=" wins over ":" anywhere in the line). Pairs before the first
//   header belong to the section "".
// - ";" or "#" as the first non-blank character makes a comment line; ";" after a blank starts
//   an inline comment. A line that begins with a blank continues the previous pair's value.
// - White space is U+0009..U+000D and U+0020 only: the bytes 0x85 and 0xA0 are kept, since in
//   UTF-8 they end letters such as U+00C5 and U+00E0.
// - A read takes at most 199 characters and line numbers count reads, so a longer line uses one
//   number per 199 characters (a line of exactly 199 uses two: its line end is read alone).
//   Only the first 199 characters of a longer line are parsed: it is kept when its content ends
//   there (a comment, a header closed there, a pair or continuation with only blanks beyond,
//   or a pair whose inline comment starts there or beyond), and is a bad line otherwise (its
//   value is never cut short, its tail never becomes a pair).
// - Section names and names longer than 49 characters are not cut: their line is bad.
// - Nothing after such a refused line is filed under an earlier name or section: indented lines
//   after a refused pair continue nothing, and pairs after a refused header are dropped up to
//   the next good header.
//
// Queries only read the table: several threads may query one reader as long as none assigns to
// it meanwhile.
class KELVRA_API INIReader
{
public:
    // Reads the whole file; the reader holds no file open afterwards. A file that cannot be
    // opened (missing, a folder, no access) gives ParseError() == -1 and an empty table.
    // Throws std::bad_alloc when memory runs out while reading; the file is closed then and
    // nothing is kept.
    explicit INIReader(const std::wstring& fileName);
    INIReader(const INIReader& other);
    INIReader& operator=(const INIReader& other);
    ~INIReader();

    // 0: every line read fine; -1: the file could not be opened; otherwise the number of the
    // first bad line. The pairs of all good lines are stored either way.
    int ParseError() const;

    // The first non-empty value the file gave for section and name, else defaultValue. Section
    // and name match exactly except for the case of A-Z (no trimming, other letters exact).
    // Look-ups copy strings and, like any std::wstring, may throw std::bad_alloc.
    std::wstring Get(std::wstring section, std::wstring name, std::wstring defaultValue) const;
    // The value read like wcstol in base 0 ("0x1f" hexadecimal, "017" octal, "-7", "12abc" is
    // 12), saturated to the int range; defaultValue when no number starts the value.
    int GetInteger(std::wstring section, std::wstring name, int defaultValue) const;
    // Decimal notation only, with a point whatever the host's locale: "2.5", "-1e3", ".5";
    // "12kg" is 12. Infinity, NaN and hexadecimal forms give defaultValue; a number beyond
    // the double range gives +-HUGE_VAL, one too small for it 0.
    double GetReal(std::wstring section, std::wstring name, double defaultValue) const;
    // true for "true", "yes", "on", "1" and false for "false", "no", "off", "0" (A-Z in any
    // case, nothing around them); any other value gives defaultValue.
    bool GetBoolean(std::wstring section, std::wstring name, bool defaultValue) const;

private:
    static std::wstring MakeKey(std::wstring section, std::wstring name);
    static int ValueHandler(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value);

    std::map<std::wstring, std::wstring> m_values;
    int m_error;
};
