#include "IniTestFile.h"

#include "common/UniqueHandle.h"
#include "config/IniParser.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <vector>

using KelvraTest::IniTestFile;
using testing::ElementsAre;
using testing::IsEmpty;

namespace
{

// One handler call: section, name, value.
using Call = std::tuple<std::wstring, std::wstring, std::wstring>;

struct Recorder
{
    std::vector<Call> calls;
    const wchar_t* refusedName; // the handler returns 0 for pairs of this name, if set
};

int Record(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value)
{
    Recorder* recorder = static_cast<Recorder*>(user);
    recorder->calls.emplace_back(section, name, value);
    return recorder->refusedName == nullptr || std::wstring(recorder->refusedName) != name;
}

struct Parsed
{
    int result;
    std::vector<Call> calls;
};

// Writes the bytes to a file and parses it through a text-mode stream, as INIReader does.
Parsed Parse(const std::string& bytes, const wchar_t* refusedName = nullptr)
{
    IniTestFile file(bytes);
    Kelvra::UniqueFile stream(_wfopen(file.Path().c_str(), L"r"));
    if (!stream)
    {
        ADD_FAILURE() << "cannot open the test file";
        return Parsed{-1, {}};
    }
    Recorder recorder{{}, refusedName};
    const int result = Kelvra::ParseIniStream(stream.get(), &Record, &recorder);
    return Parsed{result, recorder.calls};
}

struct ValueCase
{
    const char* line;
    const wchar_t* name;
    const wchar_t* value;
};

void ExpectPairs(const std::vector<ValueCase>& cases)
{
    for (const ValueCase& c : cases)
    {
        SCOPED_TRACE(c.line);
        const Parsed parsed = Parse(c.line);
        EXPECT_EQ(parsed.result, 0);
        EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", c.name, c.value}));
    }
}

void ExpectBadLine(const std::vector<const char*>& lines)
{
    for (const char* line : lines)
    {
        SCOPED_TRACE(line);
        const Parsed parsed = Parse(line);
        EXPECT_EQ(parsed.result, 1);
        EXPECT_THAT(parsed.calls, IsEmpty());
    }
}

} // namespace

TEST(IniParserStream, EmptyFileGivesZeroAndNoCall)
{
    const Parsed parsed = Parse("");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, IsEmpty());
}

TEST(IniParserComments, LinesStartingWithSemicolonOrHashAreSkipped)
{
    const Parsed parsed = Parse("; a = 1\n# b = 2\n   ; c = 3\n\t# d = 4\n;\n#\n");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, IsEmpty());
}

TEST(IniParserComments, IndentedCommentAfterAPairIsNoContinuation)
{
    const Parsed parsed = Parse("a = 1\n  ; note\nb = 2\n");
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"a", L"1"}, Call{L"", L"b", L"2"}));
}

TEST(IniParserComments, InlineCommentStartsAtSemicolonAfterWhiteSpace)
{
    ExpectPairs({
        {"name = value ; note", L"name", L"value"},
        {"name = value\t;note", L"name", L"value"},
        {"name = value;note", L"name", L"value;note"},
        {"name = ; note", L"name", L"; note"}, // the first character of a scan never opens a comment
        {"name = a # b", L"name", L"a # b"},
        {"name = a ;b ;c", L"name", L"a"},
        {"url = http://host/a;b?c=d ; where", L"url", L"http://host/a;b?c=d"},
    });
}

TEST(IniParserSections, HeaderSetsTheSectionOfTheFollowingPairs)
{
    const Parsed parsed = Parse("top = 0\n[main]\na = 1\n[ main ]\nb = 2\n[other] ; note\nc = 3\n[x] trailing\nd = 4\n"
                                "[]\ne = 5\n");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"top", L"0"}, Call{L"main", L"a", L"1"},
                                          Call{L" main ", L"b", L"2"}, Call{L"other", L"c", L"3"},
                                          Call{L"x", L"d", L"4"}, Call{L"", L"e", L"5"}));
}

TEST(IniParserSections, UnclosedHeaderIsABadLineAndKeepsTheSection)
{
    ExpectBadLine({"[main ;x]", "[main", "[main ; ]"});
    const Parsed parsed = Parse("[one]\n[two\na = 1\n");
    EXPECT_EQ(parsed.result, 2);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"one", L"a", L"1"}));
}

TEST(IniParserPairs, EqualsSignWinsOverColon)
{
    ExpectPairs({
        {"a: b", L"a", L"b"},
        {"a:b=c", L"a:b", L"c"},
        {"a=b:c", L"a", L"b:c"},
        {"a = b = c", L"a", L"b = c"},
        {"  spaced name  =  spaced value  ", L"spaced name", L"spaced value"},
        {"=value", L"", L"value"},
        {"name=", L"name", L""},
        {"name :", L"name", L""},
    });
}

TEST(IniParserPairs, LineWithoutSeparatorBeforeAnInlineCommentIsBad)
{
    ExpectBadLine({"a b", "just text", "a ;b = c", "a ; b: c"});
}

TEST(IniParserPairs, WhiteSpaceIsAsciiOnly)
{
    ExpectPairs({
        {"\t\v\fname\t=\f value \v\r", L"name", L"value"},
        // 0xA0 and 0x85 end the UTF-8 letters "\u00e0" and "\u00c5": they stay.
        {"city = Vor\xC3\xA0", L"city", L"Vor\u00c3\u00a0"},
        {"\xA0name\xA0 = \x85value\x85", L"\u00a0name\u00a0", L"\u0085value\u0085"},
    });
}

TEST(IniParserContinuation, IndentedLineContinuesThePreviousPair)
{
    const Parsed parsed = Parse("x = 1\n  y = 2\n\tmore ; kept\n\n  after blank\nz = 3\n");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"x", L"1"}, Call{L"", L"x", L"y = 2"},
                                          Call{L"", L"x", L"more ; kept"}, Call{L"", L"x", L"after blank"},
                                          Call{L"", L"z", L"3"}));
}

TEST(IniParserContinuation, IndentedLineLooksLikeAHeaderStillContinues)
{
    const Parsed parsed = Parse("[s]\nx = 1\n  [t]\ny = 2\n");
    EXPECT_THAT(parsed.calls,
                ElementsAre(Call{L"s", L"x", L"1"}, Call{L"s", L"x", L"[t]"}, Call{L"s", L"y", L"2"}));
}

TEST(IniParserContinuation, WithoutAPreviousNameAnIndentedLineIsAPair)
{
    const Parsed parsed = Parse("  a = 1\n[s]\n  y = 2\n");
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"a", L"1"}, Call{L"s", L"y", L"2"}));
}

TEST(IniParserContinuation, BadLineKeepsThePreviousName)
{
    const Parsed parsed = Parse("x = 1\nbad\n  more\n");
    EXPECT_EQ(parsed.result, 2);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"x", L"1"}, Call{L"", L"x", L"more"}));
}

TEST(IniParserByteOrderMark, MarkOnTheFirstLineIsSkipped)
{
    EXPECT_THAT(Parse("\xEF\xBB\xBF[main]\na = 1\n").calls, ElementsAre(Call{L"main", L"a", L"1"}));
    EXPECT_THAT(Parse("\xEF\xBB\xBF" "a = 1\n").calls, ElementsAre(Call{L"", L"a", L"1"}));
    EXPECT_THAT(Parse("\xEF\xBB\xBF; comment\n").calls, IsEmpty());
}

TEST(IniParserByteOrderMark, MarkOnALaterLineIsText)
{
    const Parsed parsed = Parse("a = 1\n\xEF\xBB\xBF" "b = 2\n");
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"a", L"1"}, Call{L"", L"\u00ef\u00bb\u00bf" L"b", L"2"}));
}

TEST(IniParserLineEnds, CarriageReturnLineFeedEndsALine)
{
    const Parsed parsed = Parse("[s]\r\na = 1\r\nb = 2 ; c\r\n\r\nc = 3");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"s", L"a", L"1"}, Call{L"s", L"b", L"2"}, Call{L"s", L"c", L"3"}));
}

TEST(IniParserLineEnds, LoneCarriageReturnDoesNotEndALine)
{
    EXPECT_THAT(Parse("a = 1\rb = 2\n").calls, ElementsAre(Call{L"", L"a", L"1\rb = 2"}));
}

TEST(IniParserLineEnds, ControlZEndsTheFile)
{
    EXPECT_THAT(Parse("a = 1\n\x1A" "b = 2\n").calls, ElementsAre(Call{L"", L"a", L"1"}));
    EXPECT_THAT(Parse("a = 1\x1A tail\nb = 2\n").calls, ElementsAre(Call{L"", L"a", L"1"}));
}

TEST(IniParserLongLines, LineOf199CharactersTakesTwoLineNumbers)
{
    // The line end of a 199-character line does not fit the read: it comes as a line of its own.
    const std::string value(197, 'v');
    const Parsed parsed = Parse("k=" + value + "\nbad\n");
    EXPECT_EQ(parsed.result, 3);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"k", std::wstring(197, L'v')}));

    const Parsed shorter = Parse("k=" + value.substr(1) + "\nbad\n");
    EXPECT_EQ(shorter.result, 2);
    EXPECT_THAT(shorter.calls, ElementsAre(Call{L"", L"k", std::wstring(196, L'v')}));
}

TEST(IniParserLongLines, LastLineOf199CharactersIsWhole)
{
    const Parsed parsed = Parse("k=" + std::string(197, 'v'));
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"k", std::wstring(197, L'v')}));
}

TEST(IniParserLongLines, LongCommentIsSkippedAndCountsOneNumberPerRead)
{
    // 500 characters: reads of 199, 199 and 102, so the bad line after it is line 4.
    const std::string comment = ";" + std::string(200, 'c') + " a=b " + std::string(294, 'c');
    const Parsed parsed = Parse(comment + "\nbad\nk = 1\n");
    EXPECT_EQ(parsed.result, 4);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"k", L"1"}));
}

TEST(IniParserLongLines, LongValueIsABadLineAndItsTailIsNoPair)
{
    const std::string url = "url = http://host/" + std::string(250, 'p') + "?a=b&c=d\n";
    const Parsed parsed = Parse("first = 1\n" + url + "next = 2\n");
    EXPECT_EQ(parsed.result, 2);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"first", L"1"}, Call{L"", L"next", L"2"}));
}

TEST(IniParserLongLines, LongLineIsKeptWhenItsContentEndsInTheFirstRead)
{
    const std::string note(300, 'n');
    const Parsed parsed = Parse("[s] ; " + note + "\nk = v ; " + note + "\n");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"s", L"k", L"v"}));
}

TEST(IniParserLongLines, LongLinesWhoseContentGoesOnAreBad)
{
    const std::string more(300, 'm');
    ExpectBadLine({
        ("[" + more + "]").c_str(),                // header closed beyond the first read
        (std::string(250, ' ') + "a = 1").c_str(), // nothing but blanks in the first read
        ("k" + more + " = 1").c_str(),             // separator beyond the first read
    });
    const Parsed continuation = Parse("x = 1\n  " + more + "\ny = 2\n");
    EXPECT_EQ(continuation.result, 2);
    EXPECT_THAT(continuation.calls, ElementsAre(Call{L"", L"x", L"1"}, Call{L"", L"y", L"2"}));
}

TEST(IniParserBadLines, ResultIsTheFirstBadLineAndParsingGoesOn)
{
    const Parsed parsed = Parse("a = 1\nb = 2\nbad\nc = 3\n[s]\nd = 4\n[broken\ne = 5\n");
    EXPECT_EQ(parsed.result, 3);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"a", L"1"}, Call{L"", L"b", L"2"}, Call{L"", L"c", L"3"},
                                          Call{L"s", L"d", L"4"}, Call{L"s", L"e", L"5"}));
}

TEST(IniParserBadLines, RefusedPairMakesItsLineBad)
{
    const Parsed refused = Parse("a = 1\nb = 2\nb = 3\nc = 4\n", L"b");
    EXPECT_EQ(refused.result, 2);
    EXPECT_EQ(refused.calls.size(), 4u);

    const Parsed earlierBad = Parse("bad\nb = 2\n", L"b");
    EXPECT_EQ(earlierBad.result, 1);

    const Parsed continuation = Parse("b = 2\n  more\n", L"b");
    EXPECT_EQ(continuation.result, 1);
    EXPECT_EQ(continuation.calls.size(), 2u);
}

TEST(IniParserNameLimits, NamesUpTo49CharactersAreTaken)
{
    const std::string name49(49, 'n');
    const std::wstring wide49(49, L'n');
    const Parsed parsed = Parse("[" + name49 + "]\n" + name49 + " = 1\n  more\n");
    EXPECT_EQ(parsed.result, 0);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{wide49, wide49, L"1"}, Call{wide49, wide49, L"more"}));
}

TEST(IniParserNameLimits, LongerSectionNameIsABadLineNotCut)
{
    const Parsed parsed = Parse("[s]\n[" + std::string(50, 'n') + "]\na = 1\n");
    EXPECT_EQ(parsed.result, 2);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"s", L"a", L"1"}));
}

TEST(IniParserNameLimits, LongerNameIsABadLineNotCut)
{
    const Parsed parsed = Parse("x = 1\n" + std::string(50, 'n') + " = 2\n  more\ny = 3\n");
    EXPECT_EQ(parsed.result, 2);
    EXPECT_THAT(parsed.calls, ElementsAre(Call{L"", L"x", L"1"}, Call{L"", L"x", L"more"}, Call{L"", L"y", L"3"}));
}
