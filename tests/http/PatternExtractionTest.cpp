// ExtractPatternGroups and TrimChars on texts written out here; HeaderBlockTest.cpp runs the same
// patterns over header blocks from a real server.
#include "http/HeaderPatterns.h"
#include "http/PatternExtraction.h"
#include "http/ReferenceMatcher.h"
#include "http/RegexException.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using Entries = std::vector<std::wstring>;
using namespace KelvraHeaderPatterns;

namespace
{

Entries Extract(const std::wstring& pattern, const std::wstring& text)
{
    Entries results{L"left over"};
    EXPECT_TRUE(ExtractPatternGroups(pattern, text, results));
    EXPECT_TRUE(KelvraTest::ExtractionAgreesWithReference(pattern, text));
    return results;
}

} // namespace

TEST(ExtractPatternGroups, RefusesEmptyOrBrokenInput)
{
    Entries results{L"left over"};
    EXPECT_FALSE(ExtractPatternGroups(L"", L"text", results));
    EXPECT_TRUE(results.empty());
    results.assign(1, L"left over");
    EXPECT_FALSE(ExtractPatternGroups(L"{x}", L"", results));
    EXPECT_TRUE(results.empty());
    results.assign(1, L"left over");
    EXPECT_FALSE(ExtractPatternGroups(L"{abc", L"abc", results));
    EXPECT_TRUE(results.empty());
}

TEST(ExtractPatternGroups, CollectsGroupZeroOfEveryMatchOnce)
{
    EXPECT_EQ(Extract(L"{[0-9]+}", L"a1b22c1d333"), (Entries{L"1", L"22", L"333"}));
    // Only group 0 is collected.
    EXPECT_EQ(Extract(L"{a}{b}", L"abab"), (Entries{L"a"}));
    // Equal ignoring case: the first spelling stays.
    EXPECT_EQ(Extract(L"{x[a-z]}", L"xA xb XA Xb xc"), (Entries{L"xA", L"xb", L"xc"}));
    EXPECT_EQ(Extract(L"{q}", L"no match here"), Entries{});
    // A group that took no part in a match adds nothing.
    EXPECT_EQ(Extract(L"{a}?b", L"b ab"), (Entries{L"a"}));
}

TEST(ExtractPatternGroups, CaretAnchorsAtEachSearchPosition)
{
    // Each search starts where the last match ended, and "^" anchors there.
    EXPECT_EQ(Extract(L"^{.}", L"abc"), (Entries{L"a", L"b", L"c"}));
    EXPECT_EQ(Extract(L"^{a}", L"aab"), (Entries{L"a"}));
    EXPECT_EQ(Extract(L"{.}$", L"abc"), (Entries{L"c"}));
}

TEST(ExtractPatternGroups, PatternWithoutGroupThrowsAtItsFirstMatch)
{
    Entries results;
    EXPECT_TRUE(ExtractPatternGroups(L"abc", L"xyz", results));
    try
    {
        ExtractPatternGroups(L"abc", L"xabc", results);
        ADD_FAILURE() << "no exception";
    }
    catch (const CRegexException& exception)
    {
        EXPECT_EQ(static_cast<std::uint32_t>(exception.Code()), 0x80004005u);
    }
}

TEST(ExtractPatternGroups, HeaderPatternsOnWrittenBlocks)
{
    const std::wstring block = L"HTTP/1.1 200 OK\r\n"
                               L"content-type: text/html; Charset=iso-8859-1\r\n"
                               L"content-length: 0\r\n"
                               L"Set-Cookie: a=1; Path=/\r\n"
                               L"Set-Cookie:\t b=2\r\n"
                               L"set-cookie: A=1; path=/\r\n"
                               L"Location: 42abc\r\n"
                               L"Set-Cookie: last=1";
    EXPECT_EQ(Extract(kCharset, block), Entries{L"iso-8859-1"});
    EXPECT_EQ(Extract(kContentLength, block), Entries{L"0"});
    EXPECT_EQ(Extract(kLocation, block), Entries{L"42"});
    EXPECT_EQ(Extract(kLocationValue, block), Entries{L"42abc"});
    // The last line has no line end and gives no entry.
    EXPECT_EQ(Extract(kCookies, block), (Entries{L"a=1; Path=/", L"b=2"}));
    EXPECT_EQ(Extract(kCharset, L"Content-Type: text/plain\r\n\r\n"), Entries{});
    // A blank before the digits is required, and a value of letters is no location.
    EXPECT_EQ(Extract(kContentLength, L"Content-Length:12\r\n"), Entries{});
    EXPECT_EQ(Extract(kLocation, L"Location: /next\r\n"), Entries{});
    // A cookie line ends at its first CR.
    EXPECT_EQ(Extract(kCookies, L"Set-Cookie: x=1\r\r\n"), Entries{L"x=1"});
}

TEST(ExtractPatternGroups, HtmlTagsInAnyCase)
{
    const std::wstring body = L"<!DOCTYPE html><HTML><body>hi</body></Html>";
    EXPECT_EQ(Extract(kHtmlStart, body), Entries{L"<HTML>"});
    EXPECT_EQ(Extract(kHtmlEnd, body), Entries{L"</Html>"});
    EXPECT_EQ(Extract(kHtmlEnd, L"<html><body>cut"), Entries{});
}

TEST(ExtractPatternGroups, TwentyThousandCookieLines)
{
    std::wstring block = L"HTTP/1.1 200 OK\r\n";
    Entries expected;
    for (int i = 0; i < 20000; ++i)
    {
        const std::wstring value = L"id" + std::to_wstring(i) + L"=v; Path=/";
        block += L"Set-Cookie: " + value + L"\r\n";
        // Every line again in upper case: a repeat, ignoring case.
        block += L"SET-COOKIE: ID" + std::to_wstring(i) + L"=V; PATH=/\r\n";
        expected.push_back(value);
    }
    Entries results;
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
        {L"  a b  ", L" ", L"a b"},
        {L"xxaxx", L"x", L"a"},
        {L" \t a;\t ", L" \t", L"a;"},
        {L"; a=1; ", L"; ", L"a=1"},
        {L"abc", L"", L"abc"},
        {L"abc", L"xyz", L"abc"},
        {L"    ", L" ", L""},
        {L"", L" ", L""},
        {L"", L"", L""},
        {L"a", L" ", L"a"},
        {L" a", L" ", L"a"},
    };
    for (const Row& row : rows)
    {
        SCOPED_TRACE(KelvraTest::Printable(row.text) + " without " + KelvraTest::Printable(row.set));
        EXPECT_EQ(TrimChars(row.text, row.set), row.trimmed);
    }
}
