// Input no INI writer meant: the reader must not crash, must give its documented result and
// must keep every good line.
#include "IniTestFile.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <utility>
#include <vector>

using KelvraTest::ExpectIniValues;
using KelvraTest::ReadIni;

TEST(IniBadInput, BinaryGarbageKeepsTheGoodLinesAround)
{
    std::mt19937 random(1234);
    std::string garbage;
    while (garbage.size() < 64 * 1024)
    {
        const char byte = static_cast<char>(random());
        if (byte != '\x1A') // a 0x1A byte would end the file here
            garbage += byte;
    }
    const INIReader reader = ReadIni("[before]\nkey = one\n" + garbage + "\n[after]\nkey = two\n");
    EXPECT_GT(reader.ParseError(), 2);
    EXPECT_EQ(reader.Get(L"before", L"key", L"none"), L"one");
    EXPECT_EQ(reader.Get(L"after", L"key", L"none"), L"two");
}

TEST(IniBadInput, NulByteEndsTheTextOfItsLine)
{
    // Line 2 is bad: "b" alone has no separator.
    ExpectIniValues(std::string("a = 1\0hidden\nb\0 = 2\n\0c = 3\nd = 4\n", 34),
                    {{L"", L"a", L"1"}, {L"", L"b", nullptr}, {L"", L"c", nullptr}, {L"", L"d", L"4"}}, 2);
}

TEST(IniBadInput, OneMebibyteValueIsOneBadLineNotAValueCutShort)
{
    ExpectIniValues("first = 1\nbig = " + std::string(1024 * 1024, 'x') + "\nlast = 2\n",
                    {{L"", L"first", L"1"}, {L"", L"big", nullptr}, {L"", L"last", L"2"}}, 2);
}

TEST(IniBadInput, HundredThousandSectionsAreAllStored)
{
    const int count = 100000;
    std::string text;
    for (int i = 0; i < count; ++i)
        text += "[section" + std::to_string(i) + "]\nindex = " + std::to_string(i) + "\n";
    const INIReader reader = ReadIni(text);
    EXPECT_EQ(reader.ParseError(), 0);
    int found = 0;
    for (int i = 0; i < count; ++i)
        found += reader.GetInteger(L"section" + std::to_wstring(i), L"index", -1) == i;
    EXPECT_EQ(found, count);
}

TEST(IniBadInput, NameLongerThan49CharactersMakesItsLineBadAndIsNotCut)
{
    const std::wstring cut(49, L'n');
    for (size_t length : {48u, 49u, 50u, 51u, 150u})
    {
        SCOPED_TRACE(length);
        const std::string name(length, 'n');
        const std::wstring wide(length, L'n');
        const bool fits = length <= 49;
        const wchar_t* const atCut = length == 49 ? L"v" : nullptr;
        // A refused header leaves no known section: "k" is not filed under "s".
        ExpectIniValues(
            "[s]\n[" + name + "]\nk = v\n",
            {{fits ? wide.c_str() : L"s", L"k", fits ? L"v" : nullptr}, {cut.c_str(), L"k", atCut}},
            fits ? 0 : 2);
        // A refused name ends the previous pair: the indented line does not continue "x".
        ExpectIniValues(
            "x =\n" + name + " = v\n  more\n",
            {{L"", wide.c_str(), fits ? L"v" : nullptr}, {L"", cut.c_str(), atCut}, {L"", L"x", nullptr}},
            fits ? 0 : 2);
    }
}

TEST(IniBadInput, LinesAroundTheReadLimitOf199Characters)
{
    // "k = " and the value, then a bad line. A line of up to 199 characters is read whole, but
    // the line end of one of exactly 199 takes a read, and so a line number, of its own.
    const std::vector<std::pair<size_t, int>> cases = {{198, 2}, {199, 3}, {200, 1}, {201, 1}};
    for (const auto& [length, firstError] : cases)
    {
        SCOPED_TRACE(length);
        const std::wstring value(length - 4, L'v');
        ExpectIniValues("k = " + std::string(length - 4, 'v') + "\nbad\nlast = 1\n",
                        {{L"", L"k", length <= 199 ? value.c_str() : nullptr}, {L"", L"last", L"1"}},
                        firstError);
    }
}

TEST(IniBadInput, FileThatCannotBeOpenedGivesMinusOneAndNoValues)
{
    const INIReader missing(KelvraTest::TemporaryFolder() + L"kelvra_no_such_file.ini");
    EXPECT_EQ(missing.ParseError(), -1);
    EXPECT_EQ(missing.Get(L"s", L"k", L"none"), L"none");
    EXPECT_EQ(INIReader(KelvraTest::TemporaryFolder()).ParseError(), -1);
    EXPECT_EQ(INIReader(L"").ParseError(), -1);
    EXPECT_EQ(INIReader(std::wstring(1000, L'a') + L".ini").ParseError(), -1);
}
