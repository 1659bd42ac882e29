// INIReader and its parser, on files written byte for byte and read from disk as callers read them.
#include "KelvraIni.h"
#include "common/UniqueHandle.h"
#include "config/IniParser.h"

#include <gtest/gtest.h>

#include <array>
#include <climits>
#include <clocale>
#include <cmath>
#include <cstdio>
#include <tuple>
#include <vector>

namespace
{

// A file in the current folder holding exactly these bytes, removed on destruction; one at a time.
struct IniFile
{
    explicit IniFile(const std::string& bytes)
    {
        Kelvra::UniqueFile file(_wfopen(path.c_str(), L"wb"));
        EXPECT_TRUE(file && std::fwrite(bytes.data(), 1, bytes.size(), file.get()) == bytes.size());
    }
    ~IniFile() { EXPECT_EQ(0, _wremove(path.c_str())) << "the file is still open"; }

    const std::wstring path = L"kelvra_ini_" + std::to_wstring(::GetCurrentProcessId()) + L".ini";
};

INIReader ReadIni(const std::string& bytes)
{
    return INIReader(IniFile(bytes).path);
}

// Writes each handler call as "[section]name=value", the calls separated by " | ".
int Record(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value)
{
    std::wstring& calls = *static_cast<std::wstring*>(user);
    calls += (calls.empty() ? L"[" : L" | [") + std::wstring(section) + L"]" + name + L"=" + value;
    return 1;
}

// Each case: the file's bytes (read in text mode, as INIReader does), the result and the calls.
void ExpectParses(const std::vector<std::tuple<std::string, int, std::wstring>>& cases)
{
    for (const auto& [bytes, result, expected] : cases)
    {
        SCOPED_TRACE(bytes.substr(0, 80));
        IniFile file(bytes);
        Kelvra::UniqueFile stream(_wfopen(file.path.c_str(), L"r"));
        std::wstring calls;
        EXPECT_EQ(Kelvra::ParseIniStream(stream.get(), &Record, &calls), result);
        EXPECT_EQ(calls, expected);
    }
}

template <typename T> std::pair<std::string, T> Gives(const char* text, T result)
{
    return {text, result};
}

// Stores each text under a key of its own ("" stores nothing); get(reader, key) gives its result.
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
TEST(IniParserPairs, InlineCommentNeedsWhiteSpaceBeforeItAndEqualsSignWinsOverColon)
{
    ExpectParses({
        {"; a = 1\n# b = 2\n   ; c = 3\n\t# d = 4\na = 1\n  ; no continuation\n", 0, L"[]a=1"},
        {"n = v ; c\nn = v;c\nn = ; c\nn = a # b", 0, L"[]n=v | []n=v;c | []n=; c | []n=a # b"},
        {"a: b\na:b=c\n=value\nname :\n", 0, L"[]a=b | []a:b=c | []=value | []name="},
        // 0xA0 and 0x85 end UTF-8 letters such as "\u00e0": they are no white space.
        {"\t\v\fa b\t=\f v \v\r\n\xA0n\xA0 = \x85v\x85", 0, L"[]a b=v | []\u00a0n\u00a0=\u0085v\u0085"},
        {"a = 1\na b\nc = 3\na ;b = c\n", 2, L"[]a=1 | []c=3"},
    });
}

TEST(IniParserSections, HeaderSetsTheSectionAndAnUnclosedOneIsABadLine)
{
    ExpectParses({
        {"[m]\na = 1\n[ m ]\nb = 2\n[o] ; c\nc = 3\n[x] text\nd = 4\n[]\ne = 5\n", 0,
         L"[m]a=1 | [ m ]b=2 | [o]c=3 | [x]d=4 | []e=5"},
        {"[one]\n[two ;x]\na = 1\n[three\n", 2, L"[one]a=1"},
    });
}

TEST(IniParserContinuation, IndentedLineContinuesThePreviousNameOfItsSection)
{
    ExpectParses({
        {"x = 1\n  y = 2\n\tz ; c\n\n  [t]\nz = 3\n", 0, L"[]x=1 | []x=y = 2 | []x=z ; c | []x=[t] | []z=3"},
        {"  a = 1\n[s]\n  y = 2\n", 0, L"[]a=1 | [s]y=2"}, // no previous name: a pair
        {"x = 1\nbad\n  more\n", 2, L"[]x=1 | []x=more"},
    });
}

TEST(IniParserLineEnds, CrLfEndsALineControlZTheFileAndNulTheTextOfALine)
{
    ExpectParses({
        {"", 0, L""},
        {"\xEF\xBB\xBF[s]\r\na = 1\r\n\r\n\xEF\xBB\xBFk = 2 ; c", 0, L"[s]a=1 | [s]\u00ef\u00bb\u00bfk=2"},
        {"a = 1\x1A tail\nk = 2\n", 0, L"[]a=1"},
        {std::string("a = 1\0hidden\nb\0 = 2\n\0c = 3\nd = 4\n", 34), 2, L"[]a=1 | []d=4"},
    });
}

TEST(IniParserLongLines, AreReadIn199CharacterPiecesAndARefusedOneEndsThePairBeforeIt)
{
    const std::string more(300, 'm'), blanks(200, ' ');
    ExpectParses({
        {"[s] ; " + more + "\nk = v ; " + more + "\n", 0, L"[s]k=v"},
        // Beyond the first read only blanks, or blanks and an inline comment.
        {"a = b" + blanks + "\n" + blanks + "\nk = v" + std::string(194, ' ') + ";x\nn = 1" + blanks + " ; c",
         0, L"[]a=b | []k=v | []n=1"},
        {"x =\n  more" + blanks, 0, L"[]x= | []x=more"},
        {"x =\n  more" + blanks + "; note", 2, L"[]x="}, // a continuation keeps its comments
        {"k = " + std::string(195, 'v') + ";x", 1, L""}, // ";" after a letter: the value goes on
        {"[s]\n[" + more + "]\nk = v\n", 2, L""},        // header closed beyond the first read
        {std::string(250, ' ') + "a = 1", 1, L""},       // nothing but blanks in the first read
        {"k" + more + " = 1", 1, L""},                   // separator beyond the first read
        {"x = 1\n  " + more + "\ny = 2\n", 2, L"[]x=1 | []y=2"},
        // "url = " and the path fill the first read: the rest is no pair of its own.
        {"a = 1\nurl = http://host/" + std::string(181, 'p') + "?a=b\nb = 2\n", 2, L"[]a=1 | []b=2"},
        // A refused pair ends the previous pair, a refused header leaves no section until the next.
        // Names of more than 49 characters are refused, not cut.
        {"a =\nlong = " + std::string(250, 'x') + "\n  continuation\nb = 1\n", 2, L"[]a= | []b=1"},
        {"x =\n" + std::string(49, 'n') + " = v\n", 0, L"[]x= | []" + std::wstring(49, L'n') + L"=v"},
        {"x =\n" + std::string(50, 'n') + " = v\n  more\n", 2, L"[]x="},
        {"[s]\na=1\n[" + std::string(50, 'n') + "]\nk=v\n  more\n[t]\nk=w\n", 3, L"[s]a=1 | [t]k=w"},
        // 500 characters: reads of 199, 199 and 102, so the bad line after it is line 4.
        {";" + std::string(200, 'c') + " a=b " + std::string(294, 'c') + "\nbad\nk = 1\n", 4, L"[]k=1"},
        // A line of up to 199 characters is read whole, but the line end of one of 199 takes a read.
        {"k = " + std::string(194, 'v') + "\nbad\n", 2, L"[]k=" + std::wstring(194, L'v')},
        {"k = " + std::string(195, 'v') + "\nbad\n", 3, L"[]k=" + std::wstring(195, L'v')},
        {"k=" + std::string(197, 'v'), 0, L"[]k=" + std::wstring(197, L'v')}, // no line end after it
    });
}

TEST(INIReaderLookup, KeyIsSectionDotNameWithAsciiLettersLoweredAndItsFirstNonEmptyValueWins)
{
    const INIReader reader =
        ReadIni("top = 1\n[s]\nname = one\nname = two\n[t]\n[s]\nNAME = three\n[Caf\xC9]\n\xE9t\xE9 = 2\n"
                "[e]\nlate =\nlate = given\nfilled =\n  text\nkept = a\n  b\n"
                "[ spaced ]\nk = v\n[a.b]\nc = section\n[a]\nb.c = name\n");
    // "a" "b.c" and "a.b" "c" make one key: the first value wins.
    const std::array<const wchar_t*, 3> lookups[] = {
        {L"", L"top", L"1"}, {L"s", L"top", L"-"}, {L"S", L"Name", L"one"}, {L"e", L"late", L"given"},
        {L"CAF\u00c9", L"\u00e9T\u00e9", L"2"}, {L"caf\u00e9", L"\u00e9t\u00e9", L"-"}, {L"e", L"kept", L"a"},
        {L"e", L"filled", L"text"}, {L" spaced ", L"k", L"v"}, {L"spaced", L"k", L"-"},
        {L"a", L"b.c", L"section"}};
    for (const auto& [section, key, value] : lookups)
        EXPECT_EQ(reader.Get(section, key, L"-"), value) << section << "." << key;
}

TEST(INIReaderFile, UnreadableFileGivesMinusOneAndCopiesCarryValuesAndResult)
{
    INIReader reader(L"kelvra_no_such_file.ini");
    EXPECT_EQ(reader.ParseError(), -1);
    EXPECT_EQ(INIReader(L".").ParseError(), -1); // a folder
    reader = ReadIni("k = 1\nbad\n");
    for (const INIReader& r : {reader, INIReader(reader)})
        EXPECT_EQ(std::to_wstring(r.ParseError()) + r.Get(L"", L"k", L"-"), L"21");
}

TEST(INIReaderGetInteger, ConvertsLikeWcstolInBaseZero)
{
    // "08" is octal, ended by the 8; U+00A0 is no white space.
    ExpectConversions<int>({Gives("0xff", 255), Gives("010", 8), Gives("08", 0), Gives("12abc", 12),
                            Gives("99999999999", INT_MAX), Gives("-99999999999", INT_MIN), Gives("abc", -99),
                            Gives("\xA0+5", -99), Gives("", -99)},
                           [](const auto& reader, const auto& key)
                           { return reader.GetInteger(L"v", key, -99); });
}

TEST(INIReaderGetReal, ConvertsDecimalNotationOnlyWhateverTheHostLocale)
{
    ASSERT_NE(std::setlocale(LC_ALL, "German_Germany.1252"), nullptr);
    ExpectConversions<double>({Gives("2.5", 2.5), Gives("1e3", 1000.0), Gives("1e", 1.0), Gives("1,5", 1.0),
                               Gives("0x1p3", 0.0), Gives("1e999", HUGE_VAL), Gives("x1", -9.5),
                               Gives("-infinity", -9.5), Gives("nan", -9.5), Gives("", -9.5)},
                              [](const auto& reader, const auto& key)
                              { return reader.GetReal(L"v", key, -9.5); });
    std::setlocale(LC_ALL, "C");
}

TEST(INIReaderGetBoolean, KnowsEightWordsInAnyAsciiCase)
{
    // Tried with both defaults: 1 true, -1 false, 0 the default.
    ExpectConversions<int>(
        {Gives("TRUE", 1), Gives("Yes", 1), Gives("on", 1), Gives("1", 1), Gives("False", -1),
         Gives("NO", -1), Gives("Off", -1), Gives("0", -1), Gives("y", 0), Gives("enabled", 0), Gives("2", 0),
         Gives("true1", 0), Gives("01", 0), Gives("", 0)},
        [](const auto& reader, const auto& key)
        { return reader.GetBoolean(L"v", key, true) + reader.GetBoolean(L"v", key, false) - 1; });
}
