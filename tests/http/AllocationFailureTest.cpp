// Operations run once for every heap allocation they make, with that allocation alone failing.
// This file replaces the program's global operator new and delete, counting the blocks in use.
#include "HttpTestSupport.h"

#include "KelvraHttp.h"
#include "KelvraIni.h"
#include "KelvraTrace.h"

#include "common/UniqueHandle.h"
#include "http/HeaderPatterns.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/RegexPattern.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <optional>

using KelvraStrings::Strings;

namespace
{

std::atomic<long long> liveBlocks{0};
// Allocations to go before the chosen one, which fails when this reaches 0 from 1; 0: none chosen.
std::atomic<long long> countdown{0};
bool failed = false;

// Runs run() with its n-th allocation failing (none for 0); failed then tells whether it came. A
// bad_alloc that leaves run() is caught, and makes the outcome "bad_alloc".
template <typename Run> bool FailingAllocation(long long n, Run&& run)
{
    countdown = n;
    bool thrown = false;
    try
    {
        run();
    }
    catch (const std::bad_alloc&)
    {
        thrown = true;
    }
    failed = n > 0 && countdown.exchange(0) == 0;
    return !thrown;
}

} // namespace

void* Allocate(std::size_t size) noexcept
{
    void* block = countdown.load() > 0 && countdown.fetch_sub(1) == 1 ? nullptr : std::malloc(size + 1);
    liveBlocks += block != nullptr ? 1 : 0;
    return block;
}

// Every form of operator new and delete, so that none escapes the count.
void* operator new(std::size_t size)
{
    void* block = Allocate(size);
    return block != nullptr ? block : throw std::bad_alloc();
}
void* operator new[](std::size_t size)
{
    return operator new(size);
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept
{
    return Allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept
{
    return Allocate(size);
}
void operator delete(void* block) noexcept
{
    if (block != nullptr)
        --liveBlocks, std::free(block);
}
void operator delete[](void* block) noexcept
{
    operator delete(block);
}
void operator delete(void* block, std::size_t) noexcept
{
    operator delete(block);
}
void operator delete[](void* block, std::size_t) noexcept
{
    operator delete(block);
}

namespace
{

// A POST with a body, an extra header and a cookie, for a response with a charset, two cookies, a
// location and a body: its fields, or after a failure its error and whether the same client's
// next request succeeds.
std::wstring SendRequest(long long failing)
{
    CWinHttpClient client(KelvraHttpTest::ServerUrl(
        L"/respond?header=Content-Type:%20text/plain;%20charset=utf-8&header=Set-Cookie:%20a=1"
        L"&header=Set-Cookie:%20b=2&header=Location:%20/next&body=%C3%A9t%C3%A9"));
    client.SetAdditionalRequestHeaders(L"X-A: 1");
    client.SetAdditionalRequestCookies(L"c=1");
    client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>("k=v"), 3);
    bool sent = false;
    if (!FailingAllocation(failing, [&] { sent = client.SendHttpRequest(L"POST", true); }))
        return L"bad_alloc";
    if (!sent)
    {
        const std::uint32_t error = client.GetLastError();
        return Strings::Format(L"false %u, then %s", error,
                               client.SendHttpRequest(L"POST", true) ? L"true" : L"false");
    }
    return Strings::Format(L"true %s [%s] {%s} <%s> %s", client.GetResponseStatusCode().c_str(),
                           client.GetResponseCharset().c_str(), client.GetResponseCookies().c_str(),
                           client.GetResponseLocation().c_str(), client.GetResponseContent().c_str());
}

// Three sections of pairs, one continued; then whether the file is closed (it opens unshared).
std::wstring ReadIni(long long failing)
{
    const std::wstring path = KelvraTest::DataPath(L"allocation.ini");
    std::optional<INIReader> reader;
    FailingAllocation(failing, [&] { reader.emplace(path); });
    const std::wstring outcome = reader ? Strings::Format(L"%d %s %d %s", reader->ParseError(),
                                                          reader->Get(L"First", L"name", L"").c_str(),
                                                          reader->GetInteger(L"second", L"Number", 0),
                                                          reader->Get(L"third", L"text", L"").c_str())
                                        : L"bad_alloc";
    const Kelvra::UniqueFileHandle alone(
        ::CreateFileW(path.c_str(), GENERIC_READ, 0, nullptr, OPEN_EXISTING, 0, nullptr));
    return outcome + (alone ? L"" : L" (left open)");
}

// Compiles a pattern and matches it on a text that takes the stack far beyond its first 4 entries.
std::wstring CompileAndMatch(long long failing)
{
    const std::wstring text = L"xx" + std::wstring(600, L'a') + L"c";
    CRegexPattern pattern;
    CRegexMatchContext context(4);
    int compiled = 0;
    bool matched = false;
    const auto compileAndMatch = [&]
    { matched = (compiled = pattern.Parse(L"{(a|b)+}c\\z?")) == 0 && pattern.Match(text.c_str(), context); };
    if (!FailingAllocation(failing, compileAndMatch))
        return L"bad_alloc";
    if (compiled != 0)
        return L"compile error " + std::to_wstring(compiled);
    if (!matched)
        return context.OutOfMemory() ? L"out of memory" : L"no match";
    return L"capture of " + std::to_wstring(context.Group(0).end - context.Group(0).start);
}

// The cookie pattern over three cookies of 300 characters, each taking the stack beyond 256. (A
// match that memory cut short once passed for the end of the matches: true, with the cookies
// found before it.)
std::wstring ExtractCookies(long long failing)
{
    std::wstring header = L"HTTP/1.1 200 OK\r\n";
    for (const wchar_t* name : {L"a", L"b", L"c"})
        header += L"Set-Cookie: " + std::wstring(name) + L"=" + std::wstring(300, L'v') + L"\r\n";
    const std::wstring pattern = KelvraHeaderPatterns::kCookies;
    std::vector<std::wstring> values;
    bool found = false;
    if (!FailingAllocation(failing, [&] { found = ExtractPatternGroups(pattern, header, values); }))
        return L"bad_alloc";
    std::wstring outcome = found ? L"true" : L"false";
    for (const std::wstring& value : values)
        outcome += L" " + value.substr(0, 3);
    return outcome;
}

} // namespace

// Each operation gives the outcome of its clean run, or one it documents for memory running out,
// and holds no more heap blocks after it than before. The allocations are failed in turn until a
// run needs fewer than the one chosen.
TEST(AllocationFailure, EveryAllocationOfAnOperationFailingInTurn)
{
    struct Operation
    {
        const char* name;
        std::wstring (*run)(long long failing);
        std::vector<std::wstring> outOfMemory;
    };
    const Operation operations[] = {
        {"SendHttpRequest", &SendRequest, {L"false 8, then true"}},
        {"INIReader", &ReadIni, {L"bad_alloc"}},
        {"CRegexPattern", &CompileAndMatch, {L"compile error 1", L"out of memory"}},
        {"ExtractPatternGroups", &ExtractCookies, {L"false"}},
    };
    std::FILE* file = _wfopen(KelvraTest::DataPath(L"allocation.ini").c_str(), L"w");
    ASSERT_NE(file, nullptr);
    std::fputs("[first]\nname = the first value\n[second]\nnumber = 0x10\nother = another value\n"
               "[third]\ntext =\n  continued on the next line\n",
               file);
    std::fclose(file);
    // Only error lines are written meanwhile: the allocations of the others would multiply the runs.
    Debug::lock();
    const Debug::Levels level = std::exchange(Debug::_lvl, Debug::lvlError);
    Debug::unlock();
    for (const Operation& operation : operations)
    {
        SCOPED_TRACE(operation.name);
        const std::wstring clean = operation.run(0);
        // The outcome is copied into a block taken before the count, so that it is not counted.
        std::wstring outcome;
        outcome.reserve(1000);
        long long failing = 1;
        for (;; ++failing)
        {
            const long long before = liveBlocks;
            outcome.assign(operation.run(failing).c_str());
            const bool done = !failed;
            EXPECT_TRUE(outcome == clean || (!done && std::count(operation.outOfMemory.begin(),
                                                                 operation.outOfMemory.end(), outcome) == 1))
                << "allocation " << failing << ": " << testing::PrintToString(outcome);
            EXPECT_EQ(liveBlocks - before, 0) << "allocation " << failing;
            if (done)
                break;
        }
        EXPECT_GT(failing, 5);
    }
    Debug::lock();
    Debug::_lvl = level;
    Debug::unlock();
    _wremove(KelvraTest::DataPath(L"allocation.ini").c_str());
}
