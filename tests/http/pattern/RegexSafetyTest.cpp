// Hostile or odd input: the matcher never reads past a terminator, never loops forever (each row
// runs within a time limit and with a bounded stack) and never loses a backtracking entry.
#include "http/pattern/PatternTestSupport.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace KelvraTest;

TEST(RegexSafety, NothingIsReadPastATerminator)
{
    ExpectMatches({
        // A trailing backslash stands for itself (inside a class the class stays open: code 4).
        {L"a\\", L"xa\\", L"1:a\\"},
        {L"a\\", L"a", L"none"},
        {L"\\", L"\\", L"0:\\"},
        // A back-reference longer than what is left of the text fails.
        {L"{ab.}\\0", L"abxab", L"none"},
        {L"{ab.}\\0", L"abx", L"none"},
        // An empty text gets one attempt.
        {L"x", L"", L"none"},
        {L"{x*}", L"", L"0: {}"},
    });
}

TEST(RegexSafety, LoopOverABodyThatConsumesNothingEnds)
{
    ExpectMatches({
        // A back-reference to an empty capture and a look-ahead pass the compile-time check but
        // consume nothing; each lazy turn over them must still move or end the loop.
        {L"{a?}\\0*?b", L"c", L"none"},
        {L"{x?}\\0+?y", L"z", L"none"},
        {L"(!a)*?b", L"cc", L"none"},
        {L"!a+?b", L"c", L"none"},
        {L"{a}\\0*?c", L"aaac", L"0:aaac {a}"},
        // After a second greedy turn gives up, the first turn's body finds a way that consumes
        // nothing. That turn must fail: were it held to where it first ended instead of where it
        // began, the loop would start the same turn again, forever.
        {L"(b*!x)*bc", L"bc", L"0:bc"},
        {L"{b*\\0}*a", L"b", L"none"},
        {L"{b*\\0}*a", L"bba", L"0:bba {bb}"},
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
    // The context and the pattern stay usable.
    EXPECT_TRUE(pattern.Match(L"aab", small));
    CRegexMatchContext unlimited(4);
    ASSERT_TRUE(pattern.Match(text.c_str(), unlimited));
    EXPECT_EQ(std::wstring(unlimited.MatchStart(), unlimited.MatchEnd()), text);
}

TEST(RegexSafety, DeepNestingAndOversizedProgramsAreRefused)
{
    std::wstring choices;
    for (int i = 0; i < 5000; ++i)
        choices += L"a|";
    // Each level of "(...)+" doubles the code (x+ is x then a loop over a copy of x); found by
    // fuzzing: 18 levels took seconds to compile.
    const auto nestedPlus = [](int levels)
    {
        std::wstring nested = std::wstring(levels, L'(') + L"a";
        for (int level = 0; level < levels; ++level)
            nested += L")+";
        return nested;
    };
    CRegexPattern pattern;
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'(') + L"a" + std::wstring(5000, L')')).c_str()), 1);
    EXPECT_EQ(pattern.Parse((choices + L"b").c_str()), 1);
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'!') + L"a").c_str()), 1);
    EXPECT_EQ(pattern.Parse(nestedPlus(16).c_str()), 1);
    // Nesting of ordinary depth compiles and matches.
    EXPECT_EQ(pattern.Parse((std::wstring(50, L'(') + L"a" + std::wstring(50, L')')).c_str()), 0);
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
