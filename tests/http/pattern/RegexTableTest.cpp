// The matcher's syntax, one table per construct: a pattern, a text and the expected match with
// its captures (the notation is in PatternTestSupport.h).
#include "http/pattern/PatternTestSupport.h"

#include <utility>
#include <vector>

using namespace KelvraTest;

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
