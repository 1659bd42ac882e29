#include "KelvraIni.h"

#include "common/UniqueHandle.h"
#include "config/IniParser.h"
#include "text/AsciiCase.h"

#include <charconv>
#include <cmath>
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

bool IsDigit(wchar_t c)
{
    return c >= L'0' && c <= L'9';
}

// The characters besides digits that a decimal number can hold.
bool IsNumberSign(wchar_t c)
{
    return c == L'.' || c == L'e' || c == L'E' || c == L'+' || c == L'-';
}

// Stored values never begin with white space, so a number has to begin with its sign or
// digit. Checked here because wcstol would also skip U+00A0, which the parser keeps as text.
bool StartsInteger(const wchar_t* text)
{
    return IsDigit(text[0]) || text[0] == L'+' || text[0] == L'-';
}

// For a decimal number std::from_chars found outside the double range: whether it is too
// large rather than too small. Out of range means at least 10^308 or below 10^-307, so the
// sign of the rough decimal exponent decides.
bool IsTooLarge(const char* first, const char* last)
{
    long magnitude = 0;
    bool significant = false;
    bool fraction = false;
    const char* p = first;
    for (; p != last && *p != 'e' && *p != 'E'; ++p)
    {
        if (*p == '.')
            fraction = true;
        else if (!fraction && (significant || *p != '0'))
        {
            significant = true;
            ++magnitude;
        }
        else if (fraction && !significant)
        {
            --magnitude;
            significant = *p != '0';
        }
    }
    long exponent = 0;
    if (p != last)
    {
        ++p;
        const bool negative = *p == '-';
        if (*p == '+' || *p == '-')
            ++p;
        for (; p != last && exponent < 100000; ++p)
            exponent = exponent * 10 + (*p - '0');
        if (negative)
            exponent = -exponent;
    }
    return magnitude + exponent > 0;
}

// Reads the decimal number that begins text: a sign, digits with an optional point, an
// optional exponent; the point is '.' whatever the locale. Infinity, NaN and hexadecimal
// forms are not numbers here ("0x1p3" reads as 0). False when no number begins the text.
bool ReadDecimal(const std::wstring& text, double& result)
{
    size_t i = 0;
    const bool negative = !text.empty() && text[0] == L'-';
    if (!text.empty() && (text[0] == L'-' || text[0] == L'+'))
        ++i;
    const bool startsWithDigit =
        i < text.size() && (IsDigit(text[i]) || (text[i] == L'.' && i + 1 < text.size() && IsDigit(text[i + 1])));
    if (!startsWithDigit)
        return false;
    // A narrow copy of the characters a number can hold; from_chars finds where it ends.
    std::string number;
    for (; i < text.size() && (IsDigit(text[i]) || IsNumberSign(text[i])); ++i)
        number += static_cast<char>(text[i]);
    double value = 0.0;
    const std::from_chars_result read = std::from_chars(number.data(), number.data() + number.size(), value);
    if (read.ec == std::errc::result_out_of_range)
        value = IsTooLarge(number.data(), read.ptr) ? HUGE_VAL : 0.0;
    else if (read.ec != std::errc())
        return false;
    result = negative ? -value : value;
    return true;
}

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
    double value = 0.0;
    return ReadDecimal(Get(std::move(section), std::move(name), std::wstring()), value) ? value : defaultValue;
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
