// Test helpers for INI files: every test writes its file byte for byte and reads it from disk.
#pragma once

#include "KelvraIni.h"

#include <string>
#include <vector>

namespace KelvraTest
{

// The temporary folder, ending in a backslash.
std::wstring TemporaryFolder();

// A file in the temporary folder holding exactly the given bytes, removed again on destruction.
// Every instance uses the same name: one at a time.
class IniTestFile
{
public:
    explicit IniTestFile(const std::string& bytes);
    ~IniTestFile();
    IniTestFile(const IniTestFile&) = delete;
    IniTestFile& operator=(const IniTestFile&) = delete;

    const std::wstring& Path() const { return m_path; }

private:
    std::wstring m_path;
};

INIReader ReadIni(const std::string& bytes);

// One look-up and the value it should give; a null value means that nothing is stored.
struct IniValue
{
    const wchar_t* section;
    const wchar_t* name;
    const wchar_t* value;
};

// Reads the bytes through INIReader and expects firstError as ParseError() and every value as given.
void ExpectIniValues(const std::string& bytes, const std::vector<IniValue>& values, int firstError = 0);

} // namespace KelvraTest
