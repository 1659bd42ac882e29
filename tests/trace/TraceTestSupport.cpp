#include "TraceTestSupport.h"

#include "support/TestData.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <regex>

namespace KelvraTraceTest
{

namespace
{

const wchar_t kMarker[] = L"c:\\keltrace";

std::string Narrow(const std::wstring& text)
{
    std::string result;
    for (const wchar_t c : text)
        result += c < 0x80 ? static_cast<char>(c) : '?';
    return result;
}

std::vector<std::string> SplitLines(const std::string& text)
{
    std::vector<std::string> lines;
    size_t start = 0;
    size_t end;
    while ((end = text.find('\n', start)) != std::string::npos)
    {
        lines.push_back(text.substr(start, end - start));
        start = end + 1;
    }
    if (start < text.size())
        lines.push_back(text.substr(start));
    return lines;
}

} // namespace

std::string Banner(const std::string& processName)
{
    return "\r\n\r\n*****     NEW LOG SESSION [" + processName + "]     *****\r\n\r\n";
}

std::wstring MarkerPath(const std::wstring& fileName)
{
    return std::wstring(kMarker) + L"\\" + fileName;
}

std::vector<std::wstring> MarkerFiles()
{
    std::vector<std::wstring> names;
    WIN32_FIND_DATAW found;
    HANDLE search = ::FindFirstFileW(MarkerPath(L"*").c_str(), &found);
    if (search == INVALID_HANDLE_VALUE)
        return names;
    do
    {
        const std::wstring name = found.cFileName;
        if (name != L"." && name != L"..")
            names.push_back(name);
    } while (::FindNextFileW(search, &found));
    ::FindClose(search);
    std::sort(names.begin(), names.end());
    return names;
}

void RemoveMarkerDirectory()
{
    for (const std::wstring& name : MarkerFiles())
        ASSERT_TRUE(::DeleteFileW(MarkerPath(name).c_str())) << Narrow(name) << " error " << ::GetLastError();
    if (MarkerDirectoryExists())
    {
        ASSERT_TRUE(::RemoveDirectoryW(kMarker)) << "error " << ::GetLastError();
    }
}

void CreateEmptyMarkerDirectory()
{
    RemoveMarkerDirectory();
    ASSERT_TRUE(::CreateDirectoryW(kMarker, nullptr)) << "error " << ::GetLastError();
}

bool MarkerDirectoryExists()
{
    const DWORD attributes = ::GetFileAttributesW(kMarker);
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes)
{
    const Kelvra::UniqueFile file(::_wfopen(MarkerPath(fileName).c_str(), L"wb"));
    ASSERT_TRUE(file) << Narrow(fileName);
    ASSERT_EQ(std::fwrite(bytes.data(), 1, bytes.size(), file.get()), bytes.size());
}

std::string ReadMarkerFile(const std::wstring& fileName)
{
    return KelvraTest::ReadBinaryFile(MarkerPath(fileName));
}

std::vector<TraceLine> ParseTraceLines(const std::string& text)
{
    static const std::regex pattern(R"(\[(TRC|INF|ERR)\]\[(\d{15,17})\]\[([^\]:]+):(\d+)\] (.*)\r)");
    static const std::regex banner(R"(\*{5} {5}NEW LOG SESSION \[[^\]]*\] {5}\*{5}\r)");
    std::vector<TraceLine> lines;
    for (const std::string& line : SplitLines(text))
    {
        if (line == "\r" || std::regex_match(line, banner))
            continue;
        std::smatch parts;
        if (!std::regex_match(line, parts, pattern))
        {
            ADD_FAILURE() << "not a trace line: [" << line << "]";
            continue;
        }
        TraceLine parsed;
        parsed.tag = parts[1];
        parsed.stamp = parts[2];
        parsed.file = parts[3];
        parsed.line = std::stoi(parts[4]);
        parsed.message = parts[5];
        lines.push_back(parsed);
    }
    return lines;
}

std::vector<std::string> TaggedMessages(const std::string& text)
{
    std::vector<std::string> messages;
    for (const TraceLine& line : ParseTraceLines(text))
        messages.push_back(line.tag + " " + line.message);
    return messages;
}

std::wstring BesideTestProgram(const std::wstring& fileName)
{
    wchar_t path[MAX_PATH];
    const DWORD length = ::GetModuleFileNameW(nullptr, path, MAX_PATH);
    std::wstring folder(path, length);
    folder.resize(folder.find_last_of(L'\\') + 1);
    return folder + fileName;
}

ChildCopy::ChildCopy(const std::wstring& fileName) : m_path(BesideTestProgram(fileName))
{
    EXPECT_TRUE(::CopyFileW(BesideTestProgram(L"TraceChild.exe").c_str(), m_path.c_str(), FALSE))
        << "error " << ::GetLastError();
}

ChildCopy::~ChildCopy()
{
    ::DeleteFileW(m_path.c_str());
}

Child::Child(const std::vector<std::string>& steps, bool debugged, const std::wstring& program)
    : m_debugged(debugged)
{
    const std::wstring application = program.empty() ? BesideTestProgram(L"TraceChild.exe") : program;
    std::wstring commandLine = L"\"" + application + L"\"";
    for (const std::string& step : steps)
        commandLine += L" \"" + std::wstring(step.begin(), step.end()) + L"\"";

    SECURITY_ATTRIBUTES inherit = {sizeof(inherit), nullptr, TRUE};
    Kelvra::UniqueFileHandle childOutput;
    HANDLE readEnd = nullptr, writeEnd = nullptr;
    if (!::CreatePipe(&readEnd, &writeEnd, &inherit, 0))
    {
        ADD_FAILURE() << "CreatePipe error " << ::GetLastError();
        return;
    }
    m_output.reset(readEnd);
    childOutput.reset(writeEnd);
    ::SetHandleInformation(readEnd, HANDLE_FLAG_INHERIT, 0);

    STARTUPINFOW startup = {};
    startup.cb = sizeof(startup);
    startup.dwFlags = STARTF_USESTDHANDLES;
    startup.hStdOutput = writeEnd;
    startup.hStdError = writeEnd;
    startup.hStdInput = nullptr;
    PROCESS_INFORMATION started = {};
    const DWORD flags = debugged ? DEBUG_ONLY_THIS_PROCESS : 0;
    if (!::CreateProcessW(application.c_str(), &commandLine[0], nullptr, nullptr, TRUE, flags, nullptr,
                          nullptr, &startup, &started))
    {
        ADD_FAILURE() << "CreateProcessW error " << ::GetLastError();
        return;
    }
    m_process.reset(started.hProcess);
    ::CloseHandle(started.hThread);
    m_processId = started.dwProcessId;
}

ChildResult Child::Finish()
{
    ChildResult result;
    result.processId = m_processId;
    if (!m_process)
        return result;
    if (m_debugged)
        DebugUntilExit(result);
    // The child has exited or will once its output is read; the pipe ends with it.
    std::string output;
    char buffer[4096];
    DWORD got;
    while (::ReadFile(m_output.get(), buffer, sizeof(buffer), &got, nullptr) && got > 0)
        output.append(buffer, got);
    if (::WaitForSingleObject(m_process.get(), 60000) != WAIT_OBJECT_0)
    {
        ADD_FAILURE() << "child process did not end";
        ::TerminateProcess(m_process.get(), 99);
    }
    ::GetExitCodeProcess(m_process.get(), &result.exitCode);
    for (std::string& line : SplitLines(output))
    {
        if (!line.empty() && line.back() == '\r')
            line.pop_back();
        result.output.push_back(line);
    }
    return result;
}

void Child::DebugUntilExit(ChildResult& result)
{
    for (;;)
    {
        DEBUG_EVENT event;
        if (!::WaitForDebugEvent(&event, 60000))
        {
            ADD_FAILURE() << "no debug event from the child, error " << ::GetLastError();
            ::TerminateProcess(m_process.get(), 99);
            return;
        }
        DWORD continueStatus = DBG_CONTINUE;
        switch (event.dwDebugEventCode)
        {
        case CREATE_PROCESS_DEBUG_EVENT:
            if (event.u.CreateProcessInfo.hFile != nullptr)
                ::CloseHandle(event.u.CreateProcessInfo.hFile);
            break;
        case LOAD_DLL_DEBUG_EVENT:
            if (event.u.LoadDll.hFile != nullptr)
                ::CloseHandle(event.u.LoadDll.hFile);
            break;
        case EXCEPTION_DEBUG_EVENT:
            // The loader's breakpoint is ours to pass; anything else (C++ exceptions included) is
            // the child's to handle.
            if (event.u.Exception.ExceptionRecord.ExceptionCode != EXCEPTION_BREAKPOINT)
                continueStatus = DBG_EXCEPTION_NOT_HANDLED;
            break;
        case OUTPUT_DEBUG_STRING_EVENT:
        {
            const OUTPUT_DEBUG_STRING_INFO& info = event.u.DebugString;
            const size_t units = info.nDebugStringLength;
            const size_t unitSize = info.fUnicode ? sizeof(wchar_t) : 1;
            std::string bytes(units * unitSize, '\0');
            SIZE_T got = 0;
            ::ReadProcessMemory(m_process.get(), info.lpDebugStringData, &bytes[0], bytes.size(), &got);
            bytes.resize(got);
            std::string text;
            for (size_t i = 0; i + unitSize <= bytes.size(); i += unitSize)
                text += bytes[i];
            result.debugStrings.push_back(text.substr(0, text.find('\0')));
            break;
        }
        default:
            break;
        }
        const bool exited = event.dwDebugEventCode == EXIT_PROCESS_DEBUG_EVENT;
        ::ContinueDebugEvent(event.dwProcessId, event.dwThreadId, continueStatus);
        if (exited)
            return;
    }
}

ChildResult RunChild(const std::vector<std::string>& steps, bool debugged, const std::wstring& program)
{
    Child child(steps, debugged, program);
    ChildResult result = child.Finish();
    EXPECT_EQ(result.exitCode, 0u);
    return result;
}

SharedEvent::SharedEvent(const std::string& name)
    : m_event(::CreateEventW(nullptr, TRUE, FALSE, std::wstring(name.begin(), name.end()).c_str()))
{
    EXPECT_TRUE(m_event) << "CreateEventW error " << ::GetLastError();
}

bool SharedEvent::Wait(DWORD milliseconds) const
{
    return ::WaitForSingleObject(m_event.get(), milliseconds) == WAIT_OBJECT_0;
}

void SharedEvent::Set() const
{
    ::SetEvent(m_event.get());
}

} // namespace KelvraTraceTest
