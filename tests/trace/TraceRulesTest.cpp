// The trace's plain rules, driven with fixed inputs: configuration lines, the module filter,
// module and process names, and the text of a line.
#include "trace/TraceConfig.h"
#include "trace/TraceLine.h"
#include "trace/TraceNames.h"

#include <gtest/gtest.h>

#include <cstdarg>
#include <stdexcept>

using KelvraTrace::IsModuleTraced;
using KelvraTrace::ModuleNameFromPath;
using KelvraTrace::ParseTraceConfig;
using KelvraTrace::ProcessNameFromPath;
using KelvraTrace::TraceConfig;

namespace
{

using Names = std::vector<std::wstring>;

std::wstring LineOf(const wchar_t* tag, const wchar_t* file, int line, const wchar_t* message, ...)
{
    va_list args;
    va_start(args, message);
    std::wstring text = KelvraTrace::BuildTraceLine(tag, L"061220260704431", file, line, message, args);
    va_end(args);
    return text;
}

} // namespace

TEST(TraceConfigFile, LevelWordsAndModuleNames)
{
    struct Case
    {
        std::string file;
        int level;
        Names modules;
    };
    const Case cases[] = {
        {"", 0, {}},
        {"info", 1, {}},
        {"inf", 1, {}},
        {"warn", 2, {}},
        {"wrn", 2, {}},
        {"warning", 2, {}},
        {"error", 3, {}},
        {"err", 3, {}},
        {"warn\ninfo\n", 2, {}}, // the highest level wins, in any order
        {"info\nerror\nwarn", 3, {}},
        {"warn\r\ninfo\r\n", 2, {}},           // CR LF lines read like LF lines
        {"INFO\nInfo", 0, {L"info", L"info"}}, // level words are case-sensitive
        {"info ", 0, {L"info "}},              // no trimming
        {" info", 0, {L" info"}},
        {"\xEF\xBB\xBFinfo\n", 0, {L"\u00ef\u00bb\u00bfinfo"}}, // a byte-order mark is part of the line
        {"Sample\ninfo\n", 1, {L"sample"}},
        {"info\n\n", 1, {L""}}, // an empty line is a module name
        {"info\n", 1, {}},      // a final line feed makes no empty line
        {"\n", 0, {L""}},
        {"Sample.Net\nSAMPLE.NET\n", 0, {L"sample.net", L"sample.net"}}, // duplicates kept
        {"a\rb\n", 0, {L"a\rb"}},                                        // a carriage return elsewhere stays
        {"info\r", 0, {L"info\r"}},                                      // ...also at the very end
        {"Caf\xC9\n", 0, {L"caf\u00c9"}},    // one byte, one character; only A-Z are lowered
        {std::string("inf\0o\n", 6), 1, {}}, // a line ends at a NUL byte, as a C string reader sees it
    };
    for (const Case& c : cases)
    {
        const TraceConfig config = ParseTraceConfig(c.file);
        EXPECT_EQ(config.level, c.level) << "[" << c.file << "]";
        EXPECT_EQ(config.modules, c.modules) << "[" << c.file << "]";
    }
}

TEST(TraceModuleFilter, NoListOrAnEmptyListLetsEveryModuleThrough)
{
    const Names empty;
    EXPECT_TRUE(IsModuleTraced(nullptr, L"anything"));
    EXPECT_TRUE(IsModuleTraced(&empty, L"anything"));
    EXPECT_TRUE(IsModuleTraced(&empty, L""));
}

TEST(TraceModuleFilter, ListedNamesOnlyIgnoringAsciiCase)
{
    const Names listed = {L"sample", L"sample.net"};
    EXPECT_TRUE(IsModuleTraced(&listed, L"Sample"));
    EXPECT_TRUE(IsModuleTraced(&listed, L"SAMPLE"));
    EXPECT_TRUE(IsModuleTraced(&listed, L"Sample.Net"));
    EXPECT_FALSE(IsModuleTraced(&listed, L"Sample2"));
    EXPECT_FALSE(IsModuleTraced(&listed, L"sampl"));
    EXPECT_FALSE(IsModuleTraced(&listed, L"sample "));
    EXPECT_FALSE(IsModuleTraced(&listed, L""));

    const Names withEmpty = {L""};
    EXPECT_TRUE(IsModuleTraced(&withEmpty, L""));
    EXPECT_FALSE(IsModuleTraced(&withEmpty, L"host"));

    const Names accented = {L"caf\u00c9"};
    EXPECT_TRUE(IsModuleTraced(&accented, L"CAF\u00c9"));
    EXPECT_FALSE(IsModuleTraced(&accented, L"caf\u00e9")); // only A-Z fold
}

TEST(TraceModuleName, FileNameWithoutDirectoryAndLastExtension)
{
    struct Case
    {
        std::wstring path;
        std::wstring name;
    };
    const Case cases[] = {
        {L"c:\\bin\\Sample.Net.dll", L"Sample.Net"},
        {L"Z:/work/build/SAMPLE.DLL", L"SAMPLE"},
        {L"c:\\dir.with.dots\\host", L"host"},
        {L"c:\\bin\\.hidden", L""},
        {L"c:\\bin\\name.", L"name"},
        {L"c:name.exe", L"name"},
        {L"name.exe", L"name"},
        {L"c:\\bin\\", L""},
        {L"", L""},
        {L"\\\\server\\share\\Tool.exe", L"Tool"},
        {L"c:\\" + std::wstring(255, L'm') + L".dll", std::wstring(255, L'm')},
        {L"c:\\" + std::wstring(256, L'm') + L".dll", L""}, // longer than the name buffer
    };
    for (const Case& c : cases)
        EXPECT_EQ(ModuleNameFromPath(c.path), c.name) << c.path.size();
}

TEST(TraceProcessName, FileNameWithoutItsLastExtension)
{
    EXPECT_EQ(ProcessNameFromPath(L"c:\\bin\\Host.exe"), L"Host");
    EXPECT_EQ(ProcessNameFromPath(L"c:\\bin\\Host.Tool.exe"), L"Host.Tool");
    EXPECT_EQ(ProcessNameFromPath(L"c:\\dir.x\\Host."), L"Host");
    EXPECT_EQ(ProcessNameFromPath(L"Host.exe"), L"Host");
}

TEST(TraceProcessName, FailuresNameWhatIsMissing)
{
    struct Case
    {
        std::wstring path;
        const char* message;
    };
    const Case cases[] = {
        {L"", "Failed to find process file name"},
        {L"c:\\dir.x\\Host", "Failed to find the dot extension in the process file name"},
        {L"c:\\bin\\.exe", "Failed to find the process name"},
    };
    for (const Case& c : cases)
    {
        try
        {
            ProcessNameFromPath(c.path);
            ADD_FAILURE() << "no exception for " << c.message;
        }
        catch (const std::runtime_error& error)
        {
            EXPECT_STREQ(error.what(), c.message);
        }
    }
}

TEST(TraceLineText, TagStampFileLineThenTheFormattedMessage)
{
    EXPECT_EQ(LineOf(L"[TRC]", L"Client.cpp", 42, L"Creating Http session"),
              L"[TRC][061220260704431][Client.cpp:42] Creating Http session\n");
    EXPECT_EQ(LineOf(L"[ERR]", L"Client.cpp", 7, L"%s failed with %d (%hs)", L"WinHttpOpen", 12029, "narrow"),
              L"[ERR][061220260704431][Client.cpp:7] WinHttpOpen failed with 12029 (narrow)\n");
    EXPECT_EQ(LineOf(nullptr, nullptr, -1, nullptr), L"[061220260704431][:-1] \n");
}

TEST(TraceLineText, CharactersTheLocaleCannotWriteBecomeQuestionMarks)
{
    EXPECT_EQ(KelvraTrace::ToLogText(L"plain ascii\n"), "plain ascii\n");
    // The "C" locale writes U+0080..U+00FF as single bytes and nothing above.
    EXPECT_EQ(KelvraTrace::ToLogText(L"caf\u00e9 \u4e2d\u6587 \u20ac end"), "caf\xe9 ?? ? end");
}
