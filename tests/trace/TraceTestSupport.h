// What the trace tests share: the marker directory c:\keltrace, log file contents, and
// TraceChild.exe, the host program that runs trace scenarios in a fresh process (the trace state
// lives as long as the process), possibly under a debugger.
#pragma once

#include <gtest/gtest.h>
#include <windows.h>

#include <filesystem>
#include <string>
#include <vector>

namespace KelvraTraceTest
{

using Lines = std::vector<std::string>;

// c:\keltrace, the marker directory, and its files.
extern const std::filesystem::path kMarker;
void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes);
std::string ReadMarkerFile(const std::wstring& fileName);
std::vector<std::wstring> MarkerFiles(); // sorted

// Tests that start with c:\keltrace empty and remove it afterwards.
class MarkerDirectoryTest : public testing::Test
{
protected:
    void SetUp() override
    {
        std::filesystem::remove_all(kMarker);
        ASSERT_TRUE(std::filesystem::create_directory(kMarker));
    }
    void TearDown() override { std::filesystem::remove_all(kMarker); }
};

// "TAG message" of each CR LF terminated trace line; fails the calling test on any other line.
Lines TaggedMessages(const std::string& lines);
// The same for a session's log file, which must start with TraceChild's session banner (exact bytes).
Lines SessionLines(const std::string& file);

// A file in the build's bin folder, beside this test program.
std::filesystem::path BesideTestProgram(const std::wstring& fileName);

struct ChildResult
{
    DWORD processId = 0;
    Lines output;       // the lines the steps reported
    Lines debugStrings; // debugger output (debugged runs only)
};

// Runs TraceChild.exe (or a copy of it) with the given steps (see TraceChild.cpp) until it exits,
// which must be with code 0. A debugged run must stay on one thread: the one that started it.
ChildResult RunChild(const Lines& steps, bool debugged = false,
                     const std::wstring& program = L"TraceChild.exe");

} // namespace KelvraTraceTest
