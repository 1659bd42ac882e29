// CWinHttpClient against the hostile listener of tests/support/http_server.py: replies that no
// well-behaved server sends. Each ends in bounded time with the result the client documents, or
// the one WinHTTP gives, and leaves no WinHTTP handle open.
#include "HttpTestSupport.h"

#include "KelvraHttp.h"

#include "support/RecordingWinHttp.h"

#include <gtest/gtest.h>

// Each row: a fresh client with a receive time-out of 1 s GETs the scripted reply, then the same
// client GETs a plain answer from the well-behaved server. The summary: "<result> <last error>
// <status> <received>/<announced> h<header characters> c<cookie characters> <content>".
TEST(HttpHostileServers, EveryReplyEndsInTimeWithNothingOpen)
{
    struct Row
    {
        const wchar_t* reply;
        std::wstring expected;
        ULONGLONG limitMs = 3000;
    };
    const Row rows[] = {
        // 2,048 lines of 512 bytes. (Wine stores header lines in time of the square of their
        // count: 16,384 lines of 64 bytes took it 30 s.)
        {L"many-lines", L"true 0 200 2/2 h1048614 c0 ok"},
        // Wine keeps the first 1,460 bytes or so of a header line and drops the rest of it.
        {L"long-line", L"true 0 200 2/2 h1499 c0 ok"},
        // 20,000 Set-Cookie lines: every value is kept ("c00000=0; ...; c19999=19999;").
        {L"cookies", L"true 0 200 2/2 h508928 c268889 ok", 20000},
        // A length beyond 32 bits counts as the largest one; the body ends at the close.
        {L"huge-length", L"true 0 200 5/4294967295 h57 c0 short"},
        {L"five-gib", L"true 0 200 5/4294967295 h47 c0 short"},
        // Wine takes a reply cut in its headers for one without a body.
        {L"cut-headers", L"true 0 200 0/0 h17 c0 "},
        {L"cut-body", L"true 0 200 7/1000 h41 c0 partial"},
        {L"garbage-status", L"false 12152  0/0 h0 c0 "},
        {L"empty", L"false 12152  0/0 h0 c0 "},
        // The headers, then 4 s of silence: the receive time-out ends the body's wait, Wine
        // answering 10060 (WSAETIMEDOUT) where Windows answers 12002.
        {L"stall", L"false 10060 200 0/100 h40 c0 "},
    };
    for (const Row& row : rows)
    {
        SCOPED_TRACE(testing::Message() << row.reply);
        KelvraTest::RecordingWinHttp platform;
        {
            CWinHttpClient client(KelvraHttpTest::HostileUrl(row.reply));
            client.SetTimeouts(0, 5000, 5000, 1000);
            const ULONGLONG start = ::GetTickCount64();
            const bool result = client.SendHttpRequest(L"GET", false);
            const ULONGLONG took = ::GetTickCount64() - start;
            EXPECT_LT(took, row.limitMs);
            EXPECT_EQ(KelvraStrings::Strings::Format(
                          L"%s %u %s %u/%u h%u c%u %s", result ? L"true" : L"false", client.GetLastError(),
                          client.GetResponseStatusCode().c_str(),
                          client.GetRawResponseReceivedContentLength(), client.GetRawResponseContentLength(),
                          static_cast<unsigned>(client.GetResponseHeader().size()),
                          static_cast<unsigned>(client.GetResponseCookies().size()),
                          client.GetResponseContent().substr(0, 16).c_str()),
                      row.expected)
                << took << " ms";
            client.UpdateUrl(KelvraHttpTest::ServerUrl(L"/respond?body=fine"));
            EXPECT_TRUE(client.SendHttpRequest(L"GET", false));
            EXPECT_EQ(client.GetResponseContent(), L"fine");
        }
        EXPECT_TRUE(platform.open.empty());
        EXPECT_EQ(platform.strayCloses, 0);
    }
}
