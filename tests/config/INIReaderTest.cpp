#include "IniTestFile.h"

#include "KelvraIni.h"

#include <gtest/gtest.h>

#include <climits>
#include <clocale>
#include <cmath>
#include <string>
#include <vector>

using KelvraTest::IniTestFile;

namespace
{

INIReader Read(const std::string& bytes)
{
    IniTestFile file(bytes);
    return INIReader(file.Path());
}

// A file with one pair per case under [v], named k0, k1, ... in order.
template <typename Case>
INIReader ReadValues(const std::vector<Case>& cases)
{
    std::string text = "[v]\n";
    for (size_t i = 0; i < cases.size(); ++i)
        text += "k" + std::to_string(i) + " = " + cases[i].text + "\n";
    return Read(text);
}

std::wstring Key(size_t index)
{
    return L"k" + std::to_wstring(index);
}

} // namespace

TEST(INIReaderLookup, FirstNonEmptyValueWins)
{
    const INIReader reader = Read("[s]\nname = one\nname = two\n[t]\n[s]\nname = three\nNAME = four\n"
                                  "[e]\nlate =\nlate = given\n");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_EQ(reader.Get(L"s", L"name", L"none"), L"one");
    EXPECT_EQ(reader.Get(L"e", L"late", L"none"), L"given");
}

TEST(INIReaderLookup, EmptyValueStoresNothing)
{
    const INIReader reader = Read("[s]\nname =\n");
    EXPECT_EQ(reader.Get(L"s", L"name", L"none"), L"none");
    EXPECT_EQ(reader.GetInteger(L"s", L"name", 7), 7);
}

TEST(INIReaderLookup, ContinuationFillsOnlyAnEmptyValue)
{
    const INIReader reader = Read("[s]\nname =\n  text\nother = a\n  b\n");
    EXPECT_EQ(reader.Get(L"s", L"name", L"none"), L"text");
    EXPECT_EQ(reader.Get(L"s", L"other", L"none"), L"a");
}

TEST(INIReaderLookup, SectionAndNameIgnoreTheCaseOfAsciiLettersOnly)
{
    const INIReader reader = Read("[main]\nkey = 1\n[Caf\xC9]\n\xE9t\xE9 = 2\n");
    EXPECT_EQ(reader.Get(L"Main", L"KEY", L"none"), L"1");
    EXPECT_EQ(reader.Get(L"MAIN", L"kEy", L"none"), L"1");
    EXPECT_EQ(reader.Get(L"CAF\u00c9", L"\u00e9T\u00e9", L"none"), L"2");
    EXPECT_EQ(reader.Get(L"caf\u00e9", L"\u00e9t\u00e9", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"caf\u00c9", L"\u00c9t\u00c9", L"none"), L"none");
}

TEST(INIReaderLookup, DottedSectionAndNameShareAKeyFirstOneWins)
{
    const INIReader sectionFirst = Read("[a.b]\nc = section\n[a]\nb.c = name\n");
    EXPECT_EQ(sectionFirst.Get(L"a.b", L"c", L"none"), L"section");
    EXPECT_EQ(sectionFirst.Get(L"a", L"b.c", L"none"), L"section");

    const INIReader nameFirst = Read("[a]\nb.c = name\n[a.b]\nc = section\n");
    EXPECT_EQ(nameFirst.Get(L"a.b", L"c", L"none"), L"name");
}

TEST(INIReaderLookup, PairsBeforeTheFirstHeaderHaveTheEmptySection)
{
    const INIReader reader = Read("top = 1\n[s]\ninner = 2\n");
    EXPECT_EQ(reader.Get(L"", L"top", L"none"), L"1");
    EXPECT_EQ(reader.Get(L"s", L"top", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"", L"inner", L"none"), L"none");
}

TEST(INIReaderLookup, BlanksInAHeaderBelongToTheSection)
{
    const INIReader reader = Read("[ main ]\nk = v\n");
    EXPECT_EQ(reader.Get(L"main", L"k", L"none"), L"none");
    EXPECT_EQ(reader.Get(L" main ", L"k", L"none"), L"v");
}

TEST(INIReaderLookup, GoodPairsAroundBadLinesAreStored)
{
    const INIReader reader = Read("a = 1\nbad line\n[broken\nb = 2\n[s]\nc = 3\n");
    EXPECT_EQ(reader.ParseError(), 2);
    EXPECT_EQ(reader.Get(L"", L"a", L"none"), L"1");
    EXPECT_EQ(reader.Get(L"", L"b", L"none"), L"2");
    EXPECT_EQ(reader.Get(L"s", L"c", L"none"), L"3");
}

TEST(INIReaderFile, EmptyFileGivesZero)
{
    const INIReader reader = Read("");
    EXPECT_EQ(reader.ParseError(), 0);
    EXPECT_EQ(reader.Get(L"", L"", L"none"), L"none");
}

TEST(INIReaderCopy, CopyAndAssignmentCarryTheValuesAndTheResult)
{
    const INIReader original = Read("k = 1\nbad\n");
    INIReader copy(original);
    EXPECT_EQ(copy.ParseError(), 2);
    EXPECT_EQ(copy.Get(L"", L"k", L"none"), L"1");

    INIReader assigned(L"Z:\\no\\such\\file.ini");
    ASSERT_EQ(assigned.ParseError(), -1);
    assigned = original;
    EXPECT_EQ(assigned.ParseError(), 2);
    EXPECT_EQ(assigned.Get(L"", L"k", L"none"), L"1");

    INIReader& self = copy;
    copy = self;
    EXPECT_EQ(copy.Get(L"", L"k", L"none"), L"1");
}

namespace
{

struct IntegerCase
{
    std::string text;
    int expected;
};

struct RealCase
{
    std::string text;
    double expected;
};

struct BooleanCase
{
    std::string text;
    int expected; // 1 true, 0 false, -1 the default
};

} // namespace

TEST(INIReaderGetInteger, ConvertsLikeWcstolInBaseZero)
{
    const int fallback = -99;
    const std::vector<IntegerCase> cases = {
        {"0xff", 255},
        {"0XFF", 255},
        {"010", 8},
        {"08", 0}, // octal: the 8 ends the number
        {"12abc", 12},
        {"-7", -7},
        {"+5", 5},
        {"2147483647", INT_MAX},
        {"99999999999", INT_MAX},
        {"-99999999999", INT_MIN},
        {"abc", fallback},
        {"- 5", fallback},
        {"\xA0" "5", fallback}, // U+00A0 is no white space
    };
    const INIReader reader = ReadValues(cases);
    for (size_t i = 0; i < cases.size(); ++i)
        EXPECT_EQ(reader.GetInteger(L"v", Key(i), fallback), cases[i].expected) << cases[i].text;
    EXPECT_EQ(reader.GetInteger(L"v", L"missing", fallback), fallback);
}

TEST(INIReaderGetReal, ConvertsDecimalNotationOnly)
{
    const double fallback = -99.5;
    const std::vector<RealCase> cases = {
        {"2.5", 2.5},
        {"1e3", 1000},
        {"-1.5E-2", -0.015},
        {".5", 0.5},
        {"+3", 3},
        {"1.", 1},
        {"12kg", 12},
        {"1e", 1},
        {"1,5", 1},
        {"0x1p3", 0},
        {"4.9e-324", 4.9e-324},
        {"1e999", HUGE_VAL},
        {"-1e999", -HUGE_VAL},
        {"1e-999", 0},
        {"x1", fallback},
        {"inf", fallback},
        {"-infinity", fallback},
        {"nan", fallback},
        {".", fallback},
        {"-", fallback},
    };
    const INIReader reader = ReadValues(cases);
    for (size_t i = 0; i < cases.size(); ++i)
        EXPECT_EQ(reader.GetReal(L"v", Key(i), fallback), cases[i].expected) << cases[i].text;
    EXPECT_EQ(reader.GetReal(L"v", L"missing", fallback), fallback);
}

TEST(INIReaderGetReal, DecimalPointIgnoresTheHostLocale)
{
    const INIReader reader = Read("pi = 3.25\n");
    ASSERT_NE(std::setlocale(LC_ALL, "German_Germany.1252"), nullptr);
    const double value = reader.GetReal(L"", L"pi", 0);
    std::setlocale(LC_ALL, "C");
    EXPECT_EQ(value, 3.25);
}

TEST(INIReaderGetBoolean, KnowsEightWordsInAnyAsciiCase)
{
    const std::vector<BooleanCase> cases = {
        {"TRUE", 1}, {"Yes", 1},  {"on", 1},      {"1", 1},  {"False", 0}, {"NO", 0},     {"Off", 0},
        {"0", 0},    {"y", -1},   {"enabled", -1}, {"2", -1}, {"true1", -1}, {"tr ue", -1}, {"01", -1},
    };
    const INIReader reader = ReadValues(cases);
    for (size_t i = 0; i < cases.size(); ++i)
    {
        const bool whenTrue = cases[i].expected == -1 ? true : cases[i].expected == 1;
        const bool whenFalse = cases[i].expected == -1 ? false : cases[i].expected == 1;
        EXPECT_EQ(reader.GetBoolean(L"v", Key(i), true), whenTrue) << cases[i].text;
        EXPECT_EQ(reader.GetBoolean(L"v", Key(i), false), whenFalse) << cases[i].text;
    }
    EXPECT_TRUE(reader.GetBoolean(L"v", L"missing", true));
    EXPECT_FALSE(reader.GetBoolean(L"v", L"missing", false));
}
