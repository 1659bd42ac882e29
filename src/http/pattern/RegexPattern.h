// The library's own small pattern matcher, used by the HTTP client to read fields out of
// response headers. Always case-insensitive (A-Z fold to a-z, nothing else changes). Syntax:
//   {x} capture group (numbered from 0 by its opening brace)   (x) group without capture
//   [a-z] [^a-z] classes ("\t" inside is a tab)   . any character   \0 \1 back-references
//   x|y choice between the two quantified atoms beside it ("ab|cd" is a(b|c)d)
//   * + ? greedy, *? +? ?? lazy   !x negative look-ahead of one atom
//   \a letter or digit  \b blank or tab  \c letter  \d digit  \h hex digit  \n line end
//   \q double-quoted string  \w letters  \z digits   \other: that character ("\t" is t)
//   ^ first: one attempt only, at the start   $ last: the end of the text
// Matching finds the leftmost match, resolving choices in the order written (not the longest).
#pragma once

#include "http/pattern/RegexProgram.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace KelvraRegex
{

// A text lowered once, for any number of matches; positions found in it are the same offsets in
// the original text, which keeps its case for the captures.
class LoweredText
{
public:
    // Reads original up to its first NUL; original must outlive this object. Throws
    // std::bad_alloc.
    explicit LoweredText(const wchar_t* original);

    const wchar_t* Original() const { return m_original; }
    // Followed by two NULs (its own and the string's), so that one step past the end of the text
    // still reads a terminator.
    const wchar_t* Lowered() const { return m_lowered.c_str(); }
    size_t Length() const { return m_length; }

private:
    const wchar_t* m_original;
    size_t m_length;
    std::wstring m_lowered;
};

} // namespace KelvraRegex

// The state of one match: where it lies, its captures, and the backtracking stack. Reusable for
// any number of successive matches; one caller at a time.
class CRegexMatchContext
{
public:
    static constexpr size_t kUnlimited = static_cast<size_t>(-1);

    // The stack starts with initialStackEntries entries and grows as needed up to stackLimit
    // entries; a match that needs more ends without a match. Throws std::bad_alloc.
    explicit CRegexMatchContext(size_t initialStackEntries = 256, size_t stackLimit = kUnlimited);

    // A capture as positions in the text last matched: the characters from start up to, not
    // including, end. Null positions: the group took no part in the match.
    struct Capture
    {
        const wchar_t* start;
        const wchar_t* end;
    };

    std::uint32_t GroupCount() const { return m_groupCount; }
    // Throws CRegexException(kFailure) unless group < GroupCount().
    Capture Group(std::uint32_t group) const;
    // Where the successful (or last tried) attempt began, and where the match ended (null after
    // a failed match).
    const wchar_t* MatchStart() const { return At(m_matchStart); }
    const wchar_t* MatchEnd() const { return At(m_matchEnd); }
    // Entries the backtracking stack holds room for.
    size_t StackSize() const { return m_stack.size(); }
    // Whether the last match ended because memory ran out, its false saying nothing of the text.
    bool OutOfMemory() const { return m_outOfMemory; }

private:
    friend class CRegexPattern;

    static constexpr std::uint64_t kNull = static_cast<std::uint64_t>(-1);

    struct Span
    {
        std::uint64_t start;
        std::uint64_t end;
    };

    const wchar_t* At(std::uint64_t offset) const { return offset == kNull ? nullptr : m_text + offset; }
    // Fresh captures and slots for a match over text; false when memory runs out.
    bool Prepare(std::uint32_t groupCount, std::uint32_t slotCount, const wchar_t* text);
    // Makes room for an entry at depth; false when the stack cannot grow (the match then ends:
    // no entry may be lost).
    bool Grow(size_t depth);

    std::uint32_t m_groupCount = 0;
    std::uint64_t m_matchStart = kNull;
    std::uint64_t m_matchEnd = kNull;
    std::vector<std::uint64_t> m_slots;
    std::vector<Span> m_captures;
    std::vector<std::uint64_t> m_stack;
    size_t m_depth = 0;
    size_t m_stackLimit;
    bool m_outOfMemory = false;
    const wchar_t* m_text = nullptr;
};

// A compiled pattern. Owns its program; one caller at a time.
class CRegexPattern
{
public:
    CRegexPattern() = default;

    // Compiles pattern (null reads as empty), replacing any earlier program. Returns 0 or a
    // compile error code (KelvraRegex::CompileError), also kept as LastError(); after an error
    // the pattern matches nothing. Never throws std::bad_alloc: memory running out, a pattern
    // nested more than 200 deep, or a program that would pass 16,384 instructions (nested '+'
    // doubles its body's code) gets 1.
    int Parse(const wchar_t* pattern);

    // Searches text (up to its first NUL) from its start. Returns true on a match; false when
    // there is none, the pattern is not compiled, text is null, memory runs out (then
    // context.OutOfMemory()) or the stack reaches its limit. Never throws std::bad_alloc. context then holds
    // the match and captures as positions in text; *end, if given, is where the matcher stopped (the end of
    // the match on success). Throws CRegexException(kInvalidArgument) should the program jump outside itself.
    bool Match(const wchar_t* text, CRegexMatchContext& context, const wchar_t** end = nullptr) const;

    // The same search over a text lowered beforehand, from offset from (at most its length);
    // positions refer to text.Original().
    bool Match(const KelvraRegex::LoweredText& text, size_t from, CRegexMatchContext& context,
               const wchar_t** end = nullptr) const;

    int LastError() const { return m_lastError; }
    std::uint32_t GroupCount() const { return m_program.groupCount; }
    std::uint32_t SlotCount() const { return m_program.slotCount; }
    // True until the first compile: every compiled pattern ignores case.
    bool IsCaseSensitive() const { return m_caseSensitive; }

private:
    // Runs the program; position receives where execution stopped.
    bool Run(const wchar_t* text, size_t length, size_t from, CRegexMatchContext& context,
             size_t& position) const;

    int m_lastError = 0;
    KelvraRegex::Program m_program;
    bool m_caseSensitive = true;
};
