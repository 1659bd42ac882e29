// A second matcher for the tests, and the checks built on it. The reference is a plain recursive
// interpreter over the syntax tree with continuations for backtracking: it shares only the
// parser with the engine (no program, no stack), so the two must agree on every pattern the
// parser accepts.
#pragma once

#include "http/pattern/RegexException.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace KelvraTest
{

const wchar_t* const kNoMatch = nullptr;
const wchar_t* const kNotCaptured = nullptr;

// A pattern, a text, and the match expected: the text matched (or kNoMatch), where it starts,
// and what each group captured (or kNotCaptured).
struct MatchRow
{
    const wchar_t* pattern;
    const wchar_t* text;
    const wchar_t* match;
    size_t at;
    std::vector<const wchar_t*> captures;
};

// Matches each row within a time limit and with a bounded stack (a match that runs away fails its
// row instead of stalling the program or taking all memory), and checks the result, where the
// matcher stopped, and agreement with the reference.
void ExpectMatches(const std::vector<MatchRow>& rows);

// A pattern, a text, and the entries ExtractPatternGroups should give.
struct ExtractionRow
{
    std::wstring pattern;
    std::wstring text;
    std::vector<std::wstring> entries;
};

// Extracts each row, checks the entries and agreement with the literal algorithm (for every
// search position a fresh lowered copy of the rest of the text, and a case-insensitive comparison
// with each earlier entry).
void ExpectExtractions(const std::vector<ExtractionRow>& rows);

// Whether CRegexPattern::Match and the reference agree on whether, where and with which captures
// the pattern matches the text. A pattern that does not compile agrees trivially.
testing::AssertionResult AgreesWithReference(const std::wstring& pattern, const std::wstring& text);

// ExtractPatternGroups against the literal algorithm: the same entries and the same exception.
testing::AssertionResult ExtractionAgreesWithReference(const std::wstring& pattern, const std::wstring& text);

// The code of the CRegexException that call throws; 0 when it throws none.
template <typename Call> std::uint32_t ThrownCode(Call call)
{
    try
    {
        call();
    }
    catch (const CRegexException& exception)
    {
        return static_cast<std::uint32_t>(exception.Code());
    }
    return 0;
}

} // namespace KelvraTest
