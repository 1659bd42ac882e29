// The matcher's syntax, one table per construct. Each row is a pattern, a text and the expected
// match with its captures; every row is also checked against the reference matcher.
#include "http/pattern/ReferenceMatcher.h"
#include "http/pattern/RegexPattern.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

using namespace KelvraTest;

TEST(RegexLiteralsAndClasses, MatchAsTabled)
{
    ExpectMatches({
        {L"abc", L"xxabcx", L"abc", 2, {}},
        {L"ABC", L"xabc", L"abc", 1, {}},
        {L"abc", L"xABcx", L"ABc", 1, {}},
        {L"abc", L"ab", kNoMatch, 0, {}},
        {L"a.c", L"xa-c", L"a-c", 1, {}},
        {L"a.c", L"ac", kNoMatch, 0, {}},
        {L"a\\.c", L"abc a.c", L"a.c", 4, {}},
        {L"[b-d]", L"abc", L"b", 1, {}},
        {L"[a-a]", L"ba", L"a", 1, {}},
        {L"[^a-c]", L"abcd", L"d", 3, {}},
        {L"[A-Z]", L"1Q", L"Q", 1, {}},
        {L"[xy]", L"aYb", L"Y", 1, {}},
        {L"[\\t]", L"at\tb", L"\t", 2, {}},
        {L"[\\-]", L"a-b", L"-", 1, {}},
        {L"[-a]", L"x-", L"-", 1, {}},
        {L"[a\\]]", L"x]", L"]", 1, {}},
        // The high end of a range is taken as it stands: "\" here, so the range is ! to \.
        {L"[!-\\]", L"a\\", L"\\", 1, {}},
        {L"[^\\n]", L"nn:", L":", 2, {}},
        {L"\\t", L"a\tbt", L"t", 3, {}},
        {L"a$b", L"xa$b", L"a$b", 1, {}},
        {L"x^a", L"x^a", L"x^a", 0, {}},
        {L"-", L"a-", L"-", 1, {}},
    });
}

TEST(RegexGroupsAndCaptures, MatchAsTabled)
{
    ExpectMatches({
        {L"{ab}c", L"xabc", L"abc", 1, {L"ab"}},
        {L"(ab)c", L"xabc", L"abc", 1, {}},
        {L"{a}{b}", L"ab", L"ab", 0, {L"a", L"b"}},
        // Groups are numbered by their opening braces.
        {L"{a{b}}", L"ab", L"ab", 0, {L"ab", L"b"}},
        {L"{}a", L"a", L"a", 0, {L""}},
        {L"()a", L"a", L"a", 0, {}},
        // Each turn overwrites the capture: the second a, in its own case.
        {L"{a}*b", L"Aab", L"Aab", 0, {L"a"}},
        {L"{a}*b", L"b", L"b", 0, {kNotCaptured}},
        {L"{a}+", L"aaA", L"aaA", 0, {L"A"}},
        {L"{x}?y", L"y", L"y", 0, {kNotCaptured}},
        // A turn of "?" that consumed nothing is undone, capture included.
        {L"{a?}?b", L"b", L"b", 0, {kNotCaptured}},
        {L"{a?}b", L"b", L"b", 0, {L""}},
        {L"{a*}a", L"aaa", L"aaa", 0, {L"aa"}},
        {L"({a}b)*c", L"ababc", L"ababc", 0, {L"a"}},
        // Backtracking out of a group gives back its earlier capture.
        {L"({a}x)|(ab)", L"ab", L"ab", 0, {kNotCaptured}},
        // Everything from a character that cannot start a unit on is ignored.
        {L"ab)cd", L"xab", L"ab", 1, {}},
        {L"a]b", L"ab", L"a", 0, {}},
        {L"a}b", L"xab", L"a", 1, {}},
        {L")abc", L"xyz", L"", 0, {}},
    });
}

TEST(RegexAlternation, BindsTheQuantifiedAtomsBesideIt)
{
    ExpectMatches({
        {L"ab|cd", L"abd", L"abd", 0, {}},
        {L"ab|cd", L"xacd", L"acd", 1, {}},
        {L"ab|cd", L"ab", kNoMatch, 0, {}},
        {L"ab|cd", L"cd", kNoMatch, 0, {}},
        {L"a|b|c", L"xc", L"c", 1, {}},
        {L"a|b|c", L"b", L"b", 0, {}},
        {L"{ab}|{cd}", L"cd", L"cd", 0, {kNotCaptured, L"cd"}},
        {L"{ab}|{cd}", L"ab", L"ab", 0, {L"ab", kNotCaptured}},
        {L"(ab)|(cd)e", L"cde", L"cde", 0, {}},
        // The first alternative that lets the rest match wins, not the longest.
        {L"{(a)|(ab)}", L"ab", L"a", 0, {L"a"}},
        {L"{(a)|(ab)}c", L"abc", L"abc", 0, {L"ab"}},
        {L"a+|b", L"bb", L"b", 0, {}},
        {L"[0-9]|x+", L"axx", L"xx", 1, {}},
        // '|' where no unit is waiting for it is an ordinary character.
        {L"|a", L"x|a", L"|a", 1, {}},
        {L"a||b", L"|b", L"|b", 0, {}},
        // With nothing after '|' the whole unit is dropped.
        {L"xa|", L"yxa", L"x", 1, {}},
        {L"a|", L"b", L"", 0, {}},
        {L"(ba|)c", L"bc", L"bc", 0, {}},
        {L"(ba|)c", L"bac", kNoMatch, 0, {}},
    });
}

TEST(RegexQuantifiers, GreedyAndLazyMatchAsTabled)
{
    ExpectMatches({
        {L"a*", L"aaa", L"aaa", 0, {}},
        {L"a*", L"baa", L"", 0, {}},
        {L"ba*", L"baa", L"baa", 0, {}},
        {L"a+", L"baa", L"aa", 1, {}},
        {L"ba?", L"baa", L"ba", 0, {}},
        {L"ba*?", L"baa", L"b", 0, {}},
        {L"ba+?", L"baa", L"ba", 0, {}},
        {L"ba??", L"baa", L"b", 0, {}},
        {L"ba??a", L"baa", L"ba", 0, {}},
        {L"{a*?}a", L"aaa", L"a", 0, {L""}},
        {L"{.+?}b", L"aabab", L"aab", 0, {L"aa"}},
        {L"{.*}b", L"aabab", L"aabab", 0, {L"aaba"}},
        {L"{.*?}b", L"aabab", L"aab", 0, {L"aa"}},
        // '.' takes characters beyond ASCII too, also where the loop decides whether to take one more.
        {L"{.*}", L"a\u00e9b", L"a\u00e9b", 0, {L"a\u00e9b"}},
        {L"(ab)+", L"ababx", L"abab", 0, {}},
        {L"[0-9]+", L"abc 123 4", L"123", 4, {}},
        {L"x[0-9]*?y", L"x12y", L"x12y", 0, {}},
        // A second quantifier is an ordinary character, as is one with nothing to repeat.
        {L"a**", L"aa*", L"aa*", 0, {}},
        {L"a?*", L"b*", L"*", 1, {}},
        {L"a*??", L"a?", L"a?", 0, {}},
        {L"*a", L"x*a", L"*a", 1, {}},
        {L"+", L"a+b", L"+", 1, {}},
    });
}

TEST(RegexQuantifiers, LazyTurnStartsWhereTheLoopWas)
{
    // What follows the loop consumes "a" before it fails; the next turn still starts before it.
    ExpectMatches({
        {L"{.*?}ab", L"xaab", L"xaab", 0, {L"xa"}},
        {L"{a??}ab", L"aab", L"aab", 0, {L"a"}},
        {L"{.+?}ab", L"xaab", L"xaab", 0, {L"xa"}},
        // The capture must never take in a character its class refuses.
        {L"{[a-z]*?}12", L"ab1a12", L"a12", 3, {L"a"}},
    });
}

TEST(RegexLookAhead, BangRejectsWhatFollows)
{
    ExpectMatches({
        {L"!a.", L"ab", L"b", 1, {}},
        {L"!a.", L"aa", kNoMatch, 0, {}},
        {L"x!y", L"xyxz", L"x", 2, {}},
        {L"!(ab).", L"abac", L"b", 1, {}},
        {L"![0-9][a-z]+", L"1ab", L"ab", 1, {}},
        // Two of them make a positive look-ahead.
        {L"!!a.", L"ba", L"a", 1, {}},
        {L"a!$", L"aa", L"a", 0, {}},
        {L"a!$", L"a", kNoMatch, 0, {}},
        // A look-ahead consumes nothing, so repeating it adds nothing.
        {L"!a*b", L"b", L"b", 0, {}},
    });
}

TEST(RegexBackReferences, MatchTheCapturedTextAgain)
{
    ExpectMatches({
        {L"{a.}\\0", L"xabab", L"abab", 1, {L"ab"}},
        {L"{.}\\0", L"abcc", L"cc", 2, {L"c"}},
        {L"{.}\\0", L"xaA", L"aA", 1, {L"a"}},
        {L"{..}\\0", L"xyx", kNoMatch, 0, {kNotCaptured}},
        {L"{a}?b\\0", L"b", L"b", 0, {kNotCaptured}},
        {L"{a}{b}\\1\\0", L"abba", L"abba", 0, {L"a", L"b"}},
        // Inside its own group the capture has no end yet and counts as empty.
        {L"{a\\0}b", L"ab", L"ab", 0, {L"a"}},
        {L"{a}{b}{c}{d}{e}{f}{g}{h}{i}{j}{k}\\10",
         L"abcdefghijkk",
         L"abcdefghijkk",
         0,
         {L"a", L"b", L"c", L"d", L"e", L"f", L"g", L"h", L"i", L"j", L"k"}},
        {L"{a}\\0*b", L"aaab", L"aaab", 0, {L"a"}},
    });
}

TEST(RegexAbbreviations, StandForTheFirstAtomOfTheirText)
{
    ExpectMatches({
        {L"\\a+", L"--x9--", L"x9", 2, {}},
        {L"\\b+", L"x \t y", L" \t ", 1, {}},
        {L"\\c+", L"12ab3", L"ab", 2, {}},
        {L"\\d+", L"ab12c", L"12", 2, {}},
        {L"\\D+", L"ab12c", L"12", 2, {}},
        {L"\\h+", L"xyzBEEFg", L"BEEF", 3, {}},
        {L"\\w", L"12abc3", L"abc", 2, {}},
        {L"\\z", L"ab123", L"123", 2, {}},
        // A CR alone is tried first, so before CR LF the match is the CR.
        {L"\\n", L"a\r\nb", L"\r", 1, {}},
        {L"\\n", L"a\nb", L"\n", 1, {}},
        {L"\\N", L"a\nb", L"\n", 1, {}},
        {L"{.+?}\\n", L"abc\r\nd", L"abc\r", 0, {L"abc"}},
        {L"{.+?}\\n", L"abc\nd", L"abc\n", 0, {L"abc"}},
        {L"{.+?}\\n", L"\na\rb", L"\na\r", 0, {L"\na"}},
        // Only the double-quoted half of "q" is compiled.
        {L"\\q", L"x\"ab\"y", L"\"ab\"", 1, {}},
        {L"\\q", L"\"\"", L"\"\"", 0, {}},
        {L"\\q", L"'ab'", kNoMatch, 0, {}},
        {L"\\d\\d?", L"a1b23", L"1", 1, {}},
    });
}

TEST(RegexAnchors, CaretAndDollarAtTheEdgesOnly)
{
    ExpectMatches({
        {L"^ab", L"abc", L"ab", 0, {}},
        {L"^ab", L"cab", kNoMatch, 0, {}},
        {L"^", L"abc", L"", 0, {}},
        {L"^a*", L"baa", L"", 0, {}},
        {L"b$", L"ab", L"b", 1, {}},
        {L"b$", L"ba", kNoMatch, 0, {}},
        {L"$", L"ab", kNoMatch, 0, {}},
        {L"$", L"", L"", 0, {}},
        {L"a*$", L"baa", L"aa", 1, {}},
        {L"^{.*}$", L"Abc", L"Abc", 0, {L"Abc"}},
        {L"\\$", L"a$", L"$", 1, {}},
    });
}

TEST(RegexCompileErrors, ReportTheirCodesAndMatchNothing)
{
    const std::vector<std::pair<int, std::vector<const wchar_t*>>> codes = {
        {2, {L"{abc", L"{(a)"}},
        {3, {L"(abc", L"{(a}"}},
        {4, {L"[abc", L"[a-]", L"[a-", L"[", L"[^", L"[\\", L"[!-\\"}},
        {0, {L"", L"(a*)?", L"(a*)??", L"{a}\\0*", L"!a*", L")"}},
        {6, {L"[]", L"[^]", L"[]a]"}},
        {7, {L"\\1", L"\\0", L"{a}\\1", L"{a\\1}", L"{a}\\99999999999999999999999"}},
        // The pattern is lowered first: Z-a becomes z-a.
        {8, {L"[z-a]", L"[Z-a]"}},
        // Every lazy quantifier counts as able to match nothing.
        {9, {L"(a*)*", L"(a*)+", L"{}*", L"()+?", L"(a?)*?", L"(a+?)*", L"(a|b*)+", L"(!(a?))*"}},
    };
    // One object throughout: a failed compile drops the program before it, and the next compile
    // works again. Every pattern here that compiles matches "a".
    CRegexPattern pattern;
    CRegexMatchContext context;
    for (const auto& code : codes)
    {
        for (const wchar_t* text : code.second)
        {
            SCOPED_TRACE("pattern " + testing::PrintToString(text));
            EXPECT_EQ(pattern.Parse(text), code.first);
            EXPECT_EQ(pattern.LastError(), code.first);
            EXPECT_EQ(pattern.Match(L"a", context), code.first == 0);
        }
    }
}

TEST(RegexPattern, CompiledPatternIgnoresCaseAndCountsGroupsAndSlots)
{
    CRegexPattern pattern;
    EXPECT_TRUE(pattern.IsCaseSensitive());
    CRegexMatchContext context;
    EXPECT_FALSE(pattern.Match(L"a", context));
    ASSERT_EQ(pattern.Parse(L"{a}(b{c})*!d"), 0);
    EXPECT_FALSE(pattern.IsCaseSensitive());
    EXPECT_EQ(pattern.GroupCount(), 2u);
    // One slot for the loop, two for the look-ahead.
    EXPECT_EQ(pattern.SlotCount(), 3u);
    // "+" compiles its atom twice; the second copy takes slots of its own.
    ASSERT_EQ(pattern.Parse(L"(a*b)+"), 0);
    EXPECT_EQ(pattern.SlotCount(), 3u);
}

TEST(RegexPattern, ContextHoldsTheLatestMatchAndOnlyItsGroups)
{
    CRegexPattern three;
    CRegexPattern one;
    ASSERT_EQ(three.Parse(L"{a}{b}{c}"), 0);
    ASSERT_EQ(one.Parse(L"x{y}"), 0);
    CRegexMatchContext context;
    ASSERT_TRUE(three.Match(L"abc", context));
    EXPECT_EQ(context.GroupCount(), 3u);
    ASSERT_TRUE(one.Match(L"xy", context));
    EXPECT_EQ(context.GroupCount(), 1u);
    EXPECT_EQ(std::wstring(context.Group(0).start, context.Group(0).end), L"y");
    EXPECT_EQ(ThrownCode([&] { context.Group(1); }), 0x80004005u);
    // A failed match leaves no match end; a null text matches nothing and leaves the end null.
    const wchar_t* end = L"";
    EXPECT_FALSE(one.Match(L"xz", context, &end));
    EXPECT_EQ(context.MatchEnd(), nullptr);
    EXPECT_FALSE(one.Match(nullptr, context, &end));
    EXPECT_EQ(end, nullptr);
}
