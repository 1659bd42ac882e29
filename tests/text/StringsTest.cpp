#include "KelvraStrings.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <algorithm>
#include <climits>
#include <stdexcept>
#include <tuple>

using KelvraStrings::Strings;

TEST(StringsFormat, FollowsMicrosoftRulesAtAnyLengthUpToAFormattedNul)
{
    // %s takes a wide string in a wide format and %hs a narrow one, whatever the compiler's printf mode.
    EXPECT_EQ(Strings::Format(L"%s\\%s.%d.log", L"c:\\keltrace", L"net", 4120),
              L"c:\\keltrace\\net.4120.log");
    EXPECT_EQ(Strings::Format(L"[%hs] %c%C %s", "narrow", L'w', 'n', L"\u00e9\u4e2d"),
              L"[narrow] wn \u00e9\u4e2d");
    EXPECT_EQ(Strings::Format("%s-%d [%ls] %08.3f", "abc", -7, L"wide", 3.14159), "abc--7 [wide] 0003.142");
    const std::wstring longText(100000, L'x'); // no length limit
    EXPECT_EQ(Strings::Format(L"<%s>", longText.c_str()), L'<' + longText + L'>');
    EXPECT_EQ(Strings::Format(L""), L"");
    EXPECT_EQ(Strings::Format(static_cast<const wchar_t*>(nullptr)), L"");
    EXPECT_EQ(Strings::Format(L"ab%cde", L'\0'), L"ab");
    EXPECT_EQ(Strings::Format("ab%cde", '\0'), "ab");
}

TEST(StringsToString, WritesDecimalIntegersAndWidensEachByteUpToTheFirstNul)
{
    EXPECT_EQ(Strings::ToString(-42), L"-42");
    EXPECT_EQ(Strings::ToString(INT_MIN), L"-2147483648");
    EXPECT_EQ(Strings::ToString(std::string("caf\xe9")), L"caf\u00e9");
    EXPECT_EQ(Strings::ToString(std::string("\xc3\xa9")), L"\u00c3\u00a9"); // UTF-8 is not decoded
    EXPECT_EQ(Strings::ToString(std::string("ab\0cd", 5)), L"ab");
}

TEST(StringsPadd, PutsZerosInFrontOfTheWholeText)
{
    const std::tuple<int, int, const wchar_t*> cases[] = {{7, 2, L"07"},   {0, 2, L"00"}, {123, 2, L"123"},
                                                          {-5, 3, L"0-5"}, {5, -1, L"5"}, {42, 6, L"000042"}};
    for (const auto& [value, width, expected] : cases)
        EXPECT_EQ(Strings::Padd(value, width), expected) << value << " width " << width;
}

TEST(StringsTrimLeft, RemovesLeadingAsciiWhiteSpaceOnly)
{
    const std::pair<std::wstring, std::wstring> cases[] = {
        {L" \t\r\n\v\fx ", L"x "}, {L"\u00a0x", L"\u00a0x"}, {L"\u3000x", L"\u3000x"}, {L"   ", L""}};
    for (auto [text, expected] : cases)
    {
        EXPECT_EQ(&Strings::TrimLeft(text), &text);
        EXPECT_EQ(text, expected);
    }
}

TEST(StringsHexToInt, ReadsUpToEightDigitsFromTheRight)
{
    // 0xDEAD: output untouched; a null output is never written; U+FF11 (full-width 1) is no digit.
    const std::tuple<const wchar_t*, int, unsigned long> cases[] = {
        {nullptr, 1, 0xDEAD},     {L"", 1, 0xDEAD}, {L"123456789", 2, 0xDEAD}, {L"FFFFFFFF", 1, 0xFFFFFFFF},
        {L"aBcDef", 1, 0xABCDEF}, {L"G1", 4, 1},    {L"0x1F", 4, 31},          {L"\uff11", 4, 0}};
    for (const auto& [text, result, expected] : cases)
    {
        unsigned long output = 0xDEAD;
        EXPECT_EQ(Strings::HexToInt(text, &output), result) << (text ? text : L"(null)");
        EXPECT_EQ(output, expected);
    }
    EXPECT_EQ(Strings::HexToInt(L"ff", nullptr), 1);
}

TEST(StringsHexToInt, NeverReadsBeyondTheNinthCharacter)
{
    // Nine digits and no terminator, right before a page that may not be touched.
    char* const pages =
        static_cast<char*>(::VirtualAlloc(nullptr, 0x20000, MEM_COMMIT | MEM_RESERVE, PAGE_READWRITE));
    ASSERT_NE(pages, nullptr);
    DWORD old;
    ASSERT_TRUE(::VirtualProtect(pages + 0x10000, 0x10000, PAGE_NOACCESS, &old));
    wchar_t* const text = reinterpret_cast<wchar_t*>(pages + 0x10000) - 9;
    std::fill(text, text + 9, L'f');
    unsigned long output = 0xDEAD;
    EXPECT_EQ(Strings::HexToInt(text, &output), 2);
    ::VirtualFree(pages, 0, MEM_RELEASE);
}

TEST(StringsSplit, SplitsAtEveryOccurrence)
{
    // After a longer delimiter the next token starts one character after the match's start.
    using Tokens = std::vector<std::string>;
    const std::tuple<std::string, const char*, Tokens> cases[] = {
        {"a,,b", ",", {"a", "", "b"}},      {"a;b;", ";", {"a", "b"}}, {";", ";", {""}}, {"", ";", {}},
        {"x<>y<>", "<>", {"x", ">y", ">"}},
    };
    for (const auto& [text, delimiter, expected] : cases)
        EXPECT_EQ(Strings::Split(text, delimiter), expected) << text;
    EXPECT_THROW(Strings::Split("abc", ""), std::out_of_range);
    EXPECT_THROW(Strings::Split("abc", nullptr), std::out_of_range);
}

TEST(StringsToInt, ReadsLikeAtoiClampedToTheIntRange)
{
    const std::pair<std::string, int> cases[] = {{"42abc", 42},
                                                 {"abc", 0},
                                                 {"  \t-17", -17},
                                                 {"0x1F", 0},
                                                 {"99999999999", INT_MAX},
                                                 {"-99999999999", INT_MIN},
                                                 {{"12\0x", 4}, 12}};
    for (const auto& [text, expected] : cases)
        EXPECT_EQ(Strings::ToInt(text), expected) << text;
}

TEST(StringsBase64, EncodesAndDecodesReferenceVectors)
{
    // RFC 4648 section 10, NUL bytes, and 49 bytes that take every alphabet character through the
    // loops over whole groups, then a one-byte tail (encoded by Python's base64 module).
    const std::string long49(
        "\x00\x10\x83\x10\x51\x87\x20\x92\x8b\x30\xd3\x8f\x41\x14\x93\x51\x55\x97\x61\x96\x9b\x71\xd7\x9f\x82"
        "\x18\xa3\x92\x59\xa7\xa2\x9a\xab\xb2\xdb\xaf\xc3\x1c\xb3\xd3\x5d\xb7\xe3\x9e\xbb\xf3\xdf\xbf\xff",
        49);
    const std::string nuls(3, '\0'),
        alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+//w==";
    const std::pair<std::string, std::string> vectors[] = {
        {"", ""},        {"f", "Zg=="},        {"fo", "Zm8="},
        {"foo", "Zm9v"}, {"foob", "Zm9vYg=="}, {"foobar", "Zm9vYmFy"},
        {nuls, "AAAA"},  {long49, alphabet}};
    for (const auto& [plain, encoded] : vectors)
    {
        const auto* bytes = reinterpret_cast<const unsigned char*>(plain.data());
        EXPECT_EQ(Strings::ToBase64(bytes, static_cast<std::uint32_t>(plain.size())), encoded);
        EXPECT_EQ(Strings::FromBase64(encoded), plain);
    }
    EXPECT_EQ(Strings::ToBase64(nullptr, 0), ""); // zero bytes read nothing
}

TEST(StringsBase64, DecoderStopsWhereTheSpecialCharactersSay)
{
    // The first '=' ends decoding even mid-text, and so does any character outside the alphabet:
    // line break, blank, '-' of the URL-safe alphabet, bytes above 0x7F, NUL. Text
    // without padding decodes as if padded; a lone last character and leftover low bits are ignored.
    const std::pair<std::string, std::string> cases[] = {{"Zm9v=Zm9v", "foo"}, {"Zm9vYmFy\nZm9v", "foobar"},
                                                         {"Zm9v Zm9v", "foo"}, {"Zm-9v", "f"},
                                                         {"Zm\xc3\xa9", "f"},  {std::string("Zm\0v", 4), "f"},
                                                         {"Zm9vYg", "foob"},   {"Zm9vY", "foo"},
                                                         {"Zh==", "f"},        {"=Zm9v", ""}};
    for (const auto& [text, expected] : cases)
        EXPECT_EQ(Strings::FromBase64(text), expected) << text;
}
