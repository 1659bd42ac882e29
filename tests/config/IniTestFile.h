// A file with given bytes in the temporary folder, removed again when the test is done.
#pragma once

#include <string>

namespace KelvraTest
{

class IniTestFile
{
public:
    // Writes the bytes exactly as given (binary mode); fails the calling test if it cannot.
    explicit IniTestFile(const std::string& bytes);
    ~IniTestFile();
    IniTestFile(const IniTestFile&) = delete;
    IniTestFile& operator=(const IniTestFile&) = delete;

    const std::wstring& Path() const { return m_path; }

private:
    std::wstring m_path;
};

} // namespace KelvraTest
