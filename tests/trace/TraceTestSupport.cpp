#include "TraceTestSupport.h"

#include "support/TestData.h"

#include <process.h>
#include <windows.h>

#include <algorithm>
#include <fstream>
#include <regex>

namespace KelvraTraceTest
{

const std::filesystem::path kMarker = L"c:\\keltrace";

void WriteMarkerFile(const std::wstring& fileName, const std::string& bytes)
{
    EXPECT_TRUE(std::ofstream(kMarker / fileName, std::ios::binary) << bytes);
}

std::string ReadMarkerFile(const std::wstring& fileName)
{
    return KelvraTest::ReadBinaryFile((kMarker / fileName).wstring());
}

Lines TaggedMessages(const std::string& lines)
{
    static const std::regex pattern(R"(\[(TRC|INF|ERR)\]\[\d{15,17}\]\[[^\]:]*:-?\d+\] (.*))");
    Lines messages;
    for (size_t start = 0, end; start < lines.size(); start = end + 2)
    {
        end = std::min(lines.find("\r\n", start), lines.size());
        const std::string line = lines.substr(start, end - start);
        std::smatch parts;
        if (std::regex_match(line, parts, pattern))
            messages.push_back(parts[1].str() + " " + parts[2].str());
        else
            ADD_FAILURE() << "not a trace line: [" << line << "]";
    }
    return messages;
}

Lines SessionLines(const std::string& file, const std::string& process)
{
    const std::string banner = "\r\n\r\n*****     NEW LOG SESSION [" + process + "]     *****\r\n\r\n";
    EXPECT_EQ(file.substr(0, banner.size()), banner);
    return TaggedMessages(file.substr(std::min(banner.size(), file.size())));
}

std::filesystem::path BesideTestProgram(const std::wstring& fileName)
{
    wchar_t path[MAX_PATH];
    const DWORD length = ::GetModuleFileNameW(nullptr, path, MAX_PATH);
    return std::filesystem::path(std::wstring(path, length)).parent_path() / fileName;
}

void RunChild(const Lines& steps, const std::wstring& program)
{
    std::vector<std::wstring> arguments = {L"\"" + program + L"\""};
    for (const std::string& step : steps)
        arguments.push_back(L"\"" + std::wstring(step.begin(), step.end()) + L"\"");
    std::vector<const wchar_t*> argv;
    for (const std::wstring& argument : arguments)
        argv.push_back(argument.c_str());
    argv.push_back(nullptr);
    EXPECT_EQ(::_wspawnv(_P_WAIT, BesideTestProgram(program).c_str(), argv.data()), 0) << steps[0];
}

} // namespace KelvraTraceTest
