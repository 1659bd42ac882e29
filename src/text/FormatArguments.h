// printf-style formatting over an argument list, with Microsoft rules (%s in a wide format takes a
// wide string), for functions that format on behalf of their own variadic callers.
#pragma once

#include <cstdarg>
#include <string>

namespace KelvraStrings
{

// Formats into out, with no length limit; the text ends at the first NUL the format produces.
// Returns false, with out empty, when format is null or the runtime rejects it. args is read
// through copies, so the caller may still use it.
bool FormatArguments(std::wstring& out, const wchar_t* format, va_list args);
bool FormatArguments(std::string& out, const char* format, va_list args);

} // namespace KelvraStrings
