// A second matcher for the tests: a plain recursive interpreter over the syntax tree, with
// continuations for backtracking. It shares only the parser with the engine (no program, no
// stack), so the two must agree on every pattern the parser accepts.
#pragma once

#include "http/RegexSyntax.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <string>
#include <utility>
#include <vector>

namespace KelvraTest
{

struct ReferenceSpan
{
    static constexpr size_t kNone = static_cast<size_t>(-1);
    size_t start = kNone;
    size_t end = kNone;
};

struct ReferenceResult
{
    bool matched = false;
    size_t start = 0;
    size_t end = 0;
    std::vector<ReferenceSpan> captures;
};

class ReferenceMatcher
{
public:
    // text is read up to its first NUL; case is ignored the way the engine ignores it.
    ReferenceMatcher(const KelvraRegex::SyntaxTree& tree, const std::wstring& text);

    // Tries start positions from `from` on, leftmost first; captures carry over from one attempt
    // to the next, as they do in the engine.
    ReferenceResult Search(size_t from);

private:
    using Next = std::function<bool(size_t)>;

    bool Match(const KelvraRegex::Node& node, size_t pos, const Next& next);
    bool MatchUnits(const KelvraRegex::Node& sequence, size_t index, size_t pos, const Next& next);
    bool MatchRepeat(const KelvraRegex::Node& repeat, size_t pos, const Next& next);
    bool GreedyTurns(const KelvraRegex::Node& repeat, size_t pos, const Next& next, bool again);
    bool LazyTurns(const KelvraRegex::Node& repeat, size_t pos, const Next& next);

    const KelvraRegex::SyntaxTree& m_tree;
    std::wstring m_text;
    std::vector<ReferenceSpan> m_captures;
};

// ExtractPatternGroups done the slow, literal way: for every search position a fresh lowered
// copy of the rest of the text, and a case-insensitive comparison with each earlier entry.
// Sets *threw when the engine is expected to throw (a match, but no capture group).
std::vector<std::wstring> ReferenceExtract(const std::wstring& pattern, const std::wstring& text,
                                           bool* threw);

// Runs CRegexPattern::Match and the reference matcher on the same pattern and text and compares
// whether they match, where the match lies and every capture. A pattern that does not compile
// agrees trivially (the parser is shared).
testing::AssertionResult AgreesWithReference(const std::wstring& pattern, const std::wstring& text);

// ExtractPatternGroups against ReferenceExtract: the same result, entries and exception.
testing::AssertionResult ExtractionAgreesWithReference(const std::wstring& pattern, const std::wstring& text);

// A pattern or text for a failure message, control characters escaped.
std::string Printable(const std::wstring& text);

} // namespace KelvraTest
