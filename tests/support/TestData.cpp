#include "support/TestData.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <memory>

namespace KelvraTest
{

std::wstring DataPath(const std::wstring& name)
{
    const wchar_t* folder = _wgetenv(L"KELVRA_TEST_DATA");
    if (folder == nullptr)
    {
        ADD_FAILURE() << "KELVRA_TEST_DATA is not set";
        return name;
    }
    return std::wstring(folder) + L"\\" + name;
}

std::string ReadBinaryFile(const std::wstring& path)
{
    std::unique_ptr<FILE, int (*)(FILE*)> file(_wfopen(path.c_str(), L"rb"), &std::fclose);
    if (!file)
    {
        ADD_FAILURE() << "cannot open a file the test needs";
        return std::string();
    }
    std::string content;
    char buffer[65536];
    size_t got;
    while ((got = std::fread(buffer, 1, sizeof(buffer), file.get())) > 0)
        content.append(buffer, got);
    return content;
}

} // namespace KelvraTest
