// CRegexPattern, a table per construct, then hostile input. Each match runs on a worker thread with
// a time limit and a bounded stack, so that a match that never ends or runs away fails its row, not
// the program; the worker shares what it uses, as it may outlive the row.
#include "http/pattern/RegexPattern.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace
{

// A pattern, a text and the match expected: "none", or where it starts, ':' and the text matched,
// then each group's capture in braces or "-" for a group that took no part ("0:Aab {a} -").
using MatchRow = std::array<const wchar_t*, 3>;

// Checks each row, and that the matcher stopped within the text (one step past its end after "$").
void ExpectMatches(const std::vector<MatchRow>& rows)
{
    constexpr size_t kStackLimit = 1 << 20; // far more than any row needs, filled in a moment
    for (const auto& [pattern, text, expected] : rows)
    {
        SCOPED_TRACE("pattern " + testing::PrintToString(pattern) + " text " + testing::PrintToString(text));
        const auto compiled = std::make_shared<CRegexPattern>();
        const auto context = std::make_shared<CRegexMatchContext>(256, kStackLimit);
        const auto end = std::make_shared<const wchar_t*>(nullptr);
        ASSERT_EQ(compiled->Parse(pattern), 0);
        std::packaged_task<bool()> task([=, text = text]
                                        { return compiled->Match(text, *context, end.get()); });
        std::future<bool> matched = task.get_future();
        std::thread worker(std::move(task));
        // Generous: on a loaded machine a new thread can wait seconds for its first turn. Joined
        // otherwise, so that no thread of a finished row is still ending when the program exits.
        if (matched.wait_for(std::chrono::seconds(30)) != std::future_status::ready)
        {
            worker.detach();
            FAIL() << "the match does not end";
        }
        worker.join();
        EXPECT_LT(context->StackSize(), kStackLimit) << "the match ran away";
        const wchar_t* const textEnd = text + std::char_traits<wchar_t>::length(text);
        std::wstring found = L"none";
        if (matched.get())
        {
            EXPECT_EQ(*end, context->MatchEnd());
            found = std::to_wstring(context->MatchStart() - text) + L":" +
                    std::wstring(context->MatchStart(), std::min(context->MatchEnd(), textEnd));
            for (std::uint32_t group = 0; group < context->GroupCount(); ++group)
            {
                const CRegexMatchContext::Capture capture = context->Group(group);
                found += capture.start ? L" {" + std::wstring(capture.start, capture.end) + L"}" : L" -";
            }
        }
        ASSERT_NE(*end, nullptr);
        EXPECT_LE(*end, textEnd + (found == L"none" ? 0 : 1));
        EXPECT_EQ(found, expected);
    }
}

} // namespace

TEST(RegexCharacters, LiteralsClassesAndAbbreviationsMatchAsTabled)
{
    ExpectMatches({
        {L"abc", L"xABcx", L"1:ABc"},
        {L"a\\.c", L"abc a.c", L"4:a.c"},
        {L"[a-a]", L"ba", L"1:a"},
        {L"[^a-c]", L"abcd", L"3:d"},
        {L"[\\t]", L"at\tb", L"2:\t"},
        // The high end of a range is taken as it stands: "\" here, so the range is ! to \.
        {L"[!-\\]", L"a\\", L"1:\\"},
        {L"\\t", L"a\tbt", L"3:t"},
        {L"a$b", L"xa$b", L"1:a$b"},
        {L"\\a+", L"--x9--", L"2:x9"},
        {L"\\b+", L"x \t y", L"1: \t "},
        {L"\\c+", L"12ab3", L"2:ab"},
        {L"\\D+", L"ab12c", L"2:12"},
        {L"\\h+", L"xyzBEEFg", L"3:BEEF"},
        {L"\\w", L"12abc3", L"2:abc"},
        {L"\\z", L"ab123", L"2:123"},
        // A CR alone is tried first, so before CR LF the match is the CR.
        {L"{.+?}\\n", L"abc\r\nd", L"0:abc\r {abc}"},
        // Only the double-quoted half of "q" is compiled.
        {L"\\q", L"x\"ab\"y", L"1:\"ab\""},
        {L"\\q", L"'ab'", L"none"},
    });
}

TEST(RegexGroups, CapturesAlternativesAndBackReferencesMatchAsTabled)
{
    ExpectMatches({
        // Groups are numbered by their opening braces; each turn overwrites the capture.
        {L"{a{b}}", L"ab", L"0:ab {ab} {b}"},
        {L"{a}*b", L"Aab", L"0:Aab {a}"},
        // A turn of "?" that consumed nothing is undone, capture included.
        {L"{a?}?b", L"b", L"0:b -"},
        // Backtracking out of a group gives back its earlier capture.
        {L"({a}x)|(ab)", L"ab", L"0:ab -"},
        // Everything from a character that cannot start a unit on is ignored.
        {L"ab)cd", L"xab", L"1:ab"},
        {L"{.}\\0", L"xaA", L"1:aA {a}"},
        {L"{a}?b\\0", L"b", L"0:b -"},
        {L"{a}{b}\\1\\0", L"abba", L"0:abba {a} {b}"},
        // Inside its own group the capture has no end yet and counts as empty.
        {L"{a\\0}b", L"ab", L"0:ab {a}"},
        // '|' binds the quantified atoms beside it; the first alternative that lets the rest match
        // wins, not the longest.
        {L"ab|cd", L"abd", L"0:abd"},
        {L"{(a)|(ab)}", L"ab", L"0:a {a}"},
        {L"{(a)|(ab)}c", L"abc", L"0:abc {ab}"},
        // A '|' with no unit before it is a character; with none after it the unit is dropped.
        {L"|a", L"x|a", L"1:|a"},
        {L"xa|", L"yxa", L"1:x"},
    });
}

TEST(RegexQuantifiersAndAssertions, LoopsAndLookAheadsMatchAsTabled)
{
    ExpectMatches({
        {L"ba+?", L"baa", L"0:ba"},
        {L"{.*}b", L"aabab", L"0:aabab {aaba}"},
        // '.' takes characters beyond ASCII too, also where the loop decides whether to take one more.
        {L"{.*}", L"a\u00e9b", L"0:a\u00e9b {a\u00e9b}"},
        // A lazy turn starts where the loop was, though what follows it consumed "a" before failing.
        {L"{.*?}ab", L"xaab", L"0:xaab {xa}"},
        // The capture must never take in a character its class refuses.
        {L"{[a-z]*?}12", L"ab1a12", L"3:a12 {a}"},
        // A second quantifier is an ordinary character, as is one with nothing to repeat.
        {L"a*??", L"a?", L"0:a?"},
        {L"*a", L"x*a", L"1:*a"},
        // Look-ahead and anchors consume nothing. An atom that fails part-way gives back what it
        // consumed; two make a positive look-ahead.
        {L"!a.", L"ab", L"1:b"},
        {L"!(ab).", L"ac", L"0:a"},
        {L"!!a.", L"ba", L"1:a"},
        {L"!a*b", L"b", L"0:b"},
        {L"a!$", L"aa", L"0:a"},
        // "^" allows one attempt only; no attempt starts at the end of a non-empty text.
        {L"^ab", L"cab", L"none"},
        {L"$", L"ab", L"none"},
        {L"$", L"", L"0:"},
        {L"a*$", L"baa", L"1:aa"},
    });
}

TEST(RegexCompileErrors, ReportTheirCodesAndMatchNothing)
{
    const std::vector<std::pair<int, std::vector<const wchar_t*>>> codes = {
        {2, {L"{abc", L"{(a)"}},
        {3, {L"(abc", L"{(a}"}},
        {4, {L"[abc", L"[a-]", L"[a-", L"[", L"[^", L"[\\", L"[!-\\"}},
        {0, {L"", L"(a*)?", L"(a*)??", L"{a}\\0*", L"!a*", L")", L")abc"}},
        {6, {L"[]", L"[^]", L"[]a]"}},
        // Back-references read every digit: "\10" is group 10, not group 1 and a '0'.
        {7, {L"\\1", L"\\0", L"{a}\\1", L"{a\\1}", L"{a}{b}\\10", L"{a}\\99999999999999999999999"}},
        // The pattern is lowered first: Z-a becomes z-a.
        {8, {L"[z-a]", L"[Z-a]"}},
        // Every lazy quantifier counts as able to match nothing.
        {9, {L"(a*)*", L"(a*)+", L"{}*", L"()+?", L"(a?)*?", L"(a+?)*", L"(a|b*)+", L"(!(a?))*"}},
    };
    // One object throughout: a failed compile drops the program before it, and the next compile
    // works again. Every pattern here that compiles matches "a"; none matches a null text.
    CRegexPattern pattern;
    CRegexMatchContext context;
    for (const auto& code : codes)
        for (const wchar_t* text : code.second)
        {
            SCOPED_TRACE("pattern " + testing::PrintToString(text));
            EXPECT_EQ(pattern.Parse(text), code.first);
            EXPECT_EQ(pattern.Match(L"a", context), code.first == 0);
            EXPECT_FALSE(pattern.Match(nullptr, context));
        }
}

// The matcher never reads past a terminator, never loops forever and never loses a backtracking entry.
TEST(RegexSafety, MatchesStayInTheTextAndEnd)
{
    ExpectMatches({
        // A trailing backslash stands for itself (inside a class the class stays open: code 4).
        {L"a\\", L"xa\\", L"1:a\\"},
        {L"\\", L"\\", L"0:\\"},
        // A back-reference longer than what is left of the text fails; an empty text gets one attempt.
        {L"{ab.}\\0", L"abxab", L"none"},
        {L"{x*}", L"", L"0: {}"},
        // A back-reference to an empty capture and a look-ahead pass the compile-time check but
        // consume nothing; each lazy turn over them must still move or end the loop.
        {L"{a?}\\0*?b", L"c", L"none"},
        {L"(!a)*?b", L"cc", L"none"},
        {L"{a}\\0*?c", L"aaac", L"0:aaac {a}"},
        // A turn whose body, retried, consumes nothing must fail: held to where it first ended
        // instead of where it began, the loop would start the same turn again, forever.
        {L"(b*!x)*bc", L"bc", L"0:bc"},
        {L"{b*\\0}*a", L"b", L"none"},
        {L"{b*\\0}*a", L"bba", L"0:bba {bb}"},
    });
}

TEST(RegexSafety, FullStackEndsTheMatchWithoutAMatch)
{
    // Each turn of "a*" keeps three entries; 100 turns cannot fit in 64. The context and the
    // pattern stay usable.
    const std::wstring text = std::wstring(100, L'a') + L"b";
    CRegexPattern pattern;
    ASSERT_EQ(pattern.Parse(L"a*b"), 0);
    CRegexMatchContext small(4, 64), unlimited(4);
    EXPECT_FALSE(pattern.Match(text.c_str(), small));
    EXPECT_TRUE(pattern.Match(L"aab", small));
    ASSERT_TRUE(pattern.Match(text.c_str(), unlimited));
    EXPECT_EQ(unlimited.MatchEnd() - unlimited.MatchStart(), 101);
}

TEST(RegexSafety, DeepNestingAndOversizedProgramsAreRefused)
{
    std::wstring choices, closes;
    for (int i = 0; i < 5000; ++i)
        choices += L"a|", closes += L")+";
    // Each level of "(...)+" doubles the code (x+ is x then a loop over a copy of x); found by
    // fuzzing: 18 levels took seconds to compile. Nesting of ordinary depth compiles and matches.
    const std::wstring nestedPlus = std::wstring(8, L'(') + L"a" + closes.substr(0, 16);
    CRegexPattern pattern;
    for (const auto& [text, code] : std::vector<std::pair<std::wstring, int>>{
             {std::wstring(5000, L'(') + L"a" + std::wstring(5000, L')'), 1},
             {choices + L"b", 1},
             {std::wstring(5000, L'!') + L"a", 1},
             {std::wstring(16, L'(') + L"a" + closes.substr(0, 32), 1},
             {std::wstring(50, L'(') + L"a" + std::wstring(50, L')'), 0},
         })
        EXPECT_EQ(pattern.Parse(text.c_str()), code) << testing::PrintToString(text.substr(0, 20));
    ExpectMatches({{nestedPlus.c_str(), L"baab", L"1:aa"}});
}
