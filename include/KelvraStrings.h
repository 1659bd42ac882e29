// String, Base64 and time-stamp utilities: static functions, no state, safe on any thread.
// Letter case and character classes are ASCII only ("C" locale): nothing above U+007F is a
// letter, digit or white space to these functions.
#pragma once

#include "KelvraApi.h"

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace KelvraStrings
{

class KELVRA_API Strings
{
public:
    // Does nothing: the class has no state.
    Strings& operator=(const Strings& other);

    // printf-style formatting with Microsoft rules: in the wide variant %s takes a wide string
    // and %hs a narrow one. No length limit. A format the runtime rejects gives "". The result
    // ends at the first NUL the format produces (a %c of 0, say).
    static std::wstring Format(const wchar_t* format, ...);
    static std::string Format(const char* format, ...);

    // Decimal text of value ("-42"), independent of the global locale.
    static std::wstring ToString(int value);
    // Widens each byte up to the first NUL to the code unit of the same value (0xE9 -> U+00E9);
    // no multi-byte decoding.
    static std::wstring ToString(const std::string& text);

    // Lowers A-Z in place and returns a copy of the lowered text.
    static std::wstring ToLower(std::wstring& text);
    // value in a field of at least width characters, zeros in front of the whole text, sign
    // included: (7, 2) -> "07", (-5, 3) -> "0-5", (123, 2) -> "123".
    static std::wstring Padd(int value, int width);
    // Removes leading U+0009..U+000D and U+0020 in place; returns the same string.
    static std::wstring& TrimLeft(std::wstring& text);

    // Reads up to 8 hexadecimal digits (no prefix, sign or blanks) into *output (a DWORD).
    // Returns 1 on success or for empty text (output untouched), 2 for more than 8 characters
    // (output untouched), 4 at a non-digit (output then holds the value of the digits to its
    // right). A null text counts as empty; a null output is never written.
    static int HexToInt(const wchar_t* text, unsigned long* output);

    // Splits at each occurrence of delimiter: "a,,b" -> a, "", b; "a," -> a; "" -> nothing.
    // After a match the next token starts one character after the match's start, so with a
    // longer delimiter its tail begins the next token. An empty or null delimiter throws
    // std::out_of_range.
    static std::vector<std::string> Split(const std::string& text, const char* delimiter);
    // Leading blanks, an optional sign and decimal digits, up to the first NUL: "42abc" -> 42,
    // "abc" -> 0. Values beyond the int range are clamped to INT_MIN / INT_MAX.
    static int ToInt(const std::string& text);

    // Standard Base64 (RFC 4648 alphabet, '=' padding, no line breaks). count == 0 reads nothing.
    static std::string ToBase64(const unsigned char* bytes, std::uint32_t count);
    // Decodes up to the end, the first '=' or the first character outside the alphabet and
    // returns the bytes decoded so far (NUL bytes included). Never fails: bad text gives a
    // shorter result; a lone last character of a group is ignored.
    static std::string FromBase64(const std::string& text);

private:
    static bool isBase64(unsigned char c);
    static std::string b64chars();
};

} // namespace KelvraStrings

namespace KelvraTime
{

class KELVRA_API Time
{
public:
    // Does nothing: the class has no state.
    Time& operator=(const Time& other);

    // Universal time, "dd-MM-yyyy hh:mm:ss.f": "04-12-2026 09:05:03.7" (milliseconds unpadded).
    static std::wstring Now();
    // Local time with no separators: "041220260905037". Trace lines carry this stamp.
    static std::wstring NowLocal();
};

} // namespace KelvraTime
