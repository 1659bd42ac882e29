// Names the trace works out of module file paths: the module filter's names and the process
// name of log sessions.
#pragma once

#include <windows.h>

#include <string>

namespace KelvraTrace
{

// The file name without directory and without its last extension, case kept: the text after the
// last '\\' or '/' (or after a leading "X:" when there is none), up to its last '.'. Names of
// 256 characters or more give "".
std::wstring ModuleNameFromPath(const std::wstring& path);

// Process name of an executable's path: its file name without the last extension, case kept
// ("c:\\bin\\Host.Tool.exe" -> "Host.Tool"). Throws std::runtime_error "Failed to find process
// file name" (no file name), "Failed to find the dot extension in the process file name" (no
// '.') or "Failed to find the process name" (nothing before the last '.').
std::wstring ProcessNameFromPath(const std::wstring& path);

// Full path of a loaded module's file, however long (null: the process's executable); "" when
// the platform cannot tell.
std::wstring ModuleFilePath(HMODULE module);

} // namespace KelvraTrace
