// Hostile or odd input: the matcher never reads past a terminator, never loops forever and never
// loses a backtracking entry.
#include "http/PatternExtraction.h"
#include "http/ReferenceMatcher.h"
#include "http/RegexPattern.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <memory>
#include <string>
#include <vector>

using KelvraTest::AgreesWithReference;
using KelvraTest::Printable;

namespace
{

struct Outcome
{
    bool matched = false;
    std::wstring match;
};

struct MatchJob
{
    std::wstring pattern;
    std::wstring text;
    Outcome outcome;
};

DWORD WINAPI RunMatchJob(void* parameter)
{
    // The thread holds its own reference: the job outlives a test that stopped waiting.
    const std::unique_ptr<std::shared_ptr<MatchJob>> owner(
        static_cast<std::shared_ptr<MatchJob>*>(parameter));
    MatchJob& job = **owner;
    CRegexPattern compiled;
    CRegexMatchContext context(256, 1 << 22);
    if (compiled.Parse(job.pattern.c_str()) == 0 && compiled.Match(job.text.c_str(), context))
    {
        job.outcome.matched = true;
        job.outcome.match.assign(context.MatchStart(), context.MatchEnd());
    }
    return 0;
}

// Matches on a worker thread, so that a matcher that never ends fails this test instead of
// stalling the whole program.
bool MatchesWithin(const std::wstring& pattern, const std::wstring& text, Outcome& outcome)
{
    const auto job = std::make_shared<MatchJob>(MatchJob{pattern, text, Outcome()});
    auto* reference = new std::shared_ptr<MatchJob>(job);
    Kelvra::UniqueThread thread(::CreateThread(nullptr, 0, &RunMatchJob, reference, 0, nullptr));
    if (!thread)
    {
        delete reference;
        ADD_FAILURE() << "CreateThread failed";
        return false;
    }
    if (::WaitForSingleObject(thread.get(), 30000) != WAIT_OBJECT_0)
        return false;
    outcome = job->outcome;
    return true;
}

struct EndingCase
{
    const wchar_t* pattern;
    const wchar_t* text;
    const wchar_t* match; // nullptr: no match
};

// The match must end (within MatchesWithin's time limit), find what is expected and agree with
// the reference matcher.
void ExpectEndsAsTheReferenceDoes(const EndingCase& row)
{
    SCOPED_TRACE("pattern " + Printable(row.pattern) + " text " + Printable(row.text));
    Outcome outcome;
    ASSERT_TRUE(MatchesWithin(row.pattern, row.text, outcome)) << "the matcher does not end";
    ASSERT_EQ(outcome.matched, row.match != nullptr);
    if (outcome.matched)
    {
        EXPECT_EQ(outcome.match, row.match);
    }
    EXPECT_TRUE(AgreesWithReference(row.pattern, row.text));
}

} // namespace

TEST(RegexSafety, TrailingBackslashStandsForItself)
{
    CRegexPattern pattern;
    CRegexMatchContext context;
    ASSERT_EQ(pattern.Parse(L"a\\"), 0);
    ASSERT_TRUE(pattern.Match(L"xa\\", context));
    EXPECT_EQ(std::wstring(context.MatchStart(), context.MatchEnd()), L"a\\");
    EXPECT_FALSE(pattern.Match(L"a", context));
    ASSERT_EQ(pattern.Parse(L"\\"), 0);
    EXPECT_TRUE(pattern.Match(L"\\", context));
    // Inside a class the class stays open.
    EXPECT_EQ(pattern.Parse(L"[a\\"), 4);
}

TEST(RegexSafety, BackReferenceRunningPastTheEndFails)
{
    // Each capture is longer than what is left of the text after it.
    for (const wchar_t* text : {L"abxa", L"abxab", L"abx"})
    {
        SCOPED_TRACE(Printable(text));
        CRegexPattern pattern;
        CRegexMatchContext context;
        ASSERT_EQ(pattern.Parse(L"{ab.}\\0"), 0);
        EXPECT_FALSE(pattern.Match(text, context));
        EXPECT_TRUE(AgreesWithReference(L"{ab.}\\0", text));
    }
    std::vector<std::wstring> results;
    EXPECT_TRUE(ExtractPatternGroups(L"{[a-z]+}-\\0", L"abc-ab", results));
    EXPECT_TRUE(results.empty());
    EXPECT_TRUE(ExtractPatternGroups(L"{[a-z]+}-\\0", L"abc-abc", results));
    EXPECT_EQ(results, std::vector<std::wstring>{L"abc"});
}

TEST(RegexSafety, EmptyTextGetsOneAttempt)
{
    CRegexPattern pattern;
    CRegexMatchContext context;
    const wchar_t* empty = L"";
    const wchar_t* end = nullptr;
    ASSERT_EQ(pattern.Parse(L"x"), 0);
    EXPECT_FALSE(pattern.Match(empty, context, &end));
    EXPECT_EQ(end, empty);
    ASSERT_EQ(pattern.Parse(L"{x*}"), 0);
    ASSERT_TRUE(pattern.Match(empty, context, &end));
    EXPECT_EQ(context.MatchStart(), empty);
    EXPECT_EQ(end, empty);
}

TEST(RegexSafety, LazyLoopOverABodyThatConsumesNothingEnds)
{
    // A back-reference to an empty capture and a look-ahead pass the compile-time check but
    // consume nothing; each turn over them must still move or end the loop.
    const EndingCase cases[] = {
        {L"{a?}\\0*?b", L"c", nullptr},   {L"{a?}\\0*?b", L"cb", L"b"}, {L"{x?}\\0+?y", L"z", nullptr},
        {L"(!a)*?b", L"cc", nullptr},     {L"(!a)*?b", L"cb", L"b"},    {L"!a+?b", L"c", nullptr},
        {L"{a}\\0*?c", L"aaac", L"aaac"},
    };
    for (const EndingCase& row : cases)
        ExpectEndsAsTheReferenceDoes(row);
}

TEST(RegexSafety, GreedyLoopBackAtItsTurnStartEnds)
{
    // After a second turn gives up, the first turn's body finds a way that consumes nothing. That
    // turn must fail: were it held to where it first ended instead of where it began, the loop
    // would start the same turn again, forever.
    const EndingCase cases[] = {
        {L"(b*!x)*bc", L"bc", L"bc"},
        {L"{b*\\0}*a", L"b", nullptr},
        {L"{b*\\0}*a", L"bba", L"bba"},
    };
    for (const EndingCase& row : cases)
        ExpectEndsAsTheReferenceDoes(row);
}

TEST(RegexSafety, EmptyMatchesMoveTheSearchForward)
{
    std::vector<std::wstring> results;
    EXPECT_TRUE(ExtractPatternGroups(L"{a*}", L"bab", results));
    EXPECT_EQ(results, (std::vector<std::wstring>{L"", L"a"}));
    EXPECT_TRUE(ExtractPatternGroups(L"{x?}", L"abc", results));
    EXPECT_EQ(results, std::vector<std::wstring>{L""});
    EXPECT_TRUE(ExtractPatternGroups(L"{}", L"abc", results));
    EXPECT_EQ(results, std::vector<std::wstring>{L""});
    // An empty match after the first character: "!a" matches nothing at 1 and at 2.
    EXPECT_TRUE(ExtractPatternGroups(L"{!a}", L"abb", results));
    EXPECT_EQ(results, std::vector<std::wstring>{L""});
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
    ASSERT_EQ(results.size(), 1u);
    EXPECT_EQ(results[0], digits);
}

TEST(RegexSafety, DeepNestingIsRefused)
{
    CRegexPattern pattern;
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'(') + L"a" + std::wstring(5000, L')')).c_str()), 1);
    std::wstring choices;
    for (int i = 0; i < 5000; ++i)
        choices += L"a|";
    EXPECT_EQ(pattern.Parse((choices + L"b").c_str()), 1);
    EXPECT_EQ(pattern.Parse((std::wstring(5000, L'!') + L"a").c_str()), 1);
    // Nesting of ordinary depth compiles.
    EXPECT_EQ(pattern.Parse((std::wstring(50, L'(') + L"a" + std::wstring(50, L')')).c_str()), 0);
}

TEST(RegexSafety, TextEndsAtItsFirstNul)
{
    const std::wstring text(L"Set-Cookie: a=1\r\n\0Set-Cookie: b=2\r\n", 35);
    std::vector<std::wstring> results;
    EXPECT_TRUE(ExtractPatternGroups(L"Set-Cookie:\\b*{.+?}\\n", text, results));
    EXPECT_EQ(results, std::vector<std::wstring>{L"a=1"});
}
