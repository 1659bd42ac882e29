// The HTTP client's header patterns over raw header blocks as WinHTTP reports them, fetched from
// the local HTTP server that ctest starts for this program (tests/support/http_server.py).
#include "common/UniqueHandle.h"
#include "http/HeaderPatterns.h"
#include "http/pattern/ReferenceMatcher.h"
#include "support/TestData.h"

#include <gtest/gtest.h>

#include <windows.h>
#include <winhttp.h>

#include <cstdlib>
#include <cwchar>
#include <string>
#include <vector>

using namespace KelvraHeaderPatterns;
using KelvraTest::ExpectExtractions;

namespace
{

// Every character percent-encoded (all of them are ASCII here).
std::wstring QueryValue(const std::wstring& value)
{
    std::wstring encoded;
    wchar_t escaped[4];
    for (wchar_t c : value)
        encoded.append(escaped, std::swprintf(escaped, 4, L"%%%02X", static_cast<unsigned>(c)));
    return encoded;
}

// The raw header block (status line and header lines, each ended by CR LF, then an empty line),
// as WinHTTP reports it, of a response from the local server with these header lines ("Name:
// value", in this order) and this body. Empty, with a test failure, when the request fails.
std::wstring FetchHeaderBlock(const std::vector<std::wstring>& headerLines, const std::wstring& body = L"")
{
    std::wstring path = L"/respond?body=" + QueryValue(body);
    for (const std::wstring& line : headerLines)
        path += L"&header=" + QueryValue(line);
    const long port = std::strtol(
        KelvraTest::ReadBinaryFile(KelvraTest::DataPath(L"http_server.port")).c_str(), nullptr, 10);
    Kelvra::UniqueWinHttp session(::WinHttpOpen(L"KelvraTests", WINHTTP_ACCESS_TYPE_NO_PROXY,
                                                WINHTTP_NO_PROXY_NAME, WINHTTP_NO_PROXY_BYPASS, 0));
    Kelvra::UniqueWinHttp connection(
        session && port > 0 && port <= 65535
            ? ::WinHttpConnect(session.get(), L"127.0.0.1", static_cast<INTERNET_PORT>(port), 0)
            : nullptr);
    Kelvra::UniqueWinHttp request(connection ? ::WinHttpOpenRequest(connection.get(), L"GET", path.c_str(),
                                                                    nullptr, WINHTTP_NO_REFERER,
                                                                    WINHTTP_DEFAULT_ACCEPT_TYPES, 0)
                                             : nullptr);
    // Room for any header block these tests ask for.
    std::wstring block(16384, L'\0');
    DWORD bytes = static_cast<DWORD>(block.size() * sizeof(wchar_t));
    if (!request ||
        !::WinHttpSendRequest(request.get(), WINHTTP_NO_ADDITIONAL_HEADERS, 0, WINHTTP_NO_REQUEST_DATA, 0, 0,
                              0) ||
        !::WinHttpReceiveResponse(request.get(), nullptr) ||
        !::WinHttpQueryHeaders(request.get(), WINHTTP_QUERY_RAW_HEADERS_CRLF, WINHTTP_HEADER_NAME_BY_INDEX,
                               &block[0], &bytes, WINHTTP_NO_HEADER_INDEX))
    {
        const DWORD error = ::GetLastError();
        ADD_FAILURE() << "no header block from the local HTTP server (port " << port << "), error " << error;
        return std::wstring();
    }
    block.resize(bytes / sizeof(wchar_t));
    return block;
}

} // namespace

TEST(HeaderBlocks, FieldsOfATypicalResponse)
{
    const std::wstring block = FetchHeaderBlock(
        {
            L"Content-Type: text/html; charset=UTF-8",
            L"Set-Cookie: sid=31d4d96e407aad42; Path=/; Secure; HttpOnly",
            L"set-cookie: lang=en-US; Path=/",
            L"SET-COOKIE: SID=31D4D96E407AAD42; PATH=/; SECURE; HTTPONLY",
            L"Set-Cookie:\ttheme=dark",
            L"Location: 1234",
        },
        L"<html>twelve</html>");
    ExpectExtractions({
        {kCharset, block, {L"UTF-8"}},
        {kContentLength, block, {L"19"}},
        {kLocation, block, {L"1234"}},
        {kLocationValue, block, {L"1234"}},
        // The upper-case repeat of the first cookie is left out; blanks and tabs after the colon go.
        {kCookies,
         block,
         {L"sid=31d4d96e407aad42; Path=/; Secure; HttpOnly", L"lang=en-US; Path=/", L"theme=dark"}},
    });
}

TEST(HeaderBlocks, LastCookieLineWithoutLineEndGivesNoEntry)
{
    const std::wstring block = FetchHeaderBlock({L"Set-Cookie: a=1", L"Set-Cookie: z=9"});
    ASSERT_GE(block.size(), 4u);
    ASSERT_EQ(block.substr(block.size() - 4), L"\r\n\r\n");
    const std::wstring cut = block.substr(0, block.size() - 4);
    ExpectExtractions({{kCookies, block, {L"a=1", L"z=9"}}, {kCookies, cut, {L"a=1"}}});
}

TEST(HeaderBlocks, MissingFieldsAndLowerCaseNames)
{
    const std::wstring block = FetchHeaderBlock(
        {L"Content-Type: text/plain", L"Location: http://127.0.0.1/next", L"content-length: 0"});
    ASSERT_NE(block.find(L"\r\ncontent-length: 0\r\n"), std::wstring::npos)
        << "the header's case was changed";
    ExpectExtractions({
        {kCharset, block, {}},
        {kLocation, block, {}},
        {kLocationValue, block, {L"http://127.0.0.1/next"}},
        {kCookies, block, {}},
        {kContentLength, block, {L"0"}},
    });
}
