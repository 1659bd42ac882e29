// CWinHttpClient against the local HTTP and HTTPS servers (tests/support/http_server.py), with the
// trace it writes read back from the real log file.
#include "HttpTestSupport.h"

#include "KelvraHttp.h"
#include "KelvraTrace.h"

#include "support/RecordingWinHttp.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <filesystem>

using KelvraHttpTest::NewTraceLines;
using KelvraHttpTest::ServerUrl;

namespace
{

testing::Environment* const traceSession =
    testing::AddGlobalTestEnvironment(new KelvraHttpTest::TraceSession(L"http_tests"));

std::vector<double> progressReports;

bool RecordProgress(double percent)
{
    progressReports.push_back(percent);
    return false;
}

} // namespace

// One fresh client per row, with the extra header "X-One: 1" and the cookies "a=1; b=2"; a POST
// carries the body "k=v". The row's setup runs first, then its before path is fetched the row's
// way, then its path. A path starting with "/" is on the HTTP server, "https:" on the HTTPS one.
// The summary: "<result> <last error> (<error of the last failed send, as traced>) <status>
// [<charset>] <received>/<announced> <location> {<cookies>} <content>".
TEST(HttpExchanges, ResultsAsTheClientShowsThem)
{
    struct Row
    {
        const char* name;
        void (*setup)(CWinHttpClient&);
        std::wstring before, path;
        const wchar_t* method;
        bool redirectOff;
        std::wstring expected;
    };
    const std::wstring echoed = L"X-One: 1\nCookie: a=1; b=2\nUser-Agent: WinHttpClient\n";
    const std::wstring type = L"/respond?header=Content-Type:%20text/plain;%20charset=";
    const std::wstring moved = L"/respond?status=302&header=Location:%20/respond%3Fbody%3Dmoved";
    const Row rows[] = {
        {"GetEcho", nullptr, L"", L"/echo", L"GET", false,
         L"true 0 () 200 [] 57/57 <> {} GET\n" + echoed + L"\n"},
        {"PostEcho", nullptr, L"", L"/echo", L"POST", false,
         L"true 0 () 200 [] 79/79 <> {} POST\n" + echoed + L"Content-Length: 3\n\nk=v"},
        {"MixedCaseGet", nullptr, L"", L"/echo", L"Get", false,
         L"true 0 () 200 [] 57/57 <> {} GET\n" + echoed + L"\n"},
        {"NotFoundIsAResponse", nullptr, L"", L"/respond?status=404&body=missing", L"GET", false,
         L"true 0 () 404 [] 7/7 <> {} missing"},
        {"ChunkedKeepsEarlierLength", nullptr, L"/respond?body=12345", L"/respond?chunked=1&body=abcdefg",
         L"GET", false, L"true 0 () 200 [] 7/5 <> {} abcdefg"},
        {"ZeroByteEndsText", nullptr, L"", L"/respond?body=ab%00cd", L"GET", false,
         L"true 0 () 200 [] 5/5 <> {} ab"},
        {"EmptyBody", nullptr, L"", L"/respond", L"GET", false, L"true 0 () 200 [] 0/0 <> {} "},
        {"ShortOfAnnouncedLength", nullptr, L"", L"/respond?header=Content-Length:%201000&body=short", L"GET",
         false, L"true 0 () 200 [] 5/1000 <> {} short"},
        {"Utf8", nullptr, L"", type + L"UTF-8&body=%C3%A9t%C3%A9", L"GET", false,
         L"true 0 () 200 [UTF-8] 5/5 <> {} \u00e9t\u00e9"},
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
        {"WholeHtmlGetSentOnce", nullptr, L"/respond?key=whole&body=%3Chtml%3Eok%3C/HTML%3E",
         L"/count?key=whole", L"GET", false, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"CutHtmlPostSentOnce", nullptr, L"/respond?key=post&body=%3Chtml%3Ecut", L"/count?key=post", L"POST",
         false, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"CutHtmlWithoutRedirectsSentOnce", nullptr, L"/respond?key=direct&body=%3Chtml%3Ecut",
         L"/count?key=direct", L"GET", true, L"true 0 () 200 [] 1/1 <> {} 1"},
        {"RedirectFollowed", nullptr, L"", moved, L"GET", false, L"true 0 () 200 [] 5/5 <> {} moved"},
        {"RedirectReturned", nullptr, L"", moved, L"GET", true,
         L"true 0 () 302 [] 0/0 </respond?body=moved> {} "},
        {"ContentLocationIsNoLocation", nullptr, L"",
         L"/respond?status=201&header=Content-Location:%20/other&header=Location:%20/made", L"GET", true,
         L"true 0 () 201 [] 0/0 </made> {} "},
        {"RefusedPort", nullptr, L"", L"http://127.0.0.1:1/", L"GET", false,
         L"false 0 (12029)  [] 0/0 <> {} "},
        {"PathTooLongForItsBuffer", nullptr, L"", L"/" + std::wstring(1500, L'p'), L"GET", false,
         L"false 122 ()  [] 0/0 <> {} "},
        {"SelfSignedAccepted", nullptr, L"", L"https:/respond?body=secure", L"GET", false,
         L"true 0 () 200 [] 6/6 <> {} secure"},
        {"SelfSignedRefusedWhenRequired",
         [](CWinHttpClient& client) { client.SetRequireValidSslCertificates(true); }, L"",
         L"https:/respond?body=secure", L"GET", false, L"false 0 (12157)  [] 0/0 <> {} "},
    };
    for (const Row& row : rows)
    {
        SCOPED_TRACE(row.name);
        CWinHttpClient client(L"");
        client.SetAdditionalRequestHeaders(L"X-One: 1");
        client.SetAdditionalRequestCookies(L"a=1; b=2");
        if (row.setup != nullptr)
            row.setup(client);
        bool result = false;
        for (const std::wstring* path : {&row.before, &row.path})
        {
            if (path->empty())
                continue;
            const bool secure = path->rfind(L"https:", 0) == 0;
            client.UpdateUrl((*path)[0] == L'/' || secure ? ServerUrl(path->substr(secure ? 6 : 0), secure)
                                                          : *path);
            if (std::wstring(row.method) == L"POST")
                client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>("k=v"), 3);
            NewTraceLines();
            result = client.SendHttpRequest(row.method, row.redirectOff);
        }
        std::wstring failedSend;
        for (const std::wstring& line : NewTraceLines())
            if (line.rfind(L"TRC Send failed with error [", 0) == 0)
                failedSend = line.substr(28, line.size() - 29);
        EXPECT_EQ(KelvraStrings::Strings::Format(
                      L"%s %u (%s) %s [%s] %u/%u <%s> {%s} %s", result ? L"true" : L"false",
                      client.GetLastError(), failedSend.c_str(), client.GetResponseStatusCode().c_str(),
                      client.GetResponseCharset().c_str(), client.GetRawResponseReceivedContentLength(),
                      client.GetRawResponseContentLength(), client.GetResponseLocation().c_str(),
                      client.GetResponseCookies().c_str(), client.GetResponseContent().c_str()),
                  row.expected);
        EXPECT_TRUE(!result ||
                    client.GetRawResponseContent()[client.GetRawResponseReceivedContentLength()] == 0);
    }
}

// 64 MiB arrive whole and are saved byte for byte; progress goes from 0 to 100 with a
// Content-Length and is never reported without one. Nothing is saved without a body, and a write
// that fails is no success.
TEST(HttpExchanges, LargeBodySavedWithProgress)
{
    const std::wstring file = KelvraTest::DataPath(L"large_body.bin");
    CWinHttpClient client(ServerUrl(L"/respond"), &RecordProgress);
    EXPECT_FALSE(client.SaveResponseToFile(file));
    ASSERT_TRUE(client.SendHttpRequest(L"GET", false));
    EXPECT_FALSE(client.SaveResponseToFile(file));
    EXPECT_FALSE(std::filesystem::exists(file));

    client.UpdateUrl(ServerUrl(L"/big?size=67108864"));
    ASSERT_TRUE(client.SendHttpRequest(L"GET", false));
    EXPECT_FALSE(client.SaveResponseToFile(L"Z:\\dev\\full"));
    ASSERT_TRUE(client.SaveResponseToFile(file));
    std::string expected(64u << 20, '\0');
    for (size_t i = 0; i < expected.size(); ++i)
        expected[i] = static_cast<char>(33 + (i % 65521) * 7919 % 94); // BLOCK in http_server.py
    EXPECT_TRUE(KelvraTest::ReadBinaryFile(file) == expected) << "the saved body differs";
    EXPECT_TRUE(std::filesystem::remove(file));
    ASSERT_GE(progressReports.size(), 2u);
    EXPECT_EQ(progressReports.front(), 0.0);
    EXPECT_EQ(progressReports.back(), 100.0);
    EXPECT_TRUE(std::is_sorted(progressReports.begin(), progressReports.end()));

    CWinHttpClient chunked(ServerUrl(L"/big?chunked=1&size=100000"), &RecordProgress);
    progressReports.clear();
    ASSERT_TRUE(chunked.SendHttpRequest(L"GET", false));
    EXPECT_EQ(chunked.GetResponseContent().size(), 100000u);
    EXPECT_TRUE(progressReports.empty());

    // A callback that throws, against its contract, fails the request; nothing leaves it.
    CWinHttpClient throwing(ServerUrl(L"/respond?body=x"), [](double) -> bool { throw 1; });
    EXPECT_FALSE(throwing.SendHttpRequest(L"GET", false));
    EXPECT_EQ(throwing.GetLastError(), 1359u);
}

// The lines of a new client's GET and POST, and of a connection refused, exactly, with no proxy
// settings; and of a GET through each kind of the user's proxy settings, as Wine and the recording
// binding (error 2, the look-up Wine refuses) answer.
TEST(HttpTrace, SequencesOfAClientsLife)
{
    using KelvraStrings::Strings;
    KelvraHttpTest::UserProxySettings settings;
    KelvraTest::RecordingWinHttp platform;
    int headerSize = 0;
    const auto life = [&](const std::wstring& url, const wchar_t* method, const char* body)
    {
        NewTraceLines();
        {
            CWinHttpClient client(url);
            client.SetAdditionalDataToSend(reinterpret_cast<const unsigned char*>(body), std::strlen(body));
            client.SendHttpRequest(method, false);
            // WinHTTP gives the size in bytes, the terminator included.
            headerSize = static_cast<int>(client.GetResponseHeader().size() * 2 + 2);
        }
        std::wstring text;
        for (const std::wstring& line : NewTraceLines())
            text += line + L"\n";
        return text;
    };
    const wchar_t* opening = LR"(INF Constructing the Http client [%s]
TRC Trying to send Http request using method [%s], disable auto redirect [false]
TRC Creating Http session
TRC Setting Http timeouts [0][60000][30000][30000]
TRC Extracting url
TRC Connecting to server with host [127.0.0.1], port [%s]
TRC Creating the request to [%s]
TRC Request was created
TRC Cracking proxy configuration
)";
    const std::wstring user = L"TRC Setting auto proxy settings\n";
    const wchar_t* answered = LR"(TRC [1] try
TRC Sending the Http request, total data to send [%d]
TRC Send succeeded
%sTRC Waiting for server's response
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
)";
    const std::wstring closing =
        L"TRC Closing request\nTRC Closing connection\nINF Destructing the Http client\n";
    const std::wstring url = ServerUrl(L"/respond?body=hello");
    const std::wstring port = url.substr(17, url.find(L'/', 17) - 17);
    const std::wstring get = life(url, L"GET", "");
    const std::wstring getOpening =
        Strings::Format(opening, url.c_str(), L"GET", port.c_str(), L"/respond?body=hello");
    const std::wstring getAnswered = Strings::Format(answered, 0, L"", headerSize) + closing;
    EXPECT_EQ(get, getOpening + user + getAnswered);
    const std::wstring post = life(url, L"post", "name=value");
    const wchar_t* writing =
        L"TRC Writing data to the request, total data to send [10]\nTRC Total data sent [10]\n";
    EXPECT_EQ(post, Strings::Format(opening, url.c_str(), L"post", port.c_str(), L"/respond?body=hello") +
                        user + Strings::Format(answered, 10, writing, headerSize) + closing);
    std::wstring refused = Strings::Format(opening, L"http://127.0.0.1:1/", L"GET", L"1", L"/") + user;
    for (int attempt = 1; attempt <= 5; ++attempt)
        refused += Strings::Format(L"TRC [%d] try\nTRC Sending the Http request, total data to send [0]\n"
                                   L"TRC Send failed with error [12029]\n",
                                   attempt);
    EXPECT_EQ(life(L"http://127.0.0.1:1/", L"GET", ""), refused + closing);

    // Through each kind of user's settings. Wine refuses the script's look-up (87); the binding
    // answers it once, with lists of its own.
    platform.Add({L"GetIEProxyConfigForCurrentUser", ERROR_FILE_NOT_FOUND});
    EXPECT_EQ(life(url, L"GET", ""),
              getOpening + user + L"TRC No Internet Explorer proxy settings can be found\n" + getAnswered);
    const std::wstring bypass = L"<local>;" + std::wstring(300, L'b') + L".example";
    settings.Set(L"127.0.0.1:8888", bypass, L"");
    const std::wstring released = L"TRC Releasing lpszProxy\nTRC Releasing lpszProxyBypass\n";
    EXPECT_EQ(life(url, L"GET", ""),
              getOpening + user +
                  L"TRC Could not find IE Auto Config Url but IE proxy url is set to [127.0.0.1:8888]\n"
                  L"TRC IE optional proxy by-pass server list is set to [" +
                  bypass +
                  L"]\n"
                  L"TRC Setting IE proxy data to the request\n" +
                  released + getAnswered);
    const std::wstring script =
        ServerUrl(L"/respond?body=function%20FindProxyForURL(u,h){return%22PROXY%20127.0.0.1:8888%22}");
    settings.Set(L"127.0.0.1:8888", L"<local>", script);
    const std::wstring lookUp =
        user + L"TRC IE Auto Config Url is set to [" + script + L"]\nTRC Retrieving user's proxy data\n";
    const std::wstring userReleased = L"TRC Releasing lpszAutoConfigUrl\n" + released;
    platform.lookedUpProxy = {L"127.0.0.1:8889", L"*.local"};
    EXPECT_EQ(life(url, L"GET", ""), getOpening + lookUp + L"TRC Setting user's proxy data\n" + released +
                                         userReleased + getAnswered);
    platform.lookedUpProxy.clear();
    EXPECT_EQ(life(url, L"GET", ""), getOpening + lookUp +
                                         L"ERR Failed to retrieve user's proxy data\n"
                                         L"ERR Last documented error [87]\n" +
                                         userReleased + closing);
    for (const std::wstring& call :
         {L"SetOption 38 3 127.0.0.1:8888 " + bypass, L"GetProxyForUrl " + url + L" 3 1 " + script + L" 1",
          std::wstring(L"SetOption 38 3 127.0.0.1:8889 *.local")})
        EXPECT_GE(std::count(platform.calls.begin(), platform.calls.end(), call), 1) << call;
    EXPECT_TRUE(platform.handedOut.empty());
    EXPECT_EQ(platform.strayFrees, 0);
}
