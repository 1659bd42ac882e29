#include "trace/TraceNames.h"

#include <shlwapi.h>

#include <stdexcept>

namespace KelvraTrace
{

std::wstring ModuleNameFromPath(const std::wstring& path)
{
    // The same split as _wsplitpath_s into a 256-character name buffer.
    const size_t maxName = 255;
    size_t start = 0;
    const size_t separator = path.find_last_of(L"\\/");
    if (separator != std::wstring::npos)
        start = separator + 1;
    else if (path.size() >= 2 && path[1] == L':')
        start = 2;
    std::wstring name = path.substr(start);
    const size_t dot = name.rfind(L'.');
    if (dot != std::wstring::npos)
        name.resize(dot);
    if (name.size() > maxName)
        return std::wstring();
    return name;
}

std::wstring ProcessNameFromPath(const std::wstring& path)
{
    const std::wstring fileName = ::PathFindFileNameW(path.c_str());
    if (fileName.empty())
        throw std::runtime_error("Failed to find process file name");
    const size_t dot = fileName.rfind(L'.');
    if (dot == std::wstring::npos)
        throw std::runtime_error("Failed to find the dot extension in the process file name");
    if (dot == 0)
        throw std::runtime_error("Failed to find the process name");
    return fileName.substr(0, dot);
}

std::wstring ModuleFilePath(HMODULE module)
{
    // Paths fit MAX_PATH almost always; longer ones would come back cut off, so grow until the
    // whole path fits (32767 characters is the longest the platform has).
    wchar_t buffer[MAX_PATH];
    DWORD length = ::GetModuleFileNameW(module, buffer, MAX_PATH);
    if (length < MAX_PATH)
        return std::wstring(buffer, length);
    std::wstring path;
    for (DWORD size = 2 * MAX_PATH; size <= 65536; size *= 2)
    {
        path.resize(size);
        length = ::GetModuleFileNameW(module, &path[0], size);
        if (length < size)
        {
            path.resize(length);
            return path;
        }
    }
    return std::wstring();
}

} // namespace KelvraTrace
