#include "KelvraIni.h"

#include "common/UniqueHandle.h"
#include "config/IniParser.h"
#include "text/AsciiCase.h"

#include <algorithm>
#include <clocale>
#include <cstdlib>
#include <cwchar>
#include <string>

namespace
{

// One allocation per key: the reader builds a key for every pair it stores and every look-up.
std::wstring BuildKey(const wchar_t* section, size_t sectionLength, const wchar_t* name, size_t nameLength)
{
    std::wstring key;
    key.reserve(sectionLength + 1 + nameLength);
    key.append(section, sectionLength).append(1, L'.').append(name, nameLength);
    Kelvra::LowerAscii(key);
    return key;
}

// Stored values never begin with white space, so a number has to begin with its sign or
// digit. Checked here because wcstol would also skip U+00A0, which the parser keeps as text.
bool StartsInteger(const wchar_t* text)
{
    return (text[0] >= L'0' && text[0] <= L'9') || text[0] == L'+' || text[0] == L'-';
}

// Numbers are read in the "C" locale, with '.' as the point whatever locale the host sets.
_locale_t ClassicLocale()
{
    static const Kelvra::UniqueCrtLocale locale(_create_locale(LC_NUMERIC, "C"));
    return locale.get();
}

// The characters of decimal notation. Only these reach the runtime, which would also read
// infinity, NaN, hexadecimal numbers and a 'd' exponent, and skip leading white space.
const wchar_t kDecimalCharacters[] = L"0123456789.eE+-";

} // namespace

INIReader::INIReader(const std::wstring& fileName) : m_values(), m_error(0)
{
    // Text mode without an encoding: the runtime hands over each byte as one character.
    Kelvra::UniqueFile file(_wfopen(fileName.c_str(), L"r"));
    if (!file)
    {
        m_error = -1;
        return;
    }
    m_error = Kelvra::ParseIniStream(file.get(), &ValueHandler, this);
}

INIReader::INIReader(const INIReader& other) = default;

INIReader& INIReader::operator=(const INIReader& other) = default;

INIReader::~INIReader() = default;

int INIReader::ParseError() const
{
    return m_error;
}

std::wstring INIReader::Get(std::wstring section, std::wstring name, std::wstring defaultValue) const
{
    const auto found = m_values.find(MakeKey(std::move(section), std::move(name)));
    return found == m_values.end() ? defaultValue : found->second;
}

int INIReader::GetInteger(std::wstring section, std::wstring name, int defaultValue) const
{
    const std::wstring text = Get(std::move(section), std::move(name), std::wstring());
    if (!StartsInteger(text.c_str()))
        return defaultValue;
    wchar_t* end = nullptr;
    // long is 32 bits on Windows: wcstol saturates at the int range.
    const long value = std::wcstol(text.c_str(), &end, 0);
    return end == text.c_str() ? defaultValue : static_cast<int>(value);
}

double INIReader::GetReal(std::wstring section, std::wstring name, double defaultValue) const
{
    const std::wstring text = Get(std::move(section), std::move(name), std::wstring());
    const std::string number(
        text.begin(), text.begin() + std::min(text.find_first_not_of(kDecimalCharacters), text.size()));
    char* end = nullptr;
    // A number beyond the double range reads as +-HUGE_VAL, one too small for it as 0.
    const double value = _strtod_l(number.c_str(), &end, ClassicLocale());
    return end == number.c_str() ? defaultValue : value;
}

bool INIReader::GetBoolean(std::wstring section, std::wstring name, bool defaultValue) const
{
    std::wstring text = Get(std::move(section), std::move(name), std::wstring());
    Kelvra::LowerAscii(text);
    if (text == L"true" || text == L"yes" || text == L"on" || text == L"1")
        return true;
    if (text == L"false" || text == L"no" || text == L"off" || text == L"0")
        return false;
    return defaultValue;
}

std::wstring INIReader::MakeKey(std::wstring section, std::wstring name)
{
    return BuildKey(section.data(), section.size(), name.data(), name.size());
}

int INIReader::ValueHandler(void* user, const wchar_t* section, const wchar_t* name, const wchar_t* value)
{
    if (value[0] == L'\0')
        return 1;
    INIReader* reader = static_cast<INIReader*>(user);
    // Straight to BuildKey: MakeKey would first copy both texts into strings of their own.
    reader->m_values.try_emplace(BuildKey(section, std::wcslen(section), name, std::wcslen(name)), value);
    return 1;
}
