// Operations run once for every heap allocation they make, with that allocation alone failing.
#include "KelvraHttp.h"
#include "KelvraStrings.h"
#include "KelvraTrace.h"

#include "http/pattern/RegexPattern.h"
#include "support/CountedHeap.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <new>
#include <optional>

using KelvraStrings::Strings;

std::wstring ServerUrl(const std::wstring& path, const std::wstring& listener); // HttpClientTest.cpp
void Prepare(CWinHttpClient& client, const std::wstring& proxy);                // HttpClientTest.cpp

namespace
{

using KelvraTest::liveBlocks;
long long chosen = 0; // the allocation to fail, 0 for none
bool failed = false;  // whether it came

// Runs run() with the chosen allocation failing; a bad_alloc leaving it makes the outcome "bad_alloc".
template <typename Run> std::optional<std::wstring> Failing(Run&& run)
{
    KelvraTest::failCountdown = chosen;
    std::optional<std::wstring> thrown;
    try
    {
        run();
    }
    catch (const std::bad_alloc&)
    {
        thrown = L"bad_alloc";
    }
    failed = chosen > 0 && KelvraTest::failCountdown.exchange(0) == 0;
    return thrown;
}

// A POST prepared as in HttpClientTest.cpp, for a response with a charset, two cookies, a
// location and a body: its fields, or after a failure its error and whether the same client's
// next request succeeds. (A header match cut short by memory once passed for the end of the
// matches: the request succeeded without its charset, location or some of its cookies.)
std::wstring SendRequest()
{
    CWinHttpClient client(
        ServerUrl(L"/respond?header=Content-Type:%20text/plain;%20charset=utf-8&header=Set-Cookie:%20a=1"
                  L"&header=Set-Cookie:%20b=2&header=Location:%20/next&body=%C3%A9t%C3%A9",
                  L"http"));
    Prepare(client, L"");
    bool sent = false;
    if (const auto thrown = Failing([&] { sent = client.SendHttpRequest(L"POST", true); }))
        return *thrown;
    const std::uint32_t error = client.GetLastError();
    return sent ? Strings::Format(L"true %s [%s] {%s} <%s> %s", client.GetResponseStatusCode().c_str(),
                                  client.GetResponseCharset().c_str(), client.GetResponseCookies().c_str(),
                                  client.GetResponseLocation().c_str(), client.GetResponseContent().c_str())
                : Strings::Format(L"false %u, then %s", error,
                                  client.SendHttpRequest(L"POST", true) ? L"true" : L"false");
}

// Compiles a pattern and matches it on a text that takes the stack far beyond its first 4 entries.
std::wstring CompileAndMatch()
{
    const std::wstring text = L"xx" + std::wstring(600, L'a') + L"c";
    CRegexPattern pattern;
    CRegexMatchContext context(4);
    int compiled = 0;
    bool matched = false;
    if (const auto thrown = Failing(
            [&] {
                matched =
                    (compiled = pattern.Parse(L"{(a|b)+}c\\z?")) == 0 && pattern.Match(text.c_str(), context);
            }))
        return *thrown;
    return compiled != 0 ? L"compile error " + std::to_wstring(compiled)
           : matched     ? L"capture of " + std::to_wstring(context.Group(0).end - context.Group(0).start)
           : context.OutOfMemory() ? L"out of memory"
                                   : L"no match";
}

} // namespace

// Each operation gives the outcome of its clean run, or one it documents for memory running out,
// and holds no more heap blocks after it than before. The allocations are failed in turn until a
// run needs fewer than the one chosen.
TEST(AllocationFailure, EveryAllocationOfAnOperationFailingInTurn)
{
    const std::tuple<const char*, std::wstring (*)(), std::vector<std::wstring>> operations[] = {
        {"SendHttpRequest", &SendRequest, {L"false 8, then true"}},
        {"CRegexPattern", &CompileAndMatch, {L"compile error 1", L"out of memory"}},
    };
    // Only error lines are written meanwhile: the allocations of the others would multiply the runs.
    Debug::lock();
    const Debug::Levels level = std::exchange(Debug::_lvl, Debug::lvlError);
    Debug::unlock();
    for (const auto& [name, run, outOfMemory] : operations)
    {
        SCOPED_TRACE(name);
        chosen = 0;
        const std::wstring clean = run();
        // The outcome is copied into a block taken before the count, so that it is not counted.
        std::wstring outcome;
        outcome.reserve(1000);
        for (chosen = 1, failed = true; failed; ++chosen)
        {
            const long long before = liveBlocks;
            outcome.assign(run().c_str());
            EXPECT_TRUE(outcome == clean ||
                        (failed && std::count(outOfMemory.begin(), outOfMemory.end(), outcome) == 1))
                << "allocation " << chosen << ": " << testing::PrintToString(outcome);
            EXPECT_EQ(liveBlocks - before, 0) << "allocation " << chosen;
        }
        EXPECT_GT(chosen, 6);
    }
    Debug::lock();
    Debug::_lvl = level;
    Debug::unlock();
}
