#include "KelvraStrings.h"
#include "text/AsciiCase.h"
#include "text/FormatArguments.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <stdexcept>

namespace KelvraStrings
{

namespace
{

bool IsAsciiSpace(wchar_t c)
{
    return c == L' ' || (c >= L'\t' && c <= L'\r');
}

int HexDigitValue(wchar_t c)
{
    if (c >= L'0' && c <= L'9')
        return c - L'0';
    if (c >= L'a' && c <= L'f')
        return c - L'a' + 10;
    if (c >= L'A' && c <= L'F')
        return c - L'A' + 10;
    return -1;
}

// The runtime's counting and bounded formatters, which follow Microsoft rules whatever the
// compiler's printf mode.
template <typename Char>
struct Formatter;

template <>
struct Formatter<wchar_t>
{
    static int Measure(const wchar_t* format, va_list args) { return _vscwprintf(format, args); }
    static int Print(wchar_t* buffer, size_t capacity, const wchar_t* format, va_list args)
    {
        return vswprintf_s(buffer, capacity, format, args);
    }
};

template <>
struct Formatter<char>
{
    static int Measure(const char* format, va_list args) { return _vscprintf(format, args); }
    static int Print(char* buffer, size_t capacity, const char* format, va_list args)
    {
        return vsprintf_s(buffer, capacity, format, args);
    }
};

// Measures, then formats into a string of exactly that size. Each pass reads its own copy of the
// argument list.
template <typename Char>
bool FormatWith(std::basic_string<Char>& out, const Char* format, va_list args)
{
    out.clear();
    if (format == nullptr)
        return false;
    va_list pass;
    va_copy(pass, args);
    const int count = Formatter<Char>::Measure(format, pass);
    va_end(pass);
    if (count <= 0)
        return count == 0;
    out.resize(static_cast<size_t>(count));
    // The buffer of a std::basic_string always has room for the terminator after size() characters.
    va_copy(pass, args);
    const int written = Formatter<Char>::Print(&out[0], out.size() + 1, format, pass);
    va_end(pass);
    if (written <= 0)
    {
        out.clear();
        return false;
    }
    out.resize(std::char_traits<Char>::length(out.c_str()));
    return true;
}

} // namespace

bool FormatArguments(std::wstring& out, const wchar_t* format, va_list args)
{
    return FormatWith(out, format, args);
}

bool FormatArguments(std::string& out, const char* format, va_list args)
{
    return FormatWith(out, format, args);
}

Strings& Strings::operator=(const Strings&)
{
    return *this;
}

std::wstring Strings::Format(const wchar_t* format, ...)
{
    va_list args;
    va_start(args, format);
    std::wstring result;
    FormatArguments(result, format, args);
    va_end(args);
    return result;
}

std::string Strings::Format(const char* format, ...)
{
    va_list args;
    va_start(args, format);
    std::string result;
    FormatArguments(result, format, args);
    va_end(args);
    return result;
}

std::wstring Strings::ToString(int value)
{
    // Built by hand rather than through a stream so that a host's global locale cannot add
    // digit grouping.
    wchar_t digits[16];
    wchar_t* end = digits + sizeof(digits) / sizeof(digits[0]);
    wchar_t* first = end;
    // Work in unsigned arithmetic so that INT_MIN has a magnitude.
    unsigned int magnitude = value < 0 ? 0u - static_cast<unsigned int>(value) : static_cast<unsigned int>(value);
    do
    {
        *--first = static_cast<wchar_t>(L'0' + magnitude % 10);
        magnitude /= 10;
    } while (magnitude != 0);
    if (value < 0)
        *--first = L'-';
    return std::wstring(first, end);
}

std::wstring Strings::ToString(const std::string& text)
{
    const size_t length = std::strlen(text.c_str());
    std::wstring result(length, L'\0');
    for (size_t i = 0; i < length; ++i)
        result[i] = static_cast<wchar_t>(static_cast<unsigned char>(text[i]));
    return result;
}

std::wstring Strings::ToLower(std::wstring& text)
{
    Kelvra::LowerAscii(text);
    return text;
}

std::wstring Strings::Padd(int value, int width)
{
    std::wstring text = ToString(value);
    if (width > 0 && text.size() < static_cast<size_t>(width))
        text.insert(0, static_cast<size_t>(width) - text.size(), L'0');
    return text;
}

std::wstring& Strings::TrimLeft(std::wstring& text)
{
    size_t first = 0;
    while (first < text.size() && IsAsciiSpace(text[first]))
        ++first;
    text.erase(0, first);
    return text;
}

int Strings::HexToInt(const wchar_t* text, unsigned long* output)
{
    const int success = 1, tooLong = 2, notHex = 4;
    const size_t maxDigits = 8;
    if (text == nullptr)
        return success;
    // Never look further than one character past the longest accepted text.
    const size_t length = wcsnlen(text, maxDigits + 1);
    if (length == 0)
        return success;
    if (length > maxDigits)
        return tooLong;
    unsigned long value = 0;
    unsigned long weight = 1;
    int result = success;
    for (size_t i = length; i-- > 0;)
    {
        const int digit = HexDigitValue(text[i]);
        if (digit < 0)
        {
            result = notHex;
            break;
        }
        value += static_cast<unsigned long>(digit) * weight;
        weight <<= 4;
    }
    if (output != nullptr)
        *output = value;
    return result;
}

std::vector<std::string> Strings::Split(const std::string& text, const char* delimiter)
{
    if (delimiter == nullptr || *delimiter == '\0')
        throw std::out_of_range("Strings::Split: empty delimiter");
    std::vector<std::string> tokens;
    size_t start = 0;
    for (;;)
    {
        const size_t match = text.find(delimiter, start);
        if (match == std::string::npos)
            break;
        tokens.emplace_back(text, start, match - start);
        start = match + 1;
    }
    if (start < text.size())
        tokens.emplace_back(text, start, std::string::npos);
    return tokens;
}

int Strings::ToInt(const std::string& text)
{
    // strtol reads what atoi reads (blanks, sign, decimal digits) but defines the overflow:
    // long is 32 bits on Windows, so out-of-range text clamps to INT_MIN / INT_MAX.
    static_assert(sizeof(long) == sizeof(int), "the clamp relies on a 32-bit long");
    return static_cast<int>(std::strtol(text.c_str(), nullptr, 10));
}

} // namespace KelvraStrings
