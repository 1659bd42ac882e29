// CWinHttpClient against the local HTTP, HTTPS and hostile servers (tests/support/http_server.py),
// through the recording binding where its platform calls matter, its trace read back from the log.
#include "KelvraHttp.h"
#include "KelvraStrings.h"
#include "KelvraTrace.h"

#include "support/RecordingWinHttp.h"
#include "support/TestData.h"
#include "trace/TraceTestSupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <set>

using KelvraStrings::Strings;
using KelvraTest::RecordingWinHttp;

// path on a local listener started by ctest: "http", "https" or "hostile" (replies named by path).
std::wstring ServerUrl(const std::wstring& path, const std::wstring& listener = L"http")
{
    const std::string port = KelvraTest::ReadBinaryFile(KelvraTest::DataPath(listener + L"_server.port"));
    return (listener == L"https" ? L"https" : L"http") +
           (L"://127.0.0.1:" + std::wstring(port.begin(), port.end())) + path;
}

namespace
{

size_t traceLogSeen = 0;

// The trace lines written since the previous call, each as "<tag> <message>" ("TRC [1] try").
std::vector<std::wstring> NewTraceLines()
{
    const std::string log = KelvraTraceTest::ReadMarkerFile(L"http_tests.log");
    std::vector<std::wstring> lines;
    for (const std::string& line :
         KelvraTraceTest::TaggedMessages(log.substr(std::min(traceLogSeen, log.size()))))
        lines.push_back(KelvraStrings::Strings::ToString(line));
    return traceLogSeen = log.size(), lines;
}

// The trace session c:\keltrace\http_tests.log while the tests run.
class TraceSession : public testing::Environment
{
public:
    void SetUp() override
    {
        std::filesystem::create_directory(KelvraTraceTest::kMarker);
        Debug::start(L"http_tests", false, false);
        ASSERT_NE(CLog::_log, nullptr) << "no trace session in c:\\keltrace";
        traceLogSeen = KelvraTraceTest::ReadMarkerFile(L"http_tests.log").size();
    }
    void TearDown() override
    {
        Debug::stop();
        Debug::lock();
        std::fclose(CLog::_log);
        CLog::_log = nullptr;
        Debug::unlock();
        std::filesystem::remove(KelvraTraceTest::kMarker / L"http_tests.log");
        std::error_code inUse; // the folder stays if it holds other files
        std::filesystem::remove(KelvraTraceTest::kMarker, inUse);
    }
};

// The current user's proxy settings, in the registry value Wine's WinHTTP reads (README): none
// while the object lives, unless set; then the value found is put back (ctest lock hkcu_proxy).
class UserProxySettings
{
public:
    UserProxySettings()
    {
        DWORD size = 65536;
        m_saved.resize(size);
        m_read =
            ::RegGetValueW(HKEY_CURRENT_USER, kKey, kValue, RRF_RT_REG_BINARY, nullptr, &m_saved[0], &size);
        m_saved.resize(m_read == ERROR_SUCCESS ? size : 0);
        Set(L"", L"", L"");
    }
    ~UserProxySettings()
    {
        if (m_read == ERROR_SUCCESS)
            ::RegSetKeyValueW(HKEY_CURRENT_USER, kKey, kValue, REG_BINARY, m_saved.data(),
                              DWORD(m_saved.size()));
        else if (m_read == ERROR_FILE_NOT_FOUND)
            ::RegDeleteKeyValueW(HKEY_CURRENT_USER, kKey, kValue);
    }
    // 0x46, a counter, flags (1 direct, 2 proxy, 4 script), then each text as a length and ANSI bytes.
    static void Set(const std::wstring& proxy, const std::wstring& bypass, const std::wstring& script)
    {
        std::string value;
        const auto add = [&](size_t number) { value.append(reinterpret_cast<const char*>(&number), 4); };
        add(0x46), add(0), add(1 | (proxy.empty() ? 0 : 2) | (script.empty() ? 0 : 4));
        for (const std::wstring* text : {&proxy, &bypass, &script})
            add(text->size()), value.append(text->begin(), text->end());
        ::RegSetKeyValueW(HKEY_CURRENT_USER, kKey, kValue, REG_BINARY, value.data(), DWORD(value.size()));
    }

private:
    static constexpr const wchar_t* kKey =
        L"Software\\Microsoft\\Windows\\CurrentVersion\\Internet Settings\\Connections";
    static constexpr const wchar_t* kValue = L"DefaultConnectionSettings";
    std::string m_saved;
    LONG m_read;
};

testing::Environment* const traceSession = testing::AddGlobalTestEnvironment(new TraceSession);

size_t CountCalls(const std::vector<std::wstring>& calls, const std::wstring& prefix)
{
    return std::count_if(calls.begin(), calls.end(),
                         [&](const std::wstring& call) { return call.rfind(prefix, 0) == 0; });
}

std::vector<double> reports;

bool RecordProgress(double percent)
{
    reports.push_back(percent);
    return false;
}

std::wstring Join(const std::vector<std::wstring>& lines)
{
    std::wstring text;
    for (const std::wstring& line : lines)
        text += line + L"\n";
    return text;
}

// The received bytes are followed by a zero byte however the request ended.
bool BodyEndsInZero(CWinHttpClient& client)
{
    const unsigned char* const body = client.GetRawResponseContent();
    return body == nullptr || body[client.GetRawResponseReceivedContentLength()] == 0;
}

} // namespace

// An extra header, a cookie, the body "k=v" (for a POST) and, with a proxy, its user name and password.
void Prepare(CWinHttpClient& client, const std::wstring& proxy)
{
    client.SetAdditionalRequestHeaders(L"X-A: 1");
    client.SetAdditionalRequestCookies(L"c=1");
    client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>("k=v"), 3);
    client.SetProxy(proxy), client.SetProxyUsername(L"u"), client.SetProxyPassword(L"p");
}

// A fresh client per row with the header "X-One: 1", the cookies "a=1; b=2" (a POST: the body "k=v")
// and the row's setup fetches before, then path ("/..." on the HTTP server). The summary: "<result>
// <last error> (<error of the last failed send, as traced>) <status> [<charset>] <received>/<announced>
// <location> {<cookies>} <content>".
TEST(HttpExchanges, ResultsAsTheClientShowsThem)
{
    struct Row
    {
        const char* name;
        void (*setup)(CWinHttpClient&);
        std::wstring before, path, method;
        bool redirectOff;
        std::wstring expected;
    };
    const std::wstring echoed = L"X-One: 1\nCookie: a=1; b=2\nUser-Agent: WinHttpClient\n";
    const std::wstring type = L"/respond?header=Content-Type:%20text/plain;%20charset=";
    const std::wstring moved = L"/respond?status=302&header=Location:%20/respond%3Fbody%3Dmoved";
    const auto fail = [](const wchar_t* error)
    { return std::wstring(L"false ") + error + L"  [] 0/0 <> {} "; };
    const Row rows[] = {
        {"PostEcho", nullptr, L"", L"/echo", L"POST", false,
         L"true 0 () 200 [] 79/79 <> {} POST\n" + echoed + L"Content-Length: 3\n\nk=v"},
        {"ChunkedKeepsEarlierLength", nullptr, L"/respond?body=12345", L"/respond?chunked=1&body=abcdefg",
         L"GET", false, L"true 0 () 200 [] 7/5 <> {} abcdefg"},
        {"ZeroByteEndsText", nullptr, L"", L"/respond?body=ab%00cd", L"GET", false,
         L"true 0 () 200 [] 5/5 <> {} ab"},
        {"Latin1ThroughAnsiCodePage", nullptr, L"", type + L"ISO-8859-1&body=%E9t%E9", L"GET", false,
         L"true 0 () 200 [ISO-8859-1] 3/3 <> {} \u00e9t\u00e9"},
        {"NoCharsetKeepsEarlierOne", nullptr, type + L"UTF-8", L"/respond?body=%C3%A9", L"GET", false,
         L"true 0 () 200 [UTF-8] 2/2 <> {} \u00e9"},
        {"ForcedCharsetWins", [](CWinHttpClient& client) { client.SetForceCharset(L"utf-8"); }, L"",
         type + L"ISO-8859-1&body=%C3%A9", L"GET", false, L"true 0 () 200 [utf-8] 2/2 <> {} \u00e9"},
        {"CookiesAccumulate", nullptr,
         L"/respond?header=Set-Cookie:%20a=1;%20Path=/&header=Set-Cookie:%20b=2",
         L"/respond?header=Set-Cookie:%20c=3", L"GET", false,
         L"true 0 () 200 [] 0/0 <> {a=1; Path=/; b=2;c=3;} "},
        {"CutHtmlGetSentFiveTimes", nullptr, L"/respond?key=get&body=%3CHTML%3Ecut", L"/count?key=get",
         L"GET", false, L"true 0 () 200 [] 1/1 <> {} 5"},
        // The end tag last, right after a '<' the scan has just passed.
        {"WholeHtmlGetSentOnce", nullptr, L"/respond?key=whole&body=%3Chtml%3E%3C%3C/HTML%3E",
         L"/count?key=whole", L"GET", false, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"CutHtmlPostSentOnce", nullptr, L"/respond?key=post&body=%3Chtml%3Ecut", L"/count?key=post", L"POST",
         false, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"CutHtmlWithoutRedirectsSentOnce", nullptr, L"/respond?key=direct&body=%3Chtml%3Ecut",
         L"/count?key=direct", L"GET", true, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"RedirectReturned", nullptr, L"", moved, L"GET", true,
         L"true 0 () 302 [] 0/0 </respond?body=moved> {} "},
        {"RefusedPort", nullptr, L"", L"http://127.0.0.1:1/", L"GET", false, fail(L"0 (12029)")},
        {"PathTooLongForItsBuffer", nullptr, L"", L"/" + std::wstring(1500, L'p'), L"GET", false,
         fail(L"122 ()")},
        {"OtherMethodRefused", nullptr, L"", L"/respond", L"PUT", false, fail(L"87 ()")},
        {"EmptyUrl", nullptr, L"", L"", L"GET", false, fail(L"3 ()")},
    };
    for (const Row& row : rows)
    {
        SCOPED_TRACE(row.name);
        CWinHttpClient client(L"");
        client.SetAdditionalRequestHeaders(L"X-One: 1");
        client.SetAdditionalRequestCookies(L"a=1; b=2");
        if (row.setup != nullptr)
            row.setup(client);
        const auto send = [&](const std::wstring& path)
        {
            client.UpdateUrl(path.rfind(L"/", 0) == 0 ? ServerUrl(path) : path);
            if (row.method == L"POST")
                client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>("k=v"), 3);
            NewTraceLines();
            return client.SendHttpRequest(row.method, row.redirectOff);
        };
        if (!row.before.empty())
            send(row.before);
        const bool result = send(row.path);
        std::wstring failedSend;
        for (const std::wstring& line : NewTraceLines())
            if (line.rfind(L"TRC Send failed with error [", 0) == 0)
                failedSend = line.substr(28, line.size() - 29);
        EXPECT_EQ(Strings::Format(L"%s %u (%s) %s [%s] %u/%u <%s> {%s} %s", result ? L"true" : L"false",
                                  client.GetLastError(), failedSend.c_str(),
                                  client.GetResponseStatusCode().c_str(), client.GetResponseCharset().c_str(),
                                  client.GetRawResponseReceivedContentLength(),
                                  client.GetRawResponseContentLength(), client.GetResponseLocation().c_str(),
                                  client.GetResponseCookies().c_str(), client.GetResponseContent().c_str()),
                  row.expected);
        EXPECT_TRUE(BodyEndsInZero(client));
    }
}

// 4 MiB of every byte value arrive whole and are saved byte for byte; progress goes from 0 to 100
// with a Content-Length and is never reported without one. Nothing is saved without a body, and a
// write that fails is no success. A callback that throws, against its contract, fails the request.
TEST(HttpExchanges, LargeBodySavedWithProgress)
{
    const std::wstring file = KelvraTest::DataPath(L"large_body.bin");
    CWinHttpClient client(ServerUrl(L"/respond"), &RecordProgress);
    ASSERT_TRUE(client.SendHttpRequest(L"GET", false));
    EXPECT_FALSE(client.SaveResponseToFile(file));
    EXPECT_FALSE(std::filesystem::exists(file));
    client.UpdateUrl(ServerUrl(L"/big?size=4194304"));
    ASSERT_TRUE(client.SendHttpRequest(L"GET", false));
    EXPECT_FALSE(client.SaveResponseToFile(L"Z:\\dev\\full"));
    ASSERT_TRUE(client.SaveResponseToFile(file));
    std::string expected(4u << 20, '\0');
    for (size_t i = 0; i < expected.size(); ++i)
        expected[i] = static_cast<char>(i % 65521 * 7919 % 251); // BLOCK in http_server.py
    EXPECT_TRUE(KelvraTest::ReadBinaryFile(file) == expected) << "the saved body differs";
    EXPECT_TRUE(std::filesystem::remove(file));
    ASSERT_GE(reports.size(), 2u);
    EXPECT_EQ(reports.front(), 0.0);
    EXPECT_EQ(reports[reports.size() - 2], 100.0)
        << "the final empty read and the stage's end both report 100";
    EXPECT_EQ(reports.back(), 100.0);
    EXPECT_TRUE(std::is_sorted(reports.begin(), reports.end()));

    reports.clear();
    CWinHttpClient chunked(ServerUrl(L"/respond?chunked=1&body=abcdefg"), &RecordProgress);
    ASSERT_TRUE(chunked.SendHttpRequest(L"GET", false));
    EXPECT_EQ(chunked.GetResponseContent(), L"abcdefg");
    EXPECT_TRUE(reports.empty());
    CWinHttpClient throwing(ServerUrl(L"/respond?body=x"), [](double) -> bool { throw 1; });
    EXPECT_FALSE(throwing.SendHttpRequest(L"GET", false));
    EXPECT_EQ(throwing.GetLastError(), 1359u);
}

// The lines of a new client's GET, exactly, with no proxy settings and through each kind of the
// user's proxy settings, as Wine and the recording binding (error 2, the look-up Wine refuses) answer.
TEST(HttpTrace, SequencesOfAClientsLife)
{
    UserProxySettings settings;
    RecordingWinHttp platform;
    const std::wstring url = ServerUrl(L"/respond?body=hello");
    const wchar_t* const lines = LR"(INF Constructing the Http client [%s]
TRC Trying to send Http request using method [GET], disable auto redirect [false]
TRC Creating Http session
TRC Setting Http timeouts [0][60000][30000][30000]
TRC Extracting url
TRC Connecting to server with host [127.0.0.1], port [%s]
TRC Creating the request to [/respond?body=hello]
TRC Request was created
TRC Cracking proxy configuration
TRC Setting auto proxy settings
%sTRC [1] try
TRC Sending the Http request, total data to send [0]
TRC Send succeeded
TRC Waiting for server's response
TRC Retrieving response header information size
TRC Response header information size [%d]
TRC Retrieving response header information
TRC Retrieving response status header size
TRC Response status header size [8]
TRC Getting the amount of data, in bytes, available to be read
TRC [5] amount of data available to be read
TRC Read the data
TRC [5] amount of data was read
TRC Getting the amount of data, in bytes, available to be read
TRC [0] amount of data available to be read
TRC Read the data
TRC [0] amount of data was read
TRC Finished reading response available data
TRC Closing request
TRC Closing connection
INF Destructing the Http client
)";
    const auto life = [&](const std::wstring& proxyLines)
    {
        NewTraceLines();
        int headerSize = 0;
        {
            CWinHttpClient client(url);
            client.SendHttpRequest(L"GET", false);
            // WinHTTP gives the size in bytes, the terminator included.
            headerSize = int(client.GetResponseHeader().size() * 2 + 2);
        }
        EXPECT_EQ(Join(NewTraceLines()),
                  Strings::Format(lines, url.c_str(), url.substr(17, url.find(L'/', 17) - 17).c_str(),
                                  proxyLines.c_str(), headerSize));
    };
    life(L"");
    platform.Fail(L"GetIEProxyConfigForCurrentUser", ERROR_FILE_NOT_FOUND);
    life(L"TRC No Internet Explorer proxy settings can be found\n");
    const std::wstring bypass = L"<local>;" + std::wstring(300, L'b') + L".example";
    settings.Set(L"127.0.0.1:8888", bypass, L"");
    const std::wstring released = L"TRC Releasing lpszProxy\nTRC Releasing lpszProxyBypass\n";
    life(L"TRC Could not find IE Auto Config Url but IE proxy url is set to [127.0.0.1:8888]\n"
         L"TRC IE optional proxy by-pass server list is set to [" +
         bypass + L"]\nTRC Setting IE proxy data to the request\n" + released);
    const std::wstring script =
        ServerUrl(L"/respond?body=function%20FindProxyForURL(u,h){return%22PROXY%20127.0.0.1:8888%22}");
    settings.Set(L"127.0.0.1:8888", L"<local>", script);
    const std::wstring lookUp =
        L"TRC IE Auto Config Url is set to [" + script + L"]\nTRC Retrieving user's proxy data\n";
    const std::wstring userReleased = L"TRC Releasing lpszAutoConfigUrl\n" + released;
    platform.lookedUpProxy = {L"127.0.0.1:8889", L"*.local"};
    life(lookUp + L"TRC Setting user's proxy data\n" + released + userReleased);
    for (const std::wstring& call :
         {L"SetOption 38 3 127.0.0.1:8888 " + bypass, L"GetProxyForUrl " + url + L" 3 1 " + script + L" 1",
          std::wstring(L"SetOption 38 3 127.0.0.1:8889 *.local")})
        EXPECT_GE(std::count(platform.calls.begin(), platform.calls.end(), call), 1) << call;
    EXPECT_EQ(platform.Imbalance(), std::vector<size_t>(4, 0));
}

// Replies no well-behaved server sends: a fresh client (receive time-out 1 s) GETs each in bounded
// time with the documented result or WinHTTP's, then a plain answer, and leaves no handle open. The
// summary: "<result> <last error> <status> <received>/<announced> h<header> c<cookie chars> <content>".
TEST(HttpHostileServers, EveryReplyEndsInTimeWithNothingOpen)
{
    const std::pair<const wchar_t*, std::wstring> rows[] = {
        // 1 MiB in 2,048 lines (Wine's time grows with the square of the count: 16,384 took 30 s).
        {L"many-lines", L"true 0 200 2/2 h1048614 c0 ok"},
        // Wine keeps the first 1,460 bytes or so of a header line and drops the rest of it.
        {L"long-line", L"true 0 200 2/2 h1499 c0 ok"},
        // 20,000 Set-Cookie lines: every value is kept ("c00000=0; ...; c19999=19999;").
        {L"cookies", L"true 0 200 2/2 h508928 c268889 ok"},
        // A length beyond 64 or 32 bits counts as the largest one; the body ends at the close.
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
    for (const auto& [reply, expected] : rows)
    {
        SCOPED_TRACE(testing::Message() << reply);
        RecordingWinHttp platform;
        {
            CWinHttpClient client(ServerUrl(L"/" + std::wstring(reply), L"hostile"));
            client.SetTimeouts(0, 5000, 5000, 1000);
            const ULONGLONG start = ::GetTickCount64();
            const bool result = client.SendHttpRequest(L"GET", false);
            // Well before the stalled reply's close; the others only must not hang.
            EXPECT_LT(::GetTickCount64() - start, reply == std::wstring(L"stall") ? 3000u : 20000u);
            EXPECT_EQ(Strings::Format(L"%s %u %s %u/%u h%u c%u %s", result ? L"true" : L"false",
                                      client.GetLastError(), client.GetResponseStatusCode().c_str(),
                                      client.GetRawResponseReceivedContentLength(),
                                      client.GetRawResponseContentLength(),
                                      unsigned(client.GetResponseHeader().size()),
                                      unsigned(client.GetResponseCookies().size()),
                                      client.GetResponseContent().substr(0, 16).c_str()),
                      expected);
            EXPECT_TRUE(BodyEndsInZero(client));
            client.UpdateUrl(ServerUrl(L"/respond?body=fine"));
            EXPECT_TRUE(client.SendHttpRequest(L"GET", false) && client.GetResponseContent() == L"fine");
        }
        EXPECT_EQ(platform.Imbalance(), std::vector<size_t>(4, 0));
    }
}

// User agent, time-outs, flags, headers, manual proxy (whole, however long) with its credentials
// (their bytes, no terminator) and body reach WinHTTP in this order; a second request reuses the
// session, sends no body after a new URL and, with certificates required, sets no security flags;
// a password without a user name is never sent.
TEST(HttpPlatformCalls, SettingsReachThePlatformInOrder)
{
    RecordingWinHttp platform;
    const std::wstring proxy = std::wstring(300, L'p') + L".example:8080";
    {
        CWinHttpClient client(ServerUrl(L"/respond?body=secure", L"https"));
        Prepare(client, proxy);
        client.SetProxyUsername(L"user");
        client.SetUserAgent(L"Agent/1");
        client.SetTimeouts(1000, 2000, 3000, 4000);
        ASSERT_TRUE(client.SendHttpRequest(L"get", true));
        client.SetUserAgent(L"Agent/2");
        client.SetRequireValidSslCertificates(true);
        client.SetProxyUsername(L"");
        client.UpdateUrl(ServerUrl(L"/respond?body=secure", L"https"));
        client.SendHttpRequest(L"GET", false);
    }
    const std::wstring calls = Join(platform.calls);
    EXPECT_EQ(calls.find(L"Open Agent/1 0 null null 0\nSetTimeouts 1000 2000 3000 4000\n"), 0u) << calls;
    EXPECT_NE(
        calls.find(L"OpenRequest GET /respond?body=secure null null 8388608\nSetOption 31 12544\n"
                   L"AddRequestHeaders X-A: 1 6 16777216\nAddRequestHeaders Cookie: c=1 11 16777216\n"
                   L"SetOption 63 2\nSetOption 38 3 " +
                   proxy +
                   L" null\nSetOption 4098 user\nSetOption 4099 p\nSendRequest null 0 0 3 0\nWriteData 3\n"),
        std::wstring::npos);
    // One session; time-outs set per request, security flags only while certificates may be bad,
    // the password only with a user name, the proxy each time; five tries at the refused certificate.
    for (const auto& [call, count] : {std::pair{std::wstring(L"Open "), 1u},
                                      {L"SetTimeouts 1000 2000 3000 4000", 2u},
                                      {L"SetOption 31", 1u},
                                      {L"SetOption 4099", 1u},
                                      {L"SetOption 38 3 " + proxy, 2u},
                                      {L"SendRequest null 0 0 0 0", 5u}})
        EXPECT_EQ(CountCalls(platform.calls, call), count) << call;
}

// A GET through the user's auto-config script, a POST through a manual proxy with credentials and
// one through the user's fixed proxy, once for every platform call of the clean run with that call
// alone failing (12345; a receive asks for a resend, 12032, on all five tries). A failed stage ends
// the request with its error line and error, closing only what the request opened; each proxy text
// is freed once, and the session serves the next request.
TEST(HttpFaults, AnyPlatformCallFailing)
{
    // The operations whose failure fails the request; a failure of any other is retried or skipped.
    const std::wstring failsTheRequest = L" Open CrackUrl Connect OpenRequest AddRequestHeaders SetOption "
                                         L"GetIEProxyConfigForCurrentUser GetProxyForUrl WriteData "
                                         L"ReceiveResponse QueryDataAvailable ";
    const std::wstring script = L"http://127.0.0.1:1/p.pac";
    std::set<std::wstring> messages; // "<operation>: <error line>"
    for (const auto& [method, proxy] :
         {std::pair{L"GET", script}, std::pair{L"POST", std::wstring(L"manual")},
          std::pair{L"POST", std::wstring()}})
    {
        UserProxySettings settings;
        settings.Set(L"127.0.0.1:8888", L"<local>", proxy == script ? script : L"");
        std::vector<std::wstring> cleanCalls;
        for (size_t failing = 0; failing <= cleanCalls.size(); ++failing)
        {
            const std::wstring call = failing == 0 ? L"none" : cleanCalls[failing - 1];
            const std::wstring op = call.substr(0, call.find(L' '));
            const bool receive = op == L"ReceiveResponse";
            const DWORD error = receive ? ERROR_WINHTTP_RESEND_REQUEST : 12345;
            SCOPED_TRACE(testing::Message() << method << " " << proxy << ", failing: " << call);
            RecordingWinHttp platform;
            platform.lookedUpProxy = {L"127.0.0.1:8889", L"*.local"};
            {
                CWinHttpClient client(ServerUrl(L"/respond?body=abc"));
                Prepare(client, proxy == L"manual" ? L"127.0.0.1:8888" : L"");
                platform.Fail(op, error,
                              int(std::count_if(cleanCalls.begin(), cleanCalls.begin() + failing,
                                                [&](auto& c) { return c.substr(0, c.find(L' ')) == op; })),
                              receive ? 5 : 1);
                NewTraceLines();
                const bool result = client.SendHttpRequest(method, std::wstring(method) == L"POST");
                const std::vector<std::wstring> trace = NewTraceLines();
                EXPECT_TRUE(BodyEndsInZero(client));
                if (failing == 0)
                    cleanCalls = platform.calls;
                const bool fails = failsTheRequest.find(L' ' + op + L' ') != std::wstring::npos;
                EXPECT_EQ(result, !fails);
                EXPECT_EQ(client.GetLastError(), fails ? error : 0u);
                const auto last = std::find(trace.begin(), trace.end(),
                                            L"ERR Last documented error [" + std::to_wstring(error) + L"]");
                EXPECT_EQ(last != trace.end(), fails);
                if (last != trace.begin() && last != trace.end())
                    messages.insert(op + L": " + last[-1]);
                EXPECT_EQ(platform.open.size(), op == L"Open" ? 0u : 1u);
                platform.ClearFaults();
                EXPECT_TRUE(client.SendHttpRequest(L"GET", false));
                EXPECT_EQ(CountCalls(platform.calls, L"Open "), op == L"Open" ? 2u : 1u);
            }
            EXPECT_EQ(platform.Imbalance(), std::vector<size_t>(4, 0));
        }
        EXPECT_GT(cleanCalls.size(), 20u);
    }
    EXPECT_EQ(Join({messages.begin(), messages.end()}),
              LR"(AddRequestHeaders: ERR Adding request headers cookie failed
AddRequestHeaders: ERR Adding request headers failed
Connect: ERR Connecting failed
CrackUrl: ERR Extracting url failed
GetIEProxyConfigForCurrentUser: ERR Failed to auto detect proxy settings
GetProxyForUrl: ERR Failed to retrieve user's proxy data
Open: ERR Creating Http session failed
OpenRequest: ERR Creating the request failed
QueryDataAvailable: ERR Failed to get the amount of data, in bytes, available to be read
ReceiveResponse: ERR Waiting for server's response failed [12032]
SetOption: ERR Disabling auto redirect option failed
SetOption: ERR Setting IE proxy data to the request failed
SetOption: ERR Setting manual proxy password fialed
SetOption: ERR Setting manual proxy settings failed
SetOption: ERR Setting manual proxy username failed
SetOption: ERR Setting user's proxy data failed
WriteData: ERR Writing data to the request failed
)");
}
