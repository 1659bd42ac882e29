#include "IniTestFile.h"

#include "common/UniqueHandle.h"
#include "config/IniParser.h"

#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <vector>

namespace
{

// One handler call: section, name, value.
using Call = std::tuple<std::wstring, std::wstring, std::wstring>;

// The handler refuses every pair and continuation whose value is "refuse".
int Record(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value)
{
    static_cast<std::vector<Call>*>(user)->emplace_back(section, name, value);
    return std::wstring(value) != L"refuse";
}

struct Case
{
    std::string bytes;
    int result;
    std::vector<Call> calls;
};

// Writes each case's bytes to a file and parses it through a text-mode stream, as INIReader does.
void ExpectParses(const std::vector<Case>& cases)
{
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.bytes.substr(0, 80));
        KelvraTest::IniTestFile file(c.bytes);
        Kelvra::UniqueFile stream(_wfopen(file.Path().c_str(), L"r"));
        ASSERT_TRUE(stream);
        std::vector<Call> calls;
        EXPECT_EQ(Kelvra::ParseIniStream(stream.get(), &Record, &calls), c.result);
        EXPECT_EQ(calls, c.calls);
    }
}

} // namespace

TEST(IniParserComments, CommentLinesAndInlineCommentsAreSkipped)
{
    ExpectParses({
        {"; a = 1\n# b = 2\n   ; c = 3\n\t# d = 4\n;\n#\n", 0, {}},
        {"a = 1\n  ; note\nb = 2\n", 0, {{L"", L"a", L"1"}, {L"", L"b", L"2"}}}, // no continuation
        {"name = value ; note", 0, {{L"", L"name", L"value"}}},
        {"name = value\t;note", 0, {{L"", L"name", L"value"}}},
        {"name = a ;b ;c", 0, {{L"", L"name", L"a"}}},
        {"name = value;note", 0, {{L"", L"name", L"value;note"}}},
        {"name = ; note", 0, {{L"", L"name", L"; note"}}}, // the first character of a scan opens no comment
        {"name = a # b", 0, {{L"", L"name", L"a # b"}}},
    });
}

TEST(IniParserSections, HeaderSetsTheSectionAndAnUnclosedOneIsABadLine)
{
    ExpectParses({
        {"top = 0\n[main]\na = 1\n[ main ]\nb = 2\n[other] ; note\nc = 3\n[x] text\nd = 4\n[]\ne = 5\n", 0,
         {{L"", L"top", L"0"}, {L"main", L"a", L"1"}, {L" main ", L"b", L"2"}, {L"other", L"c", L"3"},
          {L"x", L"d", L"4"}, {L"", L"e", L"5"}}},
        {"[main ;x]", 1, {}},
        {"[one]\n[two\na = 1\n", 2, {{L"one", L"a", L"1"}}},
    });
}

TEST(IniParserPairs, EqualsSignWinsOverColonAndALineWithNeitherIsBad)
{
    ExpectParses({
        {"a: b", 0, {{L"", L"a", L"b"}}},
        {"a:b=c", 0, {{L"", L"a:b", L"c"}}},
        {"a = b = c", 0, {{L"", L"a", L"b = c"}}},
        {"  spaced name  =  spaced value  ", 0, {{L"", L"spaced name", L"spaced value"}}},
        {"=value", 0, {{L"", L"", L"value"}}},
        {"name :", 0, {{L"", L"name", L""}}},
        {"a b", 1, {}},
        {"a ;b = c", 1, {}},
        {"a ; b: c", 1, {}},
    });
}

TEST(IniParserPairs, WhiteSpaceIsAsciiOnly)
{
    ExpectParses({
        {"\t\v\fname\t=\f value \v\r", 0, {{L"", L"name", L"value"}}},
        // 0xA0 and 0x85 end the UTF-8 letters "\u00e0" and "\u00c5": they stay.
        {"city = Vor\xC3\xA0", 0, {{L"", L"city", L"Vor\u00c3\u00a0"}}},
        {"\xA0name\xA0 = \x85value\x85", 0, {{L"", L"\u00a0name\u00a0", L"\u0085value\u0085"}}},
    });
}

TEST(IniParserContinuation, IndentedLineContinuesThePreviousNameOfItsSection)
{
    ExpectParses({
        {"x = 1\n  y = 2\n\tmore ; kept\n\n  after blank\n  [t]\nz = 3\n", 0,
         {{L"", L"x", L"1"}, {L"", L"x", L"y = 2"}, {L"", L"x", L"more ; kept"}, {L"", L"x", L"after blank"},
          {L"", L"x", L"[t]"}, {L"", L"z", L"3"}}},
        {"  a = 1\n[s]\n  y = 2\n", 0, {{L"", L"a", L"1"}, {L"s", L"y", L"2"}}}, // no previous name: a pair
        {"x = 1\nbad\n  more\n", 2, {{L"", L"x", L"1"}, {L"", L"x", L"more"}}},
    });
}

TEST(IniParserByteOrderMark, MarkIsSkippedOnTheFirstLineOnly)
{
    ExpectParses({
        {"\xEF\xBB\xBF[main]\na = 1\n\xEF\xBB\xBFk = 2\n", 0,
         {{L"main", L"a", L"1"}, {L"main", L"\u00ef\u00bb\u00bfk", L"2"}}},
    });
}

TEST(IniParserLineEnds, CarriageReturnLineFeedEndsALineAndControlZTheFile)
{
    ExpectParses({
        {"a = 1\r\nb = 2 ; c\r\n\r\nc = 3", 0, {{L"", L"a", L"1"}, {L"", L"b", L"2"}, {L"", L"c", L"3"}}},
        {"a = 1\rb = 2\n", 0, {{L"", L"a", L"1\rb = 2"}}},
        {"a = 1\n\x1Ak = 2\n", 0, {{L"", L"a", L"1"}}},
        {"a = 1\x1A tail\nk = 2\n", 0, {{L"", L"a", L"1"}}},
    });
}

TEST(IniParserLongLines, LongLineIsKeptOnlyWhenItsContentEndsInTheFirstRead)
{
    const std::string more(300, 'm');
    const std::string blanks(200, ' ');
    ExpectParses({
        {"[s] ; " + more + "\nk = v ; " + more + "\n", 0, {{L"s", L"k", L"v"}}},
        // Beyond the first read only blanks, or blanks and an inline comment.
        {"server = example.com" + blanks + "\n" + blanks + "\n", 0, {{L"", L"server", L"example.com"}}},
        {"k = v" + std::string(194, ' ') + ";x\nn = 1" + blanks + " ; note\n",
         0,
         {{L"", L"k", L"v"}, {L"", L"n", L"1"}}},
        {"x =\n  more" + blanks, 0, {{L"", L"x", L""}, {L"", L"x", L"more"}}},
        {"x =\n  more" + blanks + "; note", 2, {{L"", L"x", L""}}}, // a continuation keeps its comments
        {"k = " + std::string(195, 'v') + ";x", 1, {}},             // ";" after a letter: the value goes on
        {"[s]\n[" + more + "]\nk = v\n", 2, {}},                    // header closed beyond the first read
        {std::string(250, ' ') + "a = 1", 1, {}},                   // nothing but blanks in the first read
        {"k" + more + " = 1", 1, {}},                               // separator beyond the first read
        {"x = 1\n  " + more + "\ny = 2\n", 2, {{L"", L"x", L"1"}, {L"", L"y", L"2"}}},
        // "url = " and the path fill the first read: the rest is no pair of its own.
        {"first = 1\nurl = http://host/" + std::string(181, 'p') + "?a=b\nnext = 2\n",
         2,
         {{L"", L"first", L"1"}, {L"", L"next", L"2"}}},
    });
}

TEST(IniParserLongLines, NothingAfterARefusedLineIsFiledUnderTheNamesBeforeIt)
{
    // A refused pair ends the previous pair; a refused header leaves no section until the next.
    ExpectParses({
        {"a =\nlong = " + std::string(250, 'x') + "\n  continuation\nb = 1\n",
         2,
         {{L"", L"a", L""}, {L"", L"b", L"1"}}},
        {"[s]\na=1\n[" + std::string(60, 'n') + "]\nk=v\n  more\n[t]\nk=w\n",
         3,
         {{L"s", L"a", L"1"}, {L"t", L"k", L"w"}}},
    });
}

TEST(IniParserLongLines, EveryReadOf199CharactersTakesALineNumber)
{
    // 500 characters: reads of 199, 199 and 102, so the bad line after it is line 4.
    const std::string comment = ";" + std::string(200, 'c') + " a=b " + std::string(294, 'c');
    ExpectParses({
        {comment + "\nbad\nk = 1\n", 4, {{L"", L"k", L"1"}}},
        // A last line of 199 characters with no line end after it is read whole.
        {"k=" + std::string(197, 'v'), 0, {{L"", L"k", std::wstring(197, L'v')}}},
    });
}

TEST(IniParserBadLines, ResultIsTheFirstBadOrRefusedLineAndParsingGoesOn)
{
    ExpectParses({
        {"", 0, {}},
        {"a = 1\nb = 2\nbad\nc = 3\n[s]\nd = 4\n[broken\ne = 5\n", 3,
         {{L"", L"a", L"1"}, {L"", L"b", L"2"}, {L"", L"c", L"3"}, {L"s", L"d", L"4"}, {L"s", L"e", L"5"}}},
        {"a = 1\nb = refuse\nc = refuse\n", 2,
         {{L"", L"a", L"1"}, {L"", L"b", L"refuse"}, {L"", L"c", L"refuse"}}},
        {"a = 1\n  refuse\n", 2, {{L"", L"a", L"1"}, {L"", L"a", L"refuse"}}},
        {"bad\nb = refuse\n", 1, {{L"", L"b", L"refuse"}}},
    });
}
