// Hostile or odd input: the matcher never reads past a terminator, never loops forever (each row
// runs within a time limit and with a bounded stack) and never loses a backtracking entry.
#include "http/pattern/PatternTestSupport.h"

#include <utility>

using namespace KelvraTest;

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
