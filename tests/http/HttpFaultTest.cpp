// CWinHttpClient over a binding that records its platform calls and fails chosen ones (the rest
// reach the local server): what reaches the platform, and how every failure ends.
#include "HttpTestSupport.h"

#include "KelvraHttp.h"

#include "support/RecordingWinHttp.h"

#include <gtest/gtest.h>

#include <algorithm>

using KelvraHttpTest::NewTraceLines;
using KelvraHttpTest::ServerUrl;
using KelvraTest::RecordingWinHttp;

namespace
{

size_t CountCalls(const std::vector<std::wstring>& calls, size_t from, const std::wstring& name)
{
    return static_cast<size_t>(std::count_if(calls.begin() + static_cast<std::ptrdiff_t>(from), calls.end(),
                                             [&](const std::wstring& call)
                                             { return call.rfind(name, 0) == 0; }));
}

void SendBody(CWinHttpClient& client)
{
    client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>("k=v"), 3);
}

} // namespace

// User agent, time-outs, flags, headers, manual proxy (whole, however long) with its credentials
// (their bytes, no terminator) and body reach WinHTTP in this order; a second request reuses the
// session and, with certificates required, sets no security flags; a new URL drops the body; a
// password without a user name is never sent.
TEST(HttpPlatformCalls, SettingsReachThePlatformInOrder)
{
    RecordingWinHttp platform;
    const std::wstring proxy = std::wstring(300, L'p') + L".example:8080";
    {
        const std::wstring url = ServerUrl(L"/respond?body=secure", true);
        CWinHttpClient client(url);
        client.SetProxy(proxy);
        client.SetProxyUsername(L"user");
        client.SetProxyPassword(L"pass");
        client.SetUserAgent(L"Agent/1");
        client.SetTimeouts(1000, 2000, 3000, 4000);
        client.SetAdditionalRequestHeaders(L"X-A: 1");
        client.SetAdditionalRequestCookies(L"a=1");
        SendBody(client);
        ASSERT_TRUE(client.SendHttpRequest(L"get", true));
        client.SetUserAgent(L"Agent/2");
        client.SetRequireValidSslCertificates(true);
        client.SetProxyUsername(L"");
        client.UpdateUrl(url);
        client.SendHttpRequest(L"GET", false);
    }
    std::wstring calls;
    for (const std::wstring& call : platform.calls)
        calls += call + L"\n";
    EXPECT_EQ(calls.find(L"Open Agent/1 0 0\nSetTimeouts 1000 2000 3000 4000\n"), 0u) << calls;
    EXPECT_NE(
        calls.find(
            L"OpenRequest GET /respond?body=secure 8388608\nSetOption 31 12544\nAddRequestHeaders "
            L"X-A: 1 16777216\nAddRequestHeaders Cookie: a=1 16777216\nSetOption 63 2\nSetOption 38 3 " +
            proxy +
            L" null\nSetOption 4098 user\nSetOption 4099 pass\nSendRequest 3\nWriteData 3\n"
            L"ReceiveResponse\n"),
        std::wstring::npos);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"Open "), 1u);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"SetTimeouts 1000 2000 3000 4000"), 2u);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"SetOption 31"), 1u);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"SendRequest 0"), 5u);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"SetOption 38 3 " + proxy), 2u);
    EXPECT_EQ(CountCalls(platform.calls, 0, L"SetOption 4099"), 1u);
}

// Each row: a client that holds a response ("first", status 200, header X-Mark: first) posts "k=v"
// with redirects off, the extra header X-A and a cookie, for a second response (404, "second",
// X-Mark: second) with the row's proxy settings and fault in force; then it sends once more without.
TEST(HttpFaults, EachFailureEndsAsDocumented)
{
    // The proxy settings of the second request: none, manual (127.0.0.1:8888 with a user name and a
    // password), the user's fixed proxy and bypass list, or also a script that answers a proxy.
    constexpr int none = 0, manual = 1, fixed = 2, script = 3;
    struct Row
    {
        const char* name;
        const wchar_t* op;
        DWORD error;
        int occurrence, times;
        const wchar_t* message; // the error line that says why, if any
        // "<result> <last error> x<sends> <status>|<content>|<X-Mark>|<received>", then the texts
        // released ("Releasing lpsz<text>"), in order
        std::wstring expected;
        int proxy = none;
        DWORD available = 0;
        const wchar_t* url = nullptr; // instead of the second response's
        const wchar_t* method = L"POST";
    };
    const Row rows[] = {
        {"Session", L"Open", 12001, 1, 1, L"Creating Http session failed", L"false 12001 x0 |||0"},
        {"UrlSplitting", L"CrackUrl", 12006, 1, 1, L"Extracting url failed",
         L"false 12006 x0 200|first|first|5"},
        {"Connect", L"Connect", 12007, 1, 1, L"Connecting failed", L"false 12007 x0 200|first|first|5"},
        {"OpenRequest", L"OpenRequest", 12004, 1, 1, L"Creating the request failed",
         L"false 12004 x0 200|first|first|5"},
        {"ExtraHeaders", L"AddRequestHeaders", 87, 1, 1, L"Adding request headers failed",
         L"false 87 x0 200|first|first|5"},
        {"CookieHeader", L"AddRequestHeaders", 87, 2, 1, L"Adding request headers cookie failed",
         L"false 87 x0 200|first|first|5"},
        {"RedirectOption", L"SetOption", 12018, 1, 1, L"Disabling auto redirect option failed",
         L"false 12018 x0 200|first|first|5"},
        {"BodyWrite", L"WriteData", 12030, 1, 1, L"Writing data to the request failed",
         L"false 12030 x1 200|first|first|5"},
        {"Receive", L"ReceiveResponse", 12002, 1, 1, L"Waiting for server's response failed [12002]",
         L"false 12002 x1 200|first|first|5"},
        {"ResendAskedOnTriesOneToFour", L"ReceiveResponse", 12032, 1, 4,
         L"Waiting for server's response failed [12032]", L"true 0 x5 404|second|second|6"},
        {"ResendAskedOnTryFive", L"ReceiveResponse", 12032, 1, 5,
         L"Waiting for server's response failed [12032]", L"false 12032 x5 200|first|first|5"},
        {"EverySendFails", L"SendRequest", 12029, 1, 5, nullptr, L"false 0 x5 200|first|first|5"},
        {"DataAvailable", L"QueryDataAvailable", 12030, 1, 1,
         L"Failed to get the amount of data, in bytes, available to be read",
         L"false 12030 x1 404|first|second|0"},
        {"BodyBeyond32Bits", L"QueryDataAvailable", 0, 2, 1, L"Response body does not fit in memory [6]",
         L"false 8 x1 404|first|second|6", none, 0xFFFFFFFA},
        {"HeaderSizeQuery", L"QueryHeaders", 12150, 1, 1, nullptr, L"true 0 x1 404|second|first|6"},
        {"HeaderQuery", L"QueryHeaders", 12150, 2, 1, nullptr, L"true 0 x1 404|second|first|6"},
        {"StatusSizeQuery", L"QueryHeaders", 12150, 3, 1, nullptr, L"true 0 x1 200|second|second|6"},
        {"StatusQuery", L"QueryHeaders", 12150, 4, 1, nullptr, L"true 0 x1 200|second|second|6"},
        {"FailedReadAddsNothing", L"ReadData", 12030, 1, 1, nullptr, L"true 0 x1 404|second|second|6"},
        {"UndecodableBody", L"MultiByteToWideChar", 1113, 1, 2, nullptr, L"true 0 x1 404|first|second|6"},
        {"OtherVerb", L"GlobalFree", 0, 0, 0, nullptr, L"false 87 x0 200|first|first|5", none, 0, nullptr,
         L"PUT"},
        {"EmptyUrl", L"GlobalFree", 0, 0, 0, nullptr, L"false 3 x0 200|first|first|5", none, 0, L""},
        {"ManualProxy", L"SetOption", 12005, 2, 1, L"Setting manual proxy settings failed",
         L"false 12005 x0 200|first|first|5", manual},
        {"ManualProxyUserName", L"SetOption", 12005, 3, 1, L"Setting manual proxy username failed",
         L"false 12005 x0 200|first|first|5", manual},
        {"ManualProxyPassword", L"SetOption", 12005, 4, 1, L"Setting manual proxy password fialed",
         L"false 12005 x0 200|first|first|5", manual},
        {"UserProxyQuery", L"GetIEProxyConfigForCurrentUser", 5, 1, 1,
         L"Failed to auto detect proxy settings", L"false 5 x0 200|first|first|5", fixed},
        {"ScriptLookUp", L"GetProxyForUrl", 12167, 1, 1, L"Failed to retrieve user's proxy data",
         L"false 12167 x0 200|first|first|5 AutoConfigUrl Proxy ProxyBypass", script},
        {"LookedUpProxy", L"SetOption", 12005, 2, 1, L"Setting user's proxy data failed",
         L"false 12005 x0 200|first|first|5 AutoConfigUrl Proxy ProxyBypass", script},
        {"UsersFixedProxy", L"SetOption", 12005, 2, 1, L"Setting IE proxy data to the request failed",
         L"false 12005 x0 200|first|first|5 Proxy ProxyBypass", fixed},
    };
    const std::wstring second = ServerUrl(L"/respond?status=404&body=second&header=X-Mark:%20second");
    for (const Row& row : rows)
    {
        SCOPED_TRACE(row.name);
        KelvraHttpTest::UserProxySettings settings;
        RecordingWinHttp platform;
        {
            CWinHttpClient client(ServerUrl(L"/respond?body=first&header=X-Mark:%20first"));
            client.SetAdditionalRequestHeaders(L"X-A: 1");
            client.SetAdditionalRequestCookies(L"c=1");
            // A failing session needs a client that has none yet.
            if (std::wstring(row.op) != L"Open")
                client.SendHttpRequest(L"GET", false);
            if (row.proxy == manual)
                client.SetProxy(L"127.0.0.1:8888"), client.SetProxyUsername(L"u"),
                    client.SetProxyPassword(L"p");
            if (row.proxy >= fixed)
                settings.Set(L"127.0.0.1:8888", L"<local>",
                             row.proxy == script ? L"http://127.0.0.1:1/p.pac" : L"");
            if (row.proxy == script)
                platform.lookedUpProxy = {L"127.0.0.1:8889", L"*.local"};
            platform.Add({row.op, row.error, row.occurrence, row.times, row.available});
            client.UpdateUrl(row.url != nullptr ? row.url : second);
            SendBody(client);
            const size_t callsBefore = platform.calls.size();
            NewTraceLines();
            const bool result = client.SendHttpRequest(row.method, true);
            const std::vector<std::wstring> trace = NewTraceLines();

            const std::wstring header = client.GetResponseHeader();
            const size_t mark = header.find(L"X-Mark: ");
            std::wstring released;
            for (const std::wstring& line : trace)
                released += line.rfind(L"TRC Releasing lpsz", 0) == 0 ? L" " + line.substr(18) : L"";
            EXPECT_EQ(KelvraStrings::Strings::Format(
                          L"%s %u x%u %s|%s|%s|%u%s", result ? L"true" : L"false", client.GetLastError(),
                          static_cast<unsigned>(CountCalls(platform.calls, callsBefore, L"SendRequest")),
                          client.GetResponseStatusCode().c_str(), client.GetResponseContent().c_str(),
                          mark == std::wstring::npos
                              ? L""
                              : header.substr(mark + 8, header.find(L'\r', mark) - mark - 8).c_str(),
                          client.GetRawResponseReceivedContentLength(), released.c_str()),
                      row.expected);
            const auto traced = [&](const std::wstring& line)
            { return std::find(trace.begin(), trace.end(), line) != trace.end(); };
            EXPECT_TRUE(row.message == nullptr || traced(L"ERR " + std::wstring(row.message)));
            EXPECT_TRUE(
                row.message == nullptr || result ||
                traced(L"ERR Last documented error [" + std::to_wstring(client.GetLastError()) + L"]"));
            // A refused verb or URL reaches nothing, and only the call itself is traced.
            if (row.times == 0)
            {
                EXPECT_EQ(platform.calls.size(), callsBefore);
                EXPECT_EQ(trace.size(), 1u);
            }
            // Only the session outlives the call; the next call reuses it.
            EXPECT_EQ(platform.open.size(), std::wstring(row.op) == L"Open" ? 0u : 1u);
            platform.ClearFaults();
            client.UpdateUrl(second);
            EXPECT_TRUE(client.SendHttpRequest(L"GET", false));
            EXPECT_EQ(CountCalls(platform.calls, 0, L"Open "), std::wstring(row.op) == L"Open" ? 2u : 1u);
        }
        EXPECT_TRUE(platform.open.empty());
        EXPECT_EQ(platform.strayCloses, 0);
        EXPECT_TRUE(platform.handedOut.empty());
        EXPECT_EQ(platform.strayFrees, 0);
    }
}

// A GET through the user's auto-config script (the binding answers the look-up), a POST through
// a manual proxy with credentials and a POST through the user's fixed proxy, each with a body,
// extra headers and cookies so that every stage runs; each once for every platform call its clean
// run makes, with that call alone failing (12345). A call whose failure fails its stage ends the
// request through the failure path, which closes what the request opened. Each proxy text is
// freed once, and the session serves the next request.
TEST(HttpFaults, AnyPlatformCallFailing)
{
    // The operations whose failure fails the request; a failure of any other is retried or skipped.
    const std::wstring failsTheRequest = L" Open CrackUrl Connect OpenRequest AddRequestHeaders SetOption "
                                         L"GetIEProxyConfigForCurrentUser GetProxyForUrl WriteData "
                                         L"ReceiveResponse QueryDataAvailable ";
    const std::wstring script = L"http://127.0.0.1:1/p.pac";
    for (const auto& [method, proxy] :
         {std::pair{L"GET", script}, std::pair{L"POST", std::wstring(L"manual")},
          std::pair{L"POST", std::wstring()}})
    {
        KelvraHttpTest::UserProxySettings settings;
        settings.Set(L"127.0.0.1:8888", L"<local>", proxy == script ? script : L"");
        std::vector<std::wstring> cleanCalls;
        for (size_t failing = 0; failing <= cleanCalls.size(); ++failing)
        {
            const std::wstring call = failing == 0 ? L"none" : cleanCalls[failing - 1];
            SCOPED_TRACE(testing::Message() << method << " " << proxy << ", failing: " << call);
            RecordingWinHttp platform;
            platform.lookedUpProxy = {L"127.0.0.1:8889", L"*.local"};
            {
                CWinHttpClient client(ServerUrl(L"/respond?body=abc"));
                client.SetAdditionalRequestHeaders(L"X-A: 1");
                client.SetAdditionalRequestCookies(L"c=1");
                if (proxy == L"manual")
                    client.SetProxy(L"127.0.0.1:8888"), client.SetProxyUsername(L"u"),
                        client.SetProxyPassword(L"p");
                SendBody(client);
                if (failing > 0)
                    platform.FailCall(static_cast<int>(failing), 12345);
                NewTraceLines();
                const bool result = client.SendHttpRequest(method, std::wstring(method) == L"POST");
                const std::vector<std::wstring> trace = NewTraceLines();
                if (failing == 0)
                    cleanCalls = platform.calls;
                const std::wstring op = call.substr(0, call.find(L' '));
                const bool fails = failsTheRequest.find(L' ' + op + L' ') != std::wstring::npos;
                EXPECT_EQ(result, !fails);
                EXPECT_EQ(client.GetLastError(), fails ? 12345u : 0u);
                // What was opened before the failing call, and only that, is closed.
                const auto openedBefore = [&](const wchar_t* name)
                {
                    const auto at =
                        std::find_if(cleanCalls.begin(), cleanCalls.end(),
                                     [&](const std::wstring& c) { return c.rfind(name, 0) == 0; });
                    return static_cast<size_t>(at - cleanCalls.begin()) + 1 < failing ? 1 : 0;
                };
                EXPECT_EQ(std::count(trace.begin(), trace.end(), L"TRC Closing request"),
                          fails ? openedBefore(L"OpenRequest ") : 1);
                EXPECT_EQ(std::count(trace.begin(), trace.end(), L"TRC Closing connection"),
                          fails ? openedBefore(L"Connect ") : 1);
                EXPECT_EQ(std::count(trace.begin(), trace.end(), L"ERR Last documented error [12345]"),
                          fails ? 1 : 0);
                EXPECT_EQ(platform.open.size(), op == L"Open" ? 0u : 1u);
                platform.ClearFaults();
                EXPECT_TRUE(client.SendHttpRequest(L"GET", false));
                EXPECT_EQ(CountCalls(platform.calls, 0, L"Open "), op == L"Open" ? 2u : 1u);
            }
            EXPECT_TRUE(platform.open.empty());
            EXPECT_EQ(platform.strayCloses, 0);
            EXPECT_TRUE(platform.handedOut.empty());
            EXPECT_EQ(platform.strayFrees, 0);
        }
        EXPECT_GT(cleanCalls.size(), 20u);
    }
}
