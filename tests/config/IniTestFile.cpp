#include "IniTestFile.h"

#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <cerrno>
#include <cstdio>

namespace KelvraTest
{

std::wstring TemporaryFolder()
{
    wchar_t folder[MAX_PATH + 1];
    const DWORD length = ::GetTempPathW(MAX_PATH + 1, folder);
    if (length == 0 || length > MAX_PATH)
    {
        ADD_FAILURE() << "no temporary folder: error " << ::GetLastError();
        return std::wstring();
    }
    return std::wstring(folder, length);
}

IniTestFile::IniTestFile(const std::string& bytes)
    : m_path(TemporaryFolder() + L"kelvra_ini_" + std::to_wstring(::GetCurrentProcessId()) + L".ini")
{
    Kelvra::UniqueFile file(_wfopen(m_path.c_str(), L"wb"));
    if (!file || std::fwrite(bytes.data(), 1, bytes.size(), file.get()) != bytes.size())
        ADD_FAILURE() << "cannot write the test file";
}

IniTestFile::~IniTestFile()
{
    // Fails while anyone still holds the file open.
    if (_wremove(m_path.c_str()) != 0)
        ADD_FAILURE() << "cannot remove the test file: errno " << errno;
}

INIReader ReadIni(const std::string& bytes)
{
    IniTestFile file(bytes);
    return INIReader(file.Path());
}

void ExpectIniValues(const std::string& bytes, const std::vector<IniValue>& values, int firstError)
{
    const INIReader reader = ReadIni(bytes);
    EXPECT_EQ(reader.ParseError(), firstError);
    for (const IniValue& v : values)
        EXPECT_EQ(reader.Get(v.section, v.name, L"(none)"), v.value ? v.value : L"(none)")
            << "[" << v.section << "] " << v.name;
}

} // namespace KelvraTest
