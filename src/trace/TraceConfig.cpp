#include "trace/TraceConfig.h"

#include "KelvraStrings.h"

#include <algorithm>

namespace KelvraTrace
{

namespace
{

// Level a configuration line names, or 0 for a module name.
int LevelOfWord(const std::string& line)
{
    if (line == "info" || line == "inf")
        return 1;
    if (line == "warn" || line == "wrn" || line == "warning")
        return 2;
    if (line == "error" || line == "err")
        return 3;
    return 0;
}

void AddLine(std::string line, TraceConfig& config)
{
    // As a C string reader would see it.
    line.resize(std::min(line.size(), line.find('\0')));
    const int level = LevelOfWord(line);
    if (level == 0)
    {
        std::wstring name = KelvraStrings::Strings::ToString(line);
        config.modules.push_back(KelvraStrings::Strings::ToLower(name));
    }
    else if (level > config.level)
    {
        config.level = level;
    }
}

} // namespace

TraceConfig ParseTraceConfig(const std::string& bytes)
{
    TraceConfig config;
    size_t start = 0;
    while (start < bytes.size())
    {
        size_t end = bytes.find('\n', start);
        const bool lastLine = end == std::string::npos;
        if (lastLine)
            end = bytes.size();
        size_t length = end - start;
        if (!lastLine && length > 0 && bytes[end - 1] == '\r')
            --length;
        AddLine(bytes.substr(start, length), config);
        start = end + 1;
    }
    return config;
}

bool IsModuleTraced(const std::vector<std::wstring>* modules, std::wstring name)
{
    if (modules == nullptr || modules->empty())
        return true;
    KelvraStrings::Strings::ToLower(name);
    return std::find(modules->begin(), modules->end(), name) != modules->end();
}

} // namespace KelvraTrace
