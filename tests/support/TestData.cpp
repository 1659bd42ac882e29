#include "support/TestData.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

namespace KelvraTest
{

std::wstring DataPath(const std::wstring& name)
{
    const wchar_t* folder = _wgetenv(L"KELVRA_TEST_DATA");
    EXPECT_NE(folder, nullptr) << "KELVRA_TEST_DATA is not set";
    return folder != nullptr ? std::wstring(folder) + L"\\" + name : name;
}

std::string ReadBinaryFile(const std::wstring& path)
{
    std::ifstream file(std::filesystem::path(path), std::ios::binary);
    EXPECT_TRUE(file.is_open()) << "cannot open a file the test needs";
    return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

} // namespace KelvraTest
