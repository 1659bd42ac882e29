// Operations run once for every heap allocation they make, with that allocation alone failing
// (tests/support/FailingAllocator.cpp replaces operator new in this program).
#include "HttpTestSupport.h"

#include "KelvraHttp.h"
#include "KelvraIni.h"
#include "KelvraTrace.h"

#include "common/UniqueHandle.h"
#include "http/HeaderPatterns.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/RegexPattern.h"
#include "support/FailingAllocator.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <optional>

using KelvraStrings::Strings;
using KelvraTest::AllocationFailure;

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
    bool sent;
    {
        AllocationFailure failure(failing);
        sent = client.SendHttpRequest(L"POST", true);
    }
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
    std::wstring outcome;
    try
    {
        std::optional<INIReader> reader;
        {
            AllocationFailure failure(failing);
            reader.emplace(path);
        }
        outcome = Strings::Format(
            L"%d %s %d %s", reader->ParseError(), reader->Get(L"First", L"name", L"").c_str(),
            reader->GetInteger(L"second", L"Number", 0), reader->Get(L"third", L"text", L"").c_str());
    }
    catch (const std::bad_alloc&)
    {
        outcome = L"bad_alloc";
    }
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
    int compiled;
    bool matched = false;
    {
        AllocationFailure failure(failing);
        compiled = pattern.Parse(L"{(a|b)+}c\\z?");
        matched = compiled == 0 && pattern.Match(text.c_str(), context);
    }
    if (compiled != 0)
        return L"compile error " + std::to_wstring(compiled);
    if (!matched)
        return context.OutOfMemory() ? L"out of memory" : L"no match";
    const CRegexMatchContext::Capture capture = context.Group(0);
    return L"capture of " + std::to_wstring(capture.end - capture.start);
}

// The cookie pattern over three cookies of 300 characters, each taking the stack beyond 256. (A
// match that memory cut short once passed for the end of the matches: true, with the cookies
// found before it.)
std::wstring ExtractCookies(long long failing)
{
    std::wstring header = L"HTTP/1.1 200 OK\r\n";
    for (const wchar_t name : {L'a', L'b', L'c'})
        header += L"Set-Cookie: " + std::wstring(1, name) + L"=" + std::wstring(300, L'v') + L"\r\n";
    const std::wstring pattern = KelvraHeaderPatterns::kCookies;
    std::vector<std::wstring> values;
    bool found;
    {
        AllocationFailure failure(failing);
        found = ExtractPatternGroups(pattern, header, values);
    }
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
    {
        std::FILE* file = _wfopen(KelvraTest::DataPath(L"allocation.ini").c_str(), L"w");
        ASSERT_NE(file, nullptr);
        std::fputs("[first]\nname = the first value\n[second]\nnumber = 0x10\nother = another value\n"
                   "[third]\ntext =\n  continued on the next line\n",
                   file);
        std::fclose(file);
    }
    // Only error lines are written meanwhile: the allocations of the others would multiply the runs.
    Debug::lock();
    const Debug::Levels level = Debug::_lvl;
    Debug::_lvl = Debug::lvlError;
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
            const long long before = KelvraTest::LiveAllocations();
            outcome.assign(operation.run(failing).c_str());
            const long long leaked = KelvraTest::LiveAllocations() - before;
            const bool done = !AllocationFailure::Happened();
            EXPECT_TRUE(outcome == clean ||
                        (!done && std::find(operation.outOfMemory.begin(), operation.outOfMemory.end(),
                                            outcome) != operation.outOfMemory.end()))
                << "allocation " << failing << ": " << testing::PrintToString(outcome);
            EXPECT_EQ(leaked, 0) << "allocation " << failing;
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
