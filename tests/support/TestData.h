// Where tests find the files the build generated for them.
#pragma once

#include <string>

namespace KelvraTest
{

// Path of a file in the test data folder (KELVRA_TEST_DATA, set by ctest).
std::wstring DataPath(const std::wstring& name);

// Whole content of a file as bytes; fails the calling test when the file cannot be read.
std::string ReadBinaryFile(const std::wstring& path);

} // namespace KelvraTest
