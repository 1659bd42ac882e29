// The trace's plain rules, driven with fixed inputs: configuration lines, the module filter, and
// module and process names.
#include "trace/TraceConfig.h"
#include "trace/TraceNames.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <tuple>

using namespace KelvraTrace;
using Names = std::vector<std::wstring>;

TEST(TraceConfigFile, LevelWordsAndModuleNames)
{
    const std::tuple<std::string, int, Names> cases[] = {
        {"", 0, {}},
        {"info\ninf", 1, {}}, // a word it does not know would be a module name
        {"warn\nwrn\nwarning", 2, {}},
        {"err\r\nerror\r\n", 3, {}},  // a carriage return before a line feed is not part of the line
        {"info\nerror\nwarn", 3, {}}, // the highest level wins, in any order
        {"INFO\ninfo ", 0, {L"info", L"info "}}, // level words are case-sensitive and not trimmed
        {"\xEF\xBB\xBFinfo\n", 0, {L"\u00ef\u00bb\u00bfinfo"}}, // a byte-order mark is part of the line
        {"info\n\n", 1, {L""}}, // an empty line is a module name; a final line feed makes none
        {"Sample.Net\ninfo\nSAMPLE.NET\n", 1, {L"sample.net", L"sample.net"}}, // duplicates kept
        {"a\rb\ninfo\r", 0, {L"a\rb", L"info\r"}}, // a carriage return stays, but before a line feed
        {"Caf\xC9\n", 0, {L"caf\u00c9"}},          // one byte, one character; only A-Z are lowered
        {std::string("inf\0o\n", 6), 1, {}},       // a line ends at a NUL byte, as a C string reader sees it
    };
    for (const auto& [file, level, modules] : cases)
    {
        const TraceConfig config = ParseTraceConfig(file);
        EXPECT_EQ(std::tie(config.level, config.modules), std::tie(level, modules)) << "[" << file << "]";
    }
}

TEST(TraceModuleFilter, EveryModuleWithoutAListElseListedNamesIgnoringAsciiCase)
{
    const Names empty, listed = {L"sample", L"sample.net"}, emptyName = {L""}, accented = {L"caf\u00c9"};
    const std::tuple<const Names*, const wchar_t*, bool> cases[] = {
        {nullptr, L"anything", true},     {&empty, L"", true},
        {&listed, L"SAMPLE", true},       {&listed, L"Sample2", false},
        {&listed, L"sample ", false},     {&emptyName, L"", true},
        {&emptyName, L"host", false},     {&accented, L"CAF\u00c9", true},
        {&accented, L"caf\u00e9", false}, // only A-Z fold
    };
    for (const auto& [list, name, traced] : cases)
        EXPECT_EQ(IsModuleTraced(list, name), traced) << name;
}

TEST(TraceNames, FileNameWithoutDirectoryAndLastExtension)
{
    const std::pair<std::wstring, std::wstring> modules[] = {
        {L"c:\\bin\\Sample.Net.dll", L"Sample.Net"},
        {L"Z:/work/SAMPLE.DLL", L"SAMPLE"},
        {L"c:\\dir.with.dots\\host", L"host"},
        {L"c:\\bin\\.hidden", L""},
        {L"c:name.exe", L"name"},
        {L"c:\\" + std::wstring(255, L'm') + L".dll", std::wstring(255, L'm')},
        {L"c:\\" + std::wstring(256, L'm') + L".dll", L""}, // longer than the name buffer
    };
    for (const auto& [path, name] : modules)
        EXPECT_EQ(ModuleNameFromPath(path), name) << path.size();
    EXPECT_EQ(ProcessNameFromPath(L"c:\\dir.x\\Host.Tool.exe"), L"Host.Tool");
    EXPECT_EQ(ProcessNameFromPath(L"Host."), L"Host");
    EXPECT_THROW(ProcessNameFromPath(L"c:\\bin\\.exe"), std::runtime_error);
}
