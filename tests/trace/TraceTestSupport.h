// What the trace tests share: the marker directory c:\keltrace, log file contents, and the helper
// processes (TraceChild.exe, possibly under a debugger) that run trace scenarios in a fresh
// process, since the trace state lives as long as the process.
#pragma once

#include "common/UniqueHandle.h"

#include <windows.h>

#include <string>
#include <vector>

namespace KelvraTraceTest
{

// The session banner as the log file holds it (text mode: CR LF).
std::string Banner(const std::string& processName);

// c:\keltrace and its files.
void RemoveMarkerDirectory();
void CreateEmptyMarkerDirectory();
bool MarkerDirectoryExists();
std::wstring MarkerPath(const std::wstring& fileName);
void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes);
std::string ReadMarkerFile(const std::wstring& fileName);
std::vector<std::wstring> MarkerFiles(); // names, sorted

// The trace lines in a log file's text (after its banners), split at CR LF.
struct TraceLine
{
    std::string tag;   // "TRC", "INF", "ERR"
    std::string stamp; // Debug::now() of the line
    std::string file;  // source file name
    int line = 0;      // source line number
    std::string message;
};
// Every CR LF terminated line that is not part of a banner must be a well-formed trace line;
// fails the calling test otherwise.
std::vector<TraceLine> ParseTraceLines(const std::string& text);
// The messages of ParseTraceLines, "TAG message" each ("INF host first").
std::vector<std::string> TaggedMessages(const std::string& text);

// A file beside the running test program (the build's bin folder).
std::wstring BesideTestProgram(const std::wstring& fileName);

// A copy of TraceChild.exe under another file name beside it, removed again when destroyed.
class ChildCopy
{
public:
    explicit ChildCopy(const std::wstring& fileName);
    ~ChildCopy();
    ChildCopy(const ChildCopy&) = delete;
    ChildCopy& operator=(const ChildCopy&) = delete;
    const std::wstring& Path() const { return m_path; }

private:
    std::wstring m_path;
};

struct ChildResult
{
    DWORD processId = 0;
    DWORD exitCode = 0;
    std::vector<std::string> output;       // standard output lines
    std::vector<std::string> debugStrings; // debugger output (only when debugged)
};

// One TraceChild run with the given steps (see TraceChild.cpp). Started at construction, finished
// by Finish (on the same thread: a debugger must wait on the thread that started the process).
class Child
{
public:
    Child(const std::vector<std::string>& steps, bool debugged = false, const std::wstring& program = L"");
    Child(const Child&) = delete;
    Child& operator=(const Child&) = delete;
    DWORD ProcessId() const { return m_processId; }
    ChildResult Finish();

private:
    void DebugUntilExit(ChildResult& result);

    Kelvra::UniqueProcess m_process;
    Kelvra::UniqueFileHandle m_output;
    DWORD m_processId = 0;
    bool m_debugged;
};

// Start, finish, expect exit code 0.
ChildResult RunChild(const std::vector<std::string>& steps, bool debugged = false,
                     const std::wstring& program = L"");

// A named event the test sets and children wait for (or the other way round).
class SharedEvent
{
public:
    explicit SharedEvent(const std::string& name);
    bool Wait(DWORD milliseconds) const;
    void Set() const;

private:
    Kelvra::UniqueEvent m_event;
};

} // namespace KelvraTraceTest
