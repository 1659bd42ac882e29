// ExtractPatternGroups and TrimChars on texts written out here; HeaderBlockTest.cpp runs the
// header patterns over header blocks from a real server.
#include "http/HeaderPatterns.h"
#include "http/pattern/PatternExtraction.h"
#include "http/pattern/ReferenceMatcher.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

using namespace KelvraHeaderPatterns;
using namespace KelvraTest;

TEST(ExtractPatternGroups, RefusesEmptyOrBrokenInput)
{
    const std::pair<const wchar_t*, const wchar_t*> inputs[] = {
        {L"", L"text"}, {L"{x}", L""}, {L"{abc", L"abc"}};
    for (const auto& input : inputs)
    {
        std::vector<std::wstring> results{L"left over"};
        EXPECT_FALSE(ExtractPatternGroups(input.first, input.second, results))
            << testing::PrintToString(input.first);
        EXPECT_TRUE(results.empty());
    }
}

TEST(ExtractPatternGroups, CollectsGroupZeroOfEveryMatchOnce)
{
    ExpectExtractions({
        {L"{[0-9]+}", L"a1b22c1d333", {L"1", L"22", L"333"}},
        {L"{a}{b}", L"abab", {L"a"}},
        // Equal ignoring case: the first spelling stays.
        {L"{x[a-z]}", L"xA xb XA Xb xc", {L"xA", L"xb", L"xc"}},
        {L"{q}", L"no match here", {}},
        // A group that took no part in a match adds nothing.
        {L"{a}?b", L"b ab", {L"a"}},
        // Each search starts where the last match ended, and "^" anchors there.
        {L"^{.}", L"abc", {L"a", L"b", L"c"}},
        {L"^{a}", L"aab", {L"a"}},
        {L"{.}$", L"abc", {L"c"}},
    });
}

TEST(ExtractPatternGroups, PatternWithoutGroupThrowsAtItsFirstMatch)
{
    std::vector<std::wstring> results;
    EXPECT_TRUE(ExtractPatternGroups(L"abc", L"xyz", results));
    EXPECT_EQ(ThrownCode([&] { ExtractPatternGroups(L"abc", L"xabc", results); }), 0x80004005u);
}

TEST(ExtractPatternGroups, ClientPatternsOnWrittenHeadersAndBodies)
{
    const std::wstring body = L"<!DOCTYPE html><HTML><body>hi</body></Html>";
    ExpectExtractions({
        {kCharset, L"content-type: text/html; Charset=iso-8859-1\r\n", {L"iso-8859-1"}},
        // A blank before the digits is required, and a value of letters is no location.
        {kContentLength, L"Content-Length:12\r\n", {}},
        {kLocation, L"Location: /next\r\n", {}},
        {kLocation, L"Location: 42abc\r\n", {L"42"}},
        {kLocationValue, L"\r\nLocation: 42abc\r\n", {L"42abc"}},
        {kLocationValue, L"\r\nContent-Location: /other\r\n", {}},
        // A cookie line ends at its first CR; a last line without line end gives nothing.
        {kCookies, L"Set-Cookie:\t b=2\r\nSet-Cookie: x=1\r\r\nSet-Cookie: last=1", {L"b=2", L"x=1"}},
        {kHtmlStart, body, {L"<HTML>"}},
        {kHtmlEnd, body, {L"</Html>"}},
        {kHtmlEnd, L"<html><body>cut", {}},
    });
}

TEST(ExtractPatternGroups, TwentyThousandCookieLines)
{
    std::wstring block = L"HTTP/1.1 200 OK\r\n";
    std::vector<std::wstring> expected;
    for (int i = 0; i < 20000; ++i)
    {
        expected.push_back(L"id" + std::to_wstring(i) + L"=v; Path=/");
        // Every line again in upper case: a repeat, ignoring case.
        block += L"Set-Cookie: " + expected.back() + L"\r\nSET-COOKIE: ID" + std::to_wstring(i) +
                 L"=V; PATH=/\r\n";
    }
    std::vector<std::wstring> results;
    ASSERT_TRUE(ExtractPatternGroups(kCookies, block, results));
    EXPECT_EQ(results, expected);
}

TEST(TrimChars, StripsTheSetFromBothEnds)
{
    struct Row
    {
        const wchar_t* text;
        const wchar_t* set;
        const wchar_t* trimmed;
    };
    const Row rows[] = {
        {L"  a b  ", L" ", L"a b"}, {L" \t a;\t ", L" \t", L"a;"}, {L" a", L" ", L"a"},  {L"a ", L" ", L"a"},
        {L"abc", L"", L"abc"},      {L"abc", L"xyz", L"abc"},      {L"    ", L" ", L""}, {L"", L" ", L""},
    };
    for (const Row& row : rows)
        EXPECT_EQ(TrimChars(row.text, row.set), row.trimmed)
            << testing::PrintToString(row.text) << " without " << testing::PrintToString(row.set);
}
