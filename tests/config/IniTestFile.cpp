#include "IniTestFile.h"

#include "KelvraStrings.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <cerrno>
#include <cstdio>

namespace KelvraTest
{

IniTestFile::IniTestFile(const std::string& bytes)
{
    static int counter = 0;
    wchar_t folder[MAX_PATH + 1];
    const DWORD length = ::GetTempPathW(MAX_PATH + 1, folder);
    if (length == 0 || length > MAX_PATH)
        ADD_FAILURE() << "no temporary folder: error " << ::GetLastError();
    m_path = KelvraStrings::Strings::Format(L"%skelvra_ini_%lu_%d.ini", folder, ::GetCurrentProcessId(), ++counter);
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

} // namespace KelvraTest
