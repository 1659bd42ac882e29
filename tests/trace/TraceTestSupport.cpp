#include "TraceTestSupport.h"

#include "common/UniqueHandle.h"
#include "support/TestData.h"

#include <algorithm>
#include <atomic>
#include <fstream>
#include <regex>

namespace KelvraTraceTest
{

namespace
{

Lines SplitAtCrLf(const std::string& text)
{
    Lines lines;
    for (size_t start = 0, end; start < text.size(); start = end + 2)
    {
        end = std::min(text.find("\r\n", start), text.size());
        lines.push_back(text.substr(start, end - start));
    }
    return lines;
}

// The debugger's share of a debugged run: waits on the thread that started the process, as only
// that thread may.
void DebugUntilExit(HANDLE process, Lines& debugStrings)
{
    for (;;)
    {
        DEBUG_EVENT event;
        if (!::WaitForDebugEvent(&event, 60000))
        {
            ADD_FAILURE() << "no debug event from the child, error " << ::GetLastError();
            return;
        }
        DWORD continueStatus = DBG_CONTINUE;
        if (event.dwDebugEventCode == CREATE_PROCESS_DEBUG_EVENT)
            ::CloseHandle(event.u.CreateProcessInfo.hFile);
        else if (event.dwDebugEventCode == LOAD_DLL_DEBUG_EVENT)
            ::CloseHandle(event.u.LoadDll.hFile);
        // The loader's breakpoint is ours to pass; any other exception (C++ ones included) is the
        // child's to handle.
        else if (event.dwDebugEventCode == EXCEPTION_DEBUG_EVENT &&
                 event.u.Exception.ExceptionRecord.ExceptionCode != EXCEPTION_BREAKPOINT)
            continueStatus = DBG_EXCEPTION_NOT_HANDLED;
        else if (event.dwDebugEventCode == OUTPUT_DEBUG_STRING_EVENT)
        {
            // A debugger that waits with WaitForDebugEvent gets OutputDebugStringW text as narrow
            // characters, the terminator counted.
            std::string text(event.u.DebugString.nDebugStringLength, '\0');
            ::ReadProcessMemory(process, event.u.DebugString.lpDebugStringData, &text[0], text.size(),
                                nullptr);
            debugStrings.push_back(text.c_str());
        }
        ::ContinueDebugEvent(event.dwProcessId, event.dwThreadId, continueStatus);
        if (event.dwDebugEventCode == EXIT_PROCESS_DEBUG_EVENT)
            return;
    }
}

} // namespace

const std::filesystem::path kMarker = L"c:\\keltrace";

void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes)
{
    std::ofstream file(kMarker / fileName, std::ios::binary);
    EXPECT_TRUE(file << bytes);
}

std::string ReadMarkerFile(const std::wstring& fileName)
{
    return KelvraTest::ReadBinaryFile((kMarker / fileName).wstring());
}

std::vector<std::wstring> MarkerFiles()
{
    std::vector<std::wstring> names;
    for (const std::filesystem::directory_entry& entry : std::filesystem::directory_iterator(kMarker))
        names.push_back(entry.path().filename().wstring());
    std::sort(names.begin(), names.end());
    return names;
}

Lines TaggedMessages(const std::string& lines)
{
    static const std::regex pattern(R"(\[(TRC|INF|ERR)\]\[\d{15,17}\]\[[^\]:]+:\d+\] (.*))");
    Lines messages;
    for (const std::string& line : SplitAtCrLf(lines))
    {
        std::smatch parts;
        if (std::regex_match(line, parts, pattern))
            messages.push_back(parts[1].str() + " " + parts[2].str());
        else
            ADD_FAILURE() << "not a trace line: [" << line << "]";
    }
    return messages;
}

Lines SessionLines(const std::string& file)
{
    const std::string banner = "\r\n\r\n*****     NEW LOG SESSION [TraceChild]     *****\r\n\r\n";
    EXPECT_EQ(file.substr(0, banner.size()), banner);
    return TaggedMessages(file.substr(std::min(banner.size(), file.size())));
}

std::filesystem::path BesideTestProgram(const std::wstring& fileName)
{
    wchar_t path[MAX_PATH];
    const DWORD length = ::GetModuleFileNameW(nullptr, path, MAX_PATH);
    return std::filesystem::path(std::wstring(path, length)).parent_path() / fileName;
}

ChildResult RunChild(const Lines& steps, bool debugged, const std::wstring& program)
{
    // A report file for each run: the holder of a shared log runs beside other children.
    static std::atomic<int> runs(0);
    const std::wstring report = KelvraTest::DataPath(L"trace_child." + std::to_wstring(++runs) + L".txt");
    const std::wstring application = BesideTestProgram(program).wstring();
    std::wstring commandLine = L"\"" + application + L"\" \"out:" + report + L"\"";
    for (const std::string& step : steps)
        commandLine += L" \"" + std::wstring(step.begin(), step.end()) + L"\"";

    ChildResult result;
    STARTUPINFOW startup = {};
    startup.cb = sizeof(startup);
    PROCESS_INFORMATION started = {};
    if (!::CreateProcessW(application.c_str(), &commandLine[0], nullptr, nullptr, FALSE,
                          debugged ? DEBUG_ONLY_THIS_PROCESS : 0, nullptr, nullptr, &startup, &started))
    {
        ADD_FAILURE() << "CreateProcessW error " << ::GetLastError();
        return result;
    }
    const Kelvra::UniqueProcess process(started.hProcess);
    const Kelvra::UniqueThread thread(started.hThread);
    result.processId = started.dwProcessId;
    if (debugged)
        DebugUntilExit(process.get(), result.debugStrings);
    if (::WaitForSingleObject(process.get(), 60000) != WAIT_OBJECT_0)
        ::TerminateProcess(process.get(), 99);
    DWORD exitCode = STILL_ACTIVE;
    ::GetExitCodeProcess(process.get(), &exitCode);
    const std::string text = KelvraTest::ReadBinaryFile(report);
    ::DeleteFileW(report.c_str());
    EXPECT_EQ(exitCode, 0u) << text;
    result.output = SplitAtCrLf(text);
    return result;
}

} // namespace KelvraTraceTest
