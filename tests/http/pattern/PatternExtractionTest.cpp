// ExtractPatternGroups, and the client's header patterns on a block
// shaped as WinHTTP reports it: a status line, lines ended by CR LF in the server's case, a blank line.
#include "http/HeaderPatterns.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/RegexException.h"

#include <gmock/gmock.h>

#include <tuple>
#include <utility>

using namespace KelvraHeaderPatterns;

TEST(ExtractPatternGroups, RefusesBadInputAndThrowsForAPatternWithoutGroup)
{
    std::vector<std::wstring> results;
    for (const auto& input : {std::pair(L"", L"text"), std::pair(L"{x}", L""), std::pair(L"{abc", L"abc")})
    {
        results = {L"left over"};
        EXPECT_FALSE(ExtractPatternGroups(input.first, input.second, results));
        EXPECT_EQ(results, std::vector<std::wstring>{}) << testing::PrintToString(input.first);
    }
    // Without a group: no failure while nothing matches, an exception at the first match.
    EXPECT_TRUE(ExtractPatternGroups(L"abc", L"xyz", results));
    EXPECT_THAT([&] { ExtractPatternGroups(L"abc", L"xabc", results); },
                testing::Throws<CRegexException>(
                    testing::Property(&CRegexException::Code, CRegexException::kFailure)));
}

TEST(ExtractPatternGroups, CollectsGroupZeroOfEveryMatchOnce)
{
    const std::wstring block = L"HTTP/1.1 302 Found\r\nContent-Type: text/html; Charset=iso-8859-1\r\n"
                               L"content-length: 0\r\nLocation: 42abc\r\nSet-Cookie: sid=1; Path=/\r\n"
                               L"SET-COOKIE: SID=1; PATH=/\r\nSet-Cookie:\t theme=dark\r\n\r\n";
    const std::vector<std::tuple<std::wstring, std::wstring, std::vector<std::wstring>>> rows = {
        {L"{[0-9]+}", L"a1b22c1d333", {L"1", L"22", L"333"}},
        {L"{a}{b}", L"abab", {L"a"}},
        // Equal ignoring case: the first spelling stays.
        {L"{x[a-z]}", L"xA xb XA Xb xc", {L"xA", L"xb", L"xc"}},
        // A group that took no part in a match adds nothing.
        {L"{a}?b", L"b ab", {L"a"}},
        // Each search starts where the last match ended, and "^" anchors there.
        {L"^{.}", L"abc", {L"a", L"b", L"c"}},
        // An empty match moves the search one character on: "!a" matches nothing at 1 and at 2.
        {L"{a*}", L"bab", {L"", L"a"}},
        {L"{!a}", L"abb", {L""}},
        {kCharset, block, {L"iso-8859-1"}},
        {kContentLength, block, {L"0"}},
        {kLocationValue, block, {L"42abc"}},
        // The upper-case repeat of a cookie is left out; blanks and tabs after the colon go.
        {kCookies, block, {L"sid=1; Path=/", L"theme=dark"}},
        // A blank before the digits is required; a Content-Location is no location.
        {kContentLength, L"Content-Length:12\r\n", {}},
        {kLocationValue, L"\r\nContent-Location: /other\r\n", {}},
        // A cookie line ends at its first CR; a last line without line end gives nothing.
        {kCookies, L"Set-Cookie: x=1\r\r\nSet-Cookie: last=1", {L"x=1"}},
        // The text ends at its first NUL.
        {kCookies, std::wstring(L"Set-Cookie: a=1\r\n\0Set-Cookie: b=2\r\n", 35), {L"a=1"}},
    };
    for (const auto& [pattern, text, entries] : rows)
    {
        std::vector<std::wstring> results{L"left over"};
        EXPECT_TRUE(ExtractPatternGroups(pattern, text, results));
        EXPECT_EQ(results, entries) << testing::PrintToString(pattern) << " on "
                                    << testing::PrintToString(text);
    }
}
