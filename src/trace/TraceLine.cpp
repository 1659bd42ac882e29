#include "trace/TraceLine.h"

#include "KelvraStrings.h"

#include "text/FormatArguments.h"

#include <climits>
#include <cstdlib>

namespace KelvraTrace
{

std::wstring BuildTraceLine(const wchar_t* tag, const std::wstring& stamp, const wchar_t* file, int line,
                            const wchar_t* message, va_list args)
{
    std::wstring text = tag != nullptr ? tag : L"";
    text += L'[';
    text += stamp;
    text += L"][";
    text += file != nullptr ? file : L"";
    text += L':';
    text += KelvraStrings::Strings::ToString(line);
    text += L"] ";
    std::wstring formatted;
    KelvraStrings::FormatArguments(formatted, message, args);
    text += formatted;
    text += L'\n';
    return text;
}

std::string ToLogText(const std::wstring& text)
{
    std::string bytes;
    bytes.reserve(text.size());
    for (const wchar_t c : text)
    {
        if (c < 0x80)
        {
            bytes += static_cast<char>(c);
            continue;
        }
        char converted[MB_LEN_MAX];
        const int count = std::wctomb(converted, c);
        if (count > 0)
            bytes.append(converted, static_cast<size_t>(count));
        else
            bytes += '?';
    }
    return bytes;
}

} // namespace KelvraTrace
