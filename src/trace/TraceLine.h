// The text of one trace line and the bytes that reach the log file.
#pragma once

#include <cstdarg>
#include <string>

namespace KelvraTrace
{

// "<tag>[<stamp>][<file>:<line>] <message>\n", the message formatted from args with Microsoft
// rules (%s takes a wide string). Null texts count as empty.
std::wstring BuildTraceLine(const wchar_t* tag, const std::wstring& stamp, const wchar_t* file, int line,
                            const wchar_t* message, va_list args);

// The 8-bit text of a log file: ASCII as it is, other characters through the C runtime's
// current locale (wctomb; the "C" locale keeps U+0080..U+00FF as single bytes), '?' for any
// character the locale cannot write, so that a line is never cut short.
std::string ToLogText(const std::wstring& text);

} // namespace KelvraTrace
