#include "KelvraStrings.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <climits>
#include <stdexcept>

using KelvraStrings::Strings;

TEST(StringsFormat, WideFollowsMicrosoftRules)
{
    // %s takes a wide string and %hs a narrow one, whatever the compiler's printf mode.
    EXPECT_EQ(Strings::Format(L"%s\\%s", L"c:\\keltrace", L"debug"), L"c:\\keltrace\\debug");
    EXPECT_EQ(Strings::Format(L"%s.%d.%s.log", L"host", 4120, L"net"), L"host.4120.net.log");
    EXPECT_EQ(Strings::Format(L"[%hs]", "narrow"), L"[narrow]");
    EXPECT_EQ(Strings::Format(L"%c%C", L'w', 'n'), L"wn");
    EXPECT_EQ(Strings::Format(L"%s", L"\u00e9\u4e2d"), L"\u00e9\u4e2d");
}

TEST(StringsFormat, NarrowFollowsMicrosoftRules)
{
    EXPECT_EQ(Strings::Format("%s-%d", "abc", -7), "abc--7");
    EXPECT_EQ(Strings::Format("[%ls]", L"wide"), "[wide]");
    EXPECT_EQ(Strings::Format("%08.3f", 3.14159), "0003.142");
}

TEST(StringsFormat, EmptyOutputAndAFormattedNulEndTheResult)
{
    EXPECT_EQ(Strings::Format(L""), L"");
    EXPECT_EQ(Strings::Format(L"%s", L""), L"");
    EXPECT_EQ(Strings::Format(static_cast<const wchar_t*>(nullptr)), L"");
    EXPECT_EQ(Strings::Format(L"ab%cde", L'\0'), L"ab");
    EXPECT_EQ(Strings::Format("%s", ""), "");
    EXPECT_EQ(Strings::Format(static_cast<const char*>(nullptr)), "");
    EXPECT_EQ(Strings::Format("ab%cde", '\0'), "ab");
}

TEST(StringsFormat, ProducesMegabytesExactly)
{
    const std::wstring wide(3 * 1024 * 1024, L'x');
    const std::wstring wideResult = Strings::Format(L"<%s>", wide.c_str());
    ASSERT_EQ(wideResult.size(), wide.size() + 2);
    EXPECT_EQ(wideResult.front(), L'<');
    EXPECT_EQ(wideResult.back(), L'>');
    EXPECT_EQ(wideResult.compare(1, wide.size(), wide), 0);

    const std::string narrow(5 * 1024 * 1024, 'y');
    const std::string narrowResult = Strings::Format("%s%s", narrow.c_str(), "!");
    ASSERT_EQ(narrowResult.size(), narrow.size() + 1);
    EXPECT_EQ(narrowResult.back(), '!');
}

TEST(StringsToString, WritesDecimalIntegers)
{
    EXPECT_EQ(Strings::ToString(0), L"0");
    EXPECT_EQ(Strings::ToString(-42), L"-42");
    EXPECT_EQ(Strings::ToString(1234567), L"1234567");
    EXPECT_EQ(Strings::ToString(INT_MAX), L"2147483647");
    EXPECT_EQ(Strings::ToString(INT_MIN), L"-2147483648");
}

TEST(StringsToString, WidensEachByteUpToTheFirstNul)
{
    EXPECT_EQ(Strings::ToString(std::string("abc")), L"abc");
    EXPECT_EQ(Strings::ToString(std::string("caf\xe9")), L"caf\u00e9");
    EXPECT_EQ(Strings::ToString(std::string("\xc3\xa9")), L"\u00c3\u00a9"); // UTF-8 is not decoded
    EXPECT_EQ(Strings::ToString(std::string("ab\0cd", 5)), L"ab");
    EXPECT_EQ(Strings::ToString(std::string()), L"");
}

TEST(StringsToLower, LowersAsciiLettersInPlaceOnly)
{
    std::wstring text = L"MiXeD \u00c4\u00c9 Z@[`";
    const std::wstring result = Strings::ToLower(text);
    EXPECT_EQ(result, L"mixed \u00c4\u00c9 z@[`");
    EXPECT_EQ(text, result);
}

TEST(StringsPadd, PutsZerosInFrontOfTheWholeText)
{
    struct Case
    {
        int value, width;
        const wchar_t* expected;
    };
    const Case cases[] = {
        {7, 2, L"07"}, {0, 2, L"00"},  {123, 2, L"123"}, {-5, 3, L"0-5"},
        {5, -1, L"5"}, {5, 0, L"5"},   {42, 6, L"000042"}, {-1, 2, L"-1"},
    };
    for (const Case& c : cases)
        EXPECT_EQ(Strings::Padd(c.value, c.width), c.expected) << c.value << " width " << c.width;
}

TEST(StringsTrimLeft, RemovesLeadingAsciiWhiteSpaceOnly)
{
    struct Case
    {
        const wchar_t* text;
        const wchar_t* expected;
    };
    const Case cases[] = {
        {L" \t\r\n\v\fword ", L"word "},
        {L"   ", L""},
        {L"", L""},
        {L"\u00a0word", L"\u00a0word"},
        {L"\u3000word", L"\u3000word"},
        {L"x y", L"x y"},
    };
    for (const Case& c : cases)
    {
        std::wstring text = c.text;
        std::wstring& result = Strings::TrimLeft(text);
        EXPECT_EQ(&result, &text);
        EXPECT_EQ(text, c.expected);
    }
}

TEST(StringsHexToInt, ReadsUpToEightDigitsFromTheRight)
{
    struct Case
    {
        const wchar_t* text;
        int result;
        unsigned long output; // 0xDEAD means "left untouched"
    };
    const Case cases[] = {
        {L"", 1, 0xDEAD},
        {L"123456789", 2, 0xDEAD},
        {L"ff", 1, 255},
        {L"FFFFFFFF", 1, 4294967295ul},
        {L"00000000", 1, 0},
        {L"aBcD", 1, 0xABCD},
        {L"1g", 4, 0},
        {L"G1", 4, 1},
        {L"0x1F", 4, 31},
        {L"-1", 4, 1},
        {L" 1", 4, 1},
        {L"\uff11", 4, 0}, // a full-width digit is not a hexadecimal digit
    };
    for (const Case& c : cases)
    {
        unsigned long output = 0xDEAD;
        EXPECT_EQ(Strings::HexToInt(c.text, &output), c.result) << static_cast<const void*>(c.text);
        EXPECT_EQ(output, c.output);
    }
}

TEST(StringsHexToInt, NullArgumentsAreHarmless)
{
    unsigned long output = 0xDEAD;
    EXPECT_EQ(Strings::HexToInt(nullptr, &output), 1);
    EXPECT_EQ(output, 0xDEADul);
    EXPECT_EQ(Strings::HexToInt(L"ff", nullptr), 1);
}

TEST(StringsHexToInt, NeverReadsBeyondTheNinthCharacter)
{
    // Nine digits and no terminator, right before a page that may not be touched.
    SYSTEM_INFO info;
    ::GetSystemInfo(&info);
    const size_t page = info.dwPageSize;
    char* pages = static_cast<char*>(::VirtualAlloc(nullptr, 2 * page, MEM_COMMIT | MEM_RESERVE, PAGE_READWRITE));
    ASSERT_NE(pages, nullptr);
    DWORD old;
    ASSERT_TRUE(::VirtualProtect(pages + page, page, PAGE_NOACCESS, &old));
    wchar_t* text = reinterpret_cast<wchar_t*>(pages + page) - 9;
    for (int i = 0; i < 9; ++i)
        text[i] = L'f';
    unsigned long output = 0xDEAD;
    EXPECT_EQ(Strings::HexToInt(text, &output), 2);
    EXPECT_EQ(output, 0xDEADul);
    ::VirtualFree(pages, 0, MEM_RELEASE);
}

TEST(StringsSplit, SplitsAtEveryOccurrence)
{
    struct Case
    {
        std::string text;
        const char* delimiter;
        std::vector<std::string> expected;
    };
    const Case cases[] = {
        {"a,b,c", ",", {"a", "b", "c"}},
        {"a,,b", ",", {"a", "", "b"}},
        {",a", ",", {"", "a"}},
        {"a,", ",", {"a"}},
        {"a;b;", ";", {"a", "b"}},
        {";", ";", {""}},
        {"", ";", {}},
        {"abc", ",", {"abc"}},
        // A longer delimiter: the next token starts one character after the match's start.
        {"a::b", "::", {"a", ":b"}},
        {"x<>y<>", "<>", {"x", ">y", ">"}},
        {std::string("a\0b,c", 5), ",", {std::string("a\0b", 3), "c"}},
    };
    for (const Case& c : cases)
        EXPECT_EQ(Strings::Split(c.text, c.delimiter), c.expected) << c.text;
}

TEST(StringsSplit, EmptyDelimiterThrowsOutOfRange)
{
    EXPECT_THROW(Strings::Split("abc", ""), std::out_of_range);
    EXPECT_THROW(Strings::Split("", ""), std::out_of_range);
    EXPECT_THROW(Strings::Split("abc", nullptr), std::out_of_range);
}

TEST(StringsToInt, ReadsLikeAtoi)
{
    struct Case
    {
        std::string text;
        int expected;
    };
    const Case cases[] = {
        {"42abc", 42},
        {"abc", 0},
        {"", 0},
        {"  \t-17", -17},
        {"+5", 5},
        {"0x1F", 0},
        {"2147483647", INT_MAX},
        {"-2147483648", INT_MIN},
        {"99999999999", INT_MAX},
        {"-99999999999", INT_MIN},
        {std::string("12\0" "34", 5), 12},
    };
    for (const Case& c : cases)
        EXPECT_EQ(Strings::ToInt(c.text), c.expected) << c.text;
}
