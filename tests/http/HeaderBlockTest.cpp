// The HTTP client's header patterns over raw header blocks as WinHTTP reports them, fetched from
// the local test server.
#include "http/HeaderPatterns.h"
#include "http/LocalServer.h"
#include "http/PatternExtraction.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using Entries = std::vector<std::wstring>;
using KelvraTest::FetchHeaderBlock;
using KelvraTest::RespondPath;
using namespace KelvraHeaderPatterns;

namespace
{

Entries Extract(const wchar_t* pattern, const std::wstring& block)
{
    Entries results;
    EXPECT_TRUE(ExtractPatternGroups(pattern, block, results)) << "pattern " << pattern;
    return results;
}

} // namespace

TEST(HeaderBlocks, FieldsOfATypicalResponse)
{
    const std::wstring block = FetchHeaderBlock(RespondPath(
        {
            L"Content-Type: text/html; charset=UTF-8",
            L"Set-Cookie: sid=31d4d96e407aad42; Path=/; Secure; HttpOnly",
            L"set-cookie: lang=en-US; Path=/",
            L"SET-COOKIE: SID=31D4D96E407AAD42; PATH=/; SECURE; HTTPONLY",
            L"Set-Cookie:\ttheme=dark",
            L"Location: 1234",
        },
        L"<html>twelve</html>"));
    ASSERT_FALSE(block.empty());
    EXPECT_EQ(Extract(kCharset, block), Entries{L"UTF-8"});
    EXPECT_EQ(Extract(kContentLength, block), Entries{L"19"});
    EXPECT_EQ(Extract(kLocation, block), Entries{L"1234"});
    EXPECT_EQ(Extract(kLocationValue, block), Entries{L"1234"});
    // The upper-case repeat of the first cookie is left out; blanks and tabs after the colon go.
    EXPECT_EQ(Extract(kCookies, block), (Entries{L"sid=31d4d96e407aad42; Path=/; Secure; HttpOnly",
                                                 L"lang=en-US; Path=/", L"theme=dark"}));
}

TEST(HeaderBlocks, LastCookieLineWithoutLineEndGivesNoEntry)
{
    std::wstring block = FetchHeaderBlock(RespondPath({L"Set-Cookie: a=1", L"Set-Cookie: z=9"}));
    ASSERT_GE(block.size(), 4u);
    EXPECT_EQ(Extract(kCookies, block), (Entries{L"a=1", L"z=9"}));
    ASSERT_EQ(block.substr(block.size() - 4), L"\r\n\r\n");
    block.resize(block.size() - 4);
    EXPECT_EQ(Extract(kCookies, block), Entries{L"a=1"});
}

TEST(HeaderBlocks, ResponseWithoutCharsetOrNumericLocation)
{
    const std::wstring block =
        FetchHeaderBlock(RespondPath({L"Content-Type: text/plain", L"Location: http://127.0.0.1/next"}));
    ASSERT_FALSE(block.empty());
    EXPECT_EQ(Extract(kCharset, block), Entries{});
    EXPECT_EQ(Extract(kLocation, block), Entries{});
    EXPECT_EQ(Extract(kLocationValue, block), Entries{L"http://127.0.0.1/next"});
    EXPECT_EQ(Extract(kCookies, block), Entries{});
}

TEST(HeaderBlocks, LowerCaseContentLengthOfZero)
{
    const std::wstring block = FetchHeaderBlock(RespondPath({L"content-length: 0"}));
    ASSERT_NE(block.find(L"\r\ncontent-length: 0\r\n"), std::wstring::npos)
        << "the header's case was changed";
    EXPECT_EQ(Extract(kContentLength, block), Entries{L"0"});
}

TEST(HeaderBlocks, ManyCookieLines)
{
    std::vector<std::wstring> lines;
    Entries expected;
    for (int i = 0; i < 200; ++i)
    {
        const std::wstring value = L"c" + std::to_wstring(i) + L"=" + std::to_wstring(i * 7919) + L"; Path=/";
        lines.push_back((i % 2 == 0 ? L"Set-Cookie: " : L"set-cookie: ") + value);
        expected.push_back(value);
    }
    const std::wstring block = FetchHeaderBlock(RespondPath(lines));
    ASSERT_FALSE(block.empty());
    EXPECT_EQ(Extract(kCookies, block), expected);
}
