// Hostile or odd input: the matcher never reads past a terminator, never loops forever and never
// loses a backtracking entry. Loops that must end are table rows: each row runs within a time
// limit and with a bounded stack, so a loop that never ends fails its row.
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/ReferenceMatcher.h"
#include "http/pattern/RegexPattern.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace KelvraTest;

TEST(RegexSafety, TrailingBackslashStandsForItself)
{
    ExpectMatches({
        {L"a\\", L"xa\\", L"a\\", 1, {}},
        {L"a\\", L"a", kNoMatch, 0, {}},
        {L"\\", L"\\", L"\\", 0, {}},
    });
    // Inside a class the class stays open.
    EXPECT_EQ(CRegexPattern().Parse(L"[a\\"), 4);
}

TEST(RegexSafety, BackReferenceRunningPastTheEndFails)
{
    // Each capture is longer than what is left of the text after it.
    ExpectMatches({
        {L"{ab.}\\0", L"abxa", kNoMatch, 0, {}},
        {L"{ab.}\\0", L"abxab", kNoMatch, 0, {}},
        {L"{ab.}\\0", L"abx", kNoMatch, 0, {}},
    });
    ExpectExtractions({
        {L"{[a-z]+}-\\0", L"abc-ab", {}},
        {L"{[a-z]+}-\\0", L"abc-abc", {L"abc"}},
    });
}

TEST(RegexSafety, EmptyTextGetsOneAttempt)
{
    ExpectMatches({
        {L"x", L"", kNoMatch, 0, {}},
        {L"{x*}", L"", L"", 0, {L""}},
    });
}

TEST(RegexSafety, LazyLoopOverABodyThatConsumesNothingEnds)
{
    // A back-reference to an empty capture and a look-ahead pass the compile-time check but
    // consume nothing; each turn over them must still move or end the loop.
    ExpectMatches({
        {L"{a?}\\0*?b", L"c", kNoMatch, 0, {}},
        {L"{a?}\\0*?b", L"cb", L"b", 1, {L""}},
        {L"{x?}\\0+?y", L"z", kNoMatch, 0, {}},
        {L"(!a)*?b", L"cc", kNoMatch, 0, {}},
        {L"(!a)*?b", L"cb", L"b", 1, {}},
        {L"!a+?b", L"c", kNoMatch, 0, {}},
        {L"{a}\\0*?c", L"aaac", L"aaac", 0, {L"a"}},
    });
}

TEST(RegexSafety, GreedyLoopBackAtItsTurnStartEnds)
{
    // After a second turn gives up, the first turn's body finds a way that consumes nothing. That
    // turn must fail: were it held to where it first ended instead of where it began, the loop
    // would start the same turn again, forever.
    ExpectMatches({
        {L"(b*!x)*bc", L"bc", L"bc", 0, {}},
        {L"{b*\\0}*a", L"b", kNoMatch, 0, {}},
        {L"{b*\\0}*a", L"bba", L"bba", 0, {L"bb"}},
    });
}

TEST(RegexSafety, EmptyMatchesMoveTheSearchForward)
{
    ExpectExtractions({
        {L"{a*}", L"bab", {L"", L"a"}},
        {L"{x?}", L"abc", {L""}},
        {L"{}", L"abc", {L""}},
        // An empty match after the first character: "!a" matches nothing at 1 and at 2.
        {L"{!a}", L"abb", {L""}},
    });
}

TEST(RegexSafety, FullStackEndsTheMatchWithoutAMatch)
{
    // Each turn of "a*" keeps three entries; 100 turns cannot fit in 64.
    const std::wstring text = std::wstring(100, L'a') + L"b";
    CRegexPattern pattern;
    ASSERT_EQ(pattern.Parse(L"a*b"), 0);
    CRegexMatchContext small(4, 64);
    EXPECT_FALSE(pattern.Match(text.c_str(), small));
    EXPECT_EQ(small.StackSize(), 64u);
    // The context and the pattern stay usable.
    EXPECT_TRUE(pattern.Match(L"aab", small));
    CRegexMatchContext unlimited(4);
    ASSERT_TRUE(pattern.Match(text.c_str(), unlimited));
    EXPECT_EQ(std::wstring(unlimited.MatchStart(), unlimited.MatchEnd()), text);
}

TEST(RegexSafety, StackGrowsForLongRuns)
{
    const std::wstring digits(200000, L'7');
    std::vector<std::wstring> results;
    ASSERT_TRUE(
        ExtractPatternGroups(L"Content-Length: {[0-9]+}", L"Content-Length: " + digits + L"\r\n", results));
    EXPECT_EQ(results, std::vector<std::wstring>{digits});
}

TEST(RegexSafety, DeepNestingIsRefused)
{
    std::wstring choices;
    for (int i = 0; i < 5000; ++i)
        choices += L"a|";
    CRegexPattern pattern;
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'(') + L"a" + std::wstring(5000, L')')).c_str()), 1);
    EXPECT_EQ(pattern.Parse((choices + L"b").c_str()), 1);
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'!') + L"a").c_str()), 1);
    // Nesting of ordinary depth compiles.
    EXPECT_EQ(pattern.Parse((std::wstring(50, L'(') + L"a" + std::wstring(50, L')')).c_str()), 0);
}

TEST(RegexSafety, NestedPlusBeyondTheProgramLimitIsRefused)
{
    // "x+" is x followed by a loop over a second copy of x: each level of "(...)+" doubles the
    // code. Found by fuzzing: 16 levels compiled to 65,535 loops, 18 levels took seconds.
    const auto nestedPlus = [](int levels)
    {
        std::wstring nested = std::wstring(levels, L'(') + L"a";
        for (int level = 0; level < levels; ++level)
            nested += L")+";
        return nested;
    };
    CRegexPattern pattern;
    EXPECT_EQ(pattern.Parse(nestedPlus(16).c_str()), 1);
    ASSERT_EQ(pattern.Parse(nestedPlus(8).c_str()), 0);
    CRegexMatchContext context;
    ASSERT_TRUE(pattern.Match(L"baab", context));
    EXPECT_EQ(std::wstring(context.MatchStart(), context.MatchEnd()), L"aa");
}

TEST(RegexSafety, TextEndsAtItsFirstNul)
{
    ExpectExtractions({
        {L"Set-Cookie:\\b*{.+?}\\n", std::wstring(L"Set-Cookie: a=1\r\n\0Set-Cookie: b=2\r\n", 35), {L"a=1"}},
    });
}
