// The INI line parser on any text (as WideText reads it): the handler never sees a name beyond the
// limits, a line end, or white space at either end; the result is 0 or the number of a line read.
#include "FuzzSupport.h"
#include "config/IniParser.h"

#include <cwchar>

using KelvraFuzz::Check;

namespace
{

// Reads memory as fgetws reads a file.
class MemoryLineReader : public Kelvra::IniLineReader
{
public:
    explicit MemoryLineReader(std::wstring text) : m_text(std::move(text)) {}

    bool ReadLine(wchar_t* buffer, int size) override
    {
        if (m_at == m_text.size())
            return false;
        int count = 0;
        while (count < size - 1 && m_at < m_text.size() && (count == 0 || buffer[count - 1] != L'\n'))
            buffer[count++] = m_text[m_at++];
        buffer[count] = L'\0';
        ++reads;
        return true;
    }

    std::wint_t Peek() override { return m_at < m_text.size() ? m_text[m_at] : WEOF; }

    int reads = 0;

private:
    std::wstring m_text;
    size_t m_at = 0;
};

bool TrimmedLine(const wchar_t* text, size_t limit)
{
    const size_t length = std::wcslen(text);
    const auto space = [](wchar_t c) { return c == L' ' || (c >= L'\t' && c <= L'\r'); };
    return length <= limit && std::wcschr(text, L'\n') == nullptr &&
           (length == 0 || (!space(text[0]) && !space(text[length - 1])));
}

// Refuses values that begin with '!', so that failed handler calls are covered too.
int Handler(void*, const wchar_t* section, const wchar_t* name, const wchar_t* value)
{
    Check(std::wcslen(section) <= 49 && std::wcschr(section, L'\n') == nullptr);
    Check(TrimmedLine(name, 49) && TrimmedLine(value, 198));
    return value[0] != L'!';
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size)
{
    MemoryLineReader lines(KelvraFuzz::WideText(data, size));
    const int result = Kelvra::ParseIniLines(lines, &Handler, nullptr);
    Check(result >= 0 && result <= lines.reads);
    return 0;
}
