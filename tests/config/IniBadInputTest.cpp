// Input no INI writer meant: the reader must not crash, must give its documented result and
// must keep every good line.
#include "IniTestFile.h"

#include "KelvraIni.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <random>
#include <string>

using KelvraTest::IniTestFile;

namespace
{

INIReader Read(const std::string& bytes)
{
    IniTestFile file(bytes);
    return INIReader(file.Path());
}

std::wstring TemporaryFolder()
{
    wchar_t folder[MAX_PATH + 1];
    const DWORD length = ::GetTempPathW(MAX_PATH + 1, folder);
    return std::wstring(folder, length);
}

} // namespace

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
    const INIReader reader = Read("[before]\nkey = one\n" + garbage + "\n[after]\nkey = two\n");
    EXPECT_GT(reader.ParseError(), 2);
    EXPECT_EQ(reader.Get(L"before", L"key", L"none"), L"one");
    EXPECT_EQ(reader.Get(L"after", L"key", L"none"), L"two");
}

TEST(IniBadInput, NulByteEndsTheTextOfItsLine)
{
    const INIReader reader = Read(std::string("a = 1\0hidden\nb\0 = 2\n\0c = 3\nd = 4\n", 34));
    EXPECT_EQ(reader.ParseError(), 2); // "b" alone has no separator
    EXPECT_EQ(reader.Get(L"", L"a", L"none"), L"1");
    EXPECT_EQ(reader.Get(L"", L"b", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"", L"c", L"none"), L"none");
    EXPECT_EQ(reader.Get(L"", L"d", L"none"), L"4");
}

TEST(IniBadInput, OneMebibyteLineIsOneBadLine)
{
    const std::string huge(1024 * 1024, 'x');
    const INIReader text = Read("first = 1\n" + huge + "\nlast = 2\n");
    EXPECT_EQ(text.ParseError(), 2);
    EXPECT_EQ(text.Get(L"", L"first", L"none"), L"1");
    EXPECT_EQ(text.Get(L"", L"last", L"none"), L"2");

    // A huge value is refused whole rather than stored cut short.
    const INIReader value = Read("first = 1\nbig = " + huge + "\nlast = 2\n");
    EXPECT_EQ(value.ParseError(), 2);
    EXPECT_EQ(value.Get(L"", L"big", L"none"), L"none");
    EXPECT_EQ(value.Get(L"", L"last", L"none"), L"2");
}

TEST(IniBadInput, HundredThousandSectionsAreAllStored)
{
    const int count = 100000;
    std::string text;
    for (int i = 0; i < count; ++i)
        text += "[section" + std::to_string(i) + "]\nindex = " + std::to_string(i) + "\n";
    const INIReader reader = Read(text);
    EXPECT_EQ(reader.ParseError(), 0);
    int found = 0;
    for (int i = 0; i < count; ++i)
        found += reader.GetInteger(L"section" + std::to_wstring(i), L"index", -1) == i;
    EXPECT_EQ(found, count);
}

TEST(IniBadInput, NamesAroundTheirLimitOf49Characters)
{
    for (size_t length : {48u, 49u, 50u, 51u, 150u})
    {
        SCOPED_TRACE(length);
        const std::string name(length, 'n');
        const std::wstring wide(length, L'n');
        const bool fits = length <= 49;
        const INIReader section = Read("[" + name + "]\nk = v\n");
        EXPECT_EQ(section.ParseError(), fits ? 0 : 1);
        EXPECT_EQ(section.Get(wide, L"k", L"none"), fits ? L"v" : L"none");
        EXPECT_EQ(section.Get(std::wstring(49, L'n'), L"k", L"none"), length == 49 ? L"v" : L"none");

        const INIReader pair = Read("[s]\n" + name + " = v\n");
        EXPECT_EQ(pair.ParseError(), fits ? 0 : 2);
        EXPECT_EQ(pair.Get(L"s", wide, L"none"), fits ? L"v" : L"none");
        EXPECT_EQ(pair.Get(L"s", std::wstring(49, L'n'), L"none"), length == 49 ? L"v" : L"none");
    }
}

TEST(IniBadInput, LinesAroundTheReadLimitOf199Characters)
{
    // "k = " and the value: a line of up to 199 characters is read whole.
    for (size_t length : {197u, 198u, 199u, 200u, 201u})
    {
        SCOPED_TRACE(length);
        const std::string value(length - 4, 'v');
        const INIReader reader = Read("k = " + value + "\nlast = 1\n");
        const bool fits = length <= 199;
        EXPECT_EQ(reader.ParseError(), fits ? 0 : 1);
        EXPECT_EQ(reader.Get(L"", L"k", L"none"), fits ? std::wstring(length - 4, L'v') : L"none");
        EXPECT_EQ(reader.Get(L"", L"last", L"none"), L"1");
    }
}

TEST(IniBadInput, MissingFileGivesMinusOneAndEveryDefault)
{
    const INIReader reader(TemporaryFolder() + L"kelvra_no_such_file.ini");
    EXPECT_EQ(reader.ParseError(), -1);
    EXPECT_EQ(reader.Get(L"s", L"k", L"none"), L"none");
    EXPECT_EQ(reader.GetInteger(L"s", L"k", 5), 5);
    EXPECT_EQ(reader.GetReal(L"s", L"k", 2.5), 2.5);
    EXPECT_TRUE(reader.GetBoolean(L"s", L"k", true));
}

TEST(IniBadInput, FolderOrEmptyNameGivesMinusOne)
{
    EXPECT_EQ(INIReader(TemporaryFolder()).ParseError(), -1);
    EXPECT_EQ(INIReader(L"").ParseError(), -1);
    EXPECT_EQ(INIReader(std::wstring(1000, L'a') + L".ini").ParseError(), -1);
}
