// The trace's plain rules, driven with fixed inputs: configuration lines, the module filter,
// module and process names, and the text of a line.
#include "KelvraTrace.h"

#include "trace/TraceConfig.h"
#include "trace/TraceLine.h"
#include "trace/TraceNames.h"

#include <gmock/gmock.h>

#include <stdexcept>
#include <tuple>

using namespace KelvraTrace;
using testing::ThrowsMessage;

using Names = std::vector<std::wstring>;

TEST(TraceConfigFile, LevelWordsAndModuleNames)
{
    const std::tuple<std::string, int, Names> cases[] = {
        {"", 0, {}},
        {"info", 1, {}},
        {"inf", 1, {}},
        {"warn", 2, {}},
        {"wrn", 2, {}},
        {"warning", 2, {}},
        {"error", 3, {}},
        {"err", 3, {}},
        {"info\nerror\nwarn", 3, {}},          // the highest level wins, in any order
        {"warn\r\ninfo\r\n", 2, {}},           // CR LF lines read like LF lines
        {"INFO\nInfo", 0, {L"info", L"info"}}, // level words are case-sensitive
        {"info ", 0, {L"info "}},              // no trimming
        {" info", 0, {L" info"}},
        {"\xEF\xBB\xBFinfo\n", 0, {L"\u00ef\u00bb\u00bfinfo"}}, // a byte-order mark is part of the line
        {"Sample\ninfo\n", 1, {L"sample"}},
        {"info\n\n", 1, {L""}}, // an empty line is a module name
        {"info\n", 1, {}},      // a final line feed makes no empty line
        {"Sample.Net\nSAMPLE.NET\n", 0, {L"sample.net", L"sample.net"}}, // duplicates kept
        {"a\rb\n", 0, {L"a\rb"}},                                        // a carriage return elsewhere stays
        {"info\r", 0, {L"info\r"}},                                      // ...also at the very end
        {"Caf\xC9\n", 0, {L"caf\u00c9"}},    // one byte, one character; only A-Z are lowered
        {std::string("inf\0o\n", 6), 1, {}}, // a line ends at a NUL byte, as a C string reader sees it
    };
    for (const auto& [file, level, modules] : cases)
    {
        const TraceConfig config = ParseTraceConfig(file);
        EXPECT_EQ(config.level, level) << "[" << file << "]";
        EXPECT_EQ(config.modules, modules) << "[" << file << "]";
    }
}

TEST(TraceModuleFilter, EveryModuleWithoutAListElseListedNamesIgnoringAsciiCase)
{
    const Names empty, listed = {L"sample", L"sample.net"}, emptyName = {L""}, accented = {L"caf\u00c9"};
    const std::tuple<const Names*, const wchar_t*, bool> cases[] = {
        {nullptr, L"anything", true},    {&empty, L"", true},
        {&listed, L"SAMPLE", true},      {&listed, L"Sample.Net", true},
        {&listed, L"Sample2", false},    {&listed, L"sampl", false},
        {&listed, L"sample ", false},    {&listed, L"", false},
        {&emptyName, L"", true},         {&emptyName, L"host", false},
        {&accented, L"CAF\u00c9", true}, {&accented, L"caf\u00e9", false}, // only A-Z fold
    };
    for (const auto& [list, name, traced] : cases)
        EXPECT_EQ(IsModuleTraced(list, name), traced) << name;

    // Debug::debugIt applies the rule to the process's list.
    Names processList = {L"sample.net"};
    Debug::_modules = &processList;
    EXPECT_TRUE(Debug::debugIt(L"SAMPLE.NET"));
    EXPECT_FALSE(Debug::debugIt(L"trace_tests"));
    Debug::_modules = nullptr;
}

TEST(TraceModuleName, FileNameWithoutDirectoryAndLastExtension)
{
    const std::pair<std::wstring, std::wstring> cases[] = {
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
    for (const auto& [path, name] : cases)
        EXPECT_EQ(ModuleNameFromPath(path), name) << path.size();
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
    EXPECT_THAT([] { ProcessNameFromPath(L""); },
                ThrowsMessage<std::runtime_error>("Failed to find process file name"));
    EXPECT_THAT(
        [] { ProcessNameFromPath(L"c:\\dir.x\\Host"); },
        ThrowsMessage<std::runtime_error>("Failed to find the dot extension in the process file name"));
    EXPECT_THAT([] { ProcessNameFromPath(L"c:\\bin\\.exe"); },
                ThrowsMessage<std::runtime_error>("Failed to find the process name"));
}

TEST(TraceLineText, CharactersTheLocaleCannotWriteBecomeQuestionMarks)
{
    // The "C" locale writes U+0080..U+00FF as single bytes and nothing above.
    EXPECT_EQ(ToLogText(L"caf\u00e9 \u4e2d\u6587 \u20ac end"), "caf\xe9 ?? ? end");
}
