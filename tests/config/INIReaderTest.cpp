#include "IniTestFile.h"

#include <gtest/gtest.h>

#include <climits>
#include <clocale>
#include <cmath>
#include <string>
#include <utility>
#include <vector>

using KelvraTest::ExpectIniValues;
using KelvraTest::ReadIni;

namespace
{

// Writes each case's text as the value of a key of its own (an empty text stores nothing, like a
// missing key) and expects get(reader, key) to give the case's result.
template <typename T, typename Getter>
void ExpectConversions(const std::vector<std::pair<std::string, T>>& cases, Getter get)
{
    std::string text = "[v]\n";
    for (size_t i = 0; i < cases.size(); ++i)
        text += "k" + std::to_string(i) + " = " + cases[i].first + "\n";
    const INIReader reader = ReadIni(text);
    for (size_t i = 0; i < cases.size(); ++i)
        EXPECT_EQ(get(reader, L"k" + std::to_wstring(i)), cases[i].second) << '"' << cases[i].first << '"';
}

} // namespace

TEST(INIReaderLookup, FirstNonEmptyValueWins)
{
    ExpectIniValues("[s]\nname = one\nname = two\n[t]\n[s]\nname = three\nNAME = four\n"
                    "[e]\nlate =\nlate = given\nempty =\nfilled =\n  text\nkept = a\n  b\n",
                    {{L"s", L"name", L"one"}, {L"e", L"late", L"given"}, {L"e", L"empty", nullptr},
                     {L"e", L"filled", L"text"}, {L"e", L"kept", L"a"}});
}

TEST(INIReaderLookup, KeyIsSectionDotNameWithOnlyAsciiLettersLowered)
{
    ExpectIniValues("top = 1\n[main]\nkey = 1\n[Caf\xC9]\n\xE9t\xE9 = 2\n[ spaced ]\nk = v\n"
                    "[a.b]\nc = section\n[a]\nb.c = name\n",
                    {{L"", L"top", L"1"}, {L"main", L"top", nullptr}, {L"", L"key", nullptr},
                     {L"Main", L"KEY", L"1"}, {L"CAF\u00c9", L"\u00e9T\u00e9", L"2"},
                     {L"caf\u00e9", L"\u00e9t\u00e9", nullptr}, {L"caf\u00c9", L"\u00c9t\u00c9", nullptr},
                     {L" spaced ", L"k", L"v"}, {L"spaced", L"k", nullptr},
                     // One key for both: the first value wins.
                     {L"a.b", L"c", L"section"}, {L"a", L"b.c", L"section"}});
}

TEST(INIReaderCopy, CopyAndAssignmentCarryTheValuesAndTheResult)
{
    const INIReader original = ReadIni("k = 1\nbad\n");
    const INIReader copy(original);
    INIReader assigned(L"Z:\\no\\such\\file.ini");
    assigned = original;
    EXPECT_EQ(copy.ParseError(), 2);
    EXPECT_EQ(copy.Get(L"", L"k", L"none"), L"1");
    EXPECT_EQ(assigned.ParseError(), 2);
    EXPECT_EQ(assigned.Get(L"", L"k", L"none"), L"1");
}

TEST(INIReaderGetInteger, ConvertsLikeWcstolInBaseZero)
{
    // "08" is octal, ended by the 8; U+00A0 is no white space.
    constexpr int fallback = -99;
    ExpectConversions<int>(
        {{"0xff", 255}, {"0XFF", 255}, {"010", 8}, {"08", 0}, {"12abc", 12}, {"-7", -7}, {"+5", 5},
         {"2147483647", INT_MAX}, {"99999999999", INT_MAX}, {"-99999999999", INT_MIN}, {"abc", fallback},
         {"- 5", fallback}, {"\xA0+5", fallback}, {"", fallback}},
        [](const auto& reader, const auto& key) { return reader.GetInteger(L"v", key, fallback); });
}

TEST(INIReaderGetReal, ConvertsDecimalNotationOnly)
{
    constexpr double fallback = -99.5;
    ExpectConversions<double>(
        {{"2.5", 2.5}, {"1e3", 1000}, {"-1.5E-2", -0.015}, {".5", 0.5}, {"+3", 3}, {"1.", 1}, {"12kg", 12},
         {"1e", 1}, {"1,5", 1}, {"0x1p3", 0}, {"4.9e-324", 4.9e-324}, {"1e999", HUGE_VAL},
         {"-1e999", -HUGE_VAL}, {"1e-999", 0}, {"x1", fallback}, {"-infinity", fallback}, {"nan", fallback},
         {".", fallback}, {"-", fallback}, {"", fallback}},
        [](const auto& reader, const auto& key) { return reader.GetReal(L"v", key, fallback); });
}

TEST(INIReaderGetReal, DecimalPointIgnoresTheHostLocale)
{
    const INIReader reader = ReadIni("pi = 3.25\n");
    ASSERT_NE(std::setlocale(LC_ALL, "German_Germany.1252"), nullptr);
    const double value = reader.GetReal(L"", L"pi", 0);
    std::setlocale(LC_ALL, "C");
    EXPECT_EQ(value, 3.25);
}

TEST(INIReaderGetBoolean, KnowsEightWordsInAnyAsciiCase)
{
    // 1 true, 0 false, -1 the default whichever it is, -2 the opposite of the default.
    ExpectConversions<int>({{"TRUE", 1}, {"Yes", 1}, {"on", 1}, {"1", 1}, {"False", 0}, {"NO", 0}, {"Off", 0},
                            {"0", 0}, {"y", -1}, {"enabled", -1}, {"2", -1}, {"true1", -1}, {"tr ue", -1},
                            {"01", -1}, {"", -1}},
                           [](const auto& reader, const auto& key)
                           {
                               const bool whenTrue = reader.GetBoolean(L"v", key, true);
                               const bool whenFalse = reader.GetBoolean(L"v", key, false);
                               return whenTrue == whenFalse ? int(whenTrue) : whenTrue ? -1 : -2;
                           });
}
