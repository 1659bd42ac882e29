// What the trace tests share: the marker directory c:\keltrace and its files, trace lines, and
// TraceChild.exe, the host program that runs trace scenarios in a fresh process.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

namespace KelvraTraceTest
{

using Lines = std::vector<std::string>;

extern const std::filesystem::path kMarker;
void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes);
std::string ReadMarkerFile(const std::wstring& fileName);

// "TAG message" of each CR LF terminated trace line; fails the calling test on any other line.
Lines TaggedMessages(const std::string& lines);
// The same for a session's log file, which must start with the banner of process (exact bytes).
Lines SessionLines(const std::string& file, const std::string& process);

// A file in the build's bin folder, beside this test program.
std::filesystem::path BesideTestProgram(const std::wstring& fileName);
// Runs TraceChild.exe (or a copy of it) with the given steps (see TraceChild.cpp) until it exits,
// which must be with code 0.
void RunChild(const Lines& steps, const std::wstring& program = L"TraceChild.exe");

} // namespace KelvraTraceTest
