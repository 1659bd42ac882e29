// The HTTP client's header patterns over raw header blocks as WinHTTP reports them, fetched by
// the client from the local HTTP server that ctest starts for this program.
#include "HttpTestSupport.h"

#include "KelvraHttp.h"

#include "http/HeaderPatterns.h"
#include "http/pattern/ReferenceMatcher.h"

#include <gtest/gtest.h>

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

// The raw header block (status line and header lines, each ended by CR LF, then an empty line)
// of a response from the local server with these header lines ("Name: value", in this order)
// and this body.
std::wstring FetchHeaderBlock(const std::vector<std::wstring>& headerLines, const std::wstring& body = L"")
{
    std::wstring path = L"/respond?body=" + QueryValue(body);
    for (const std::wstring& line : headerLines)
        path += L"&header=" + QueryValue(line);
    CWinHttpClient client(KelvraHttpTest::ServerUrl(path));
    EXPECT_TRUE(client.SendHttpRequest(L"GET", true)) << "no answer from the local HTTP server";
    return client.GetResponseHeader();
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
