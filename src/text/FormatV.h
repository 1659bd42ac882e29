// The va_list form of the wide Strings::Format, for library code that forwards its own caller's
// variable arguments (the trace lines).
#pragma once

#include <cstdarg>
#include <string>

namespace KelvraStrings
{

// Microsoft rules (%s takes a wide string), no length limit; "" for a null or rejected format.
// Reads args to its end: the caller va_copy's it first if it needs it again.
std::wstring FormatV(const wchar_t* format, va_list args);

} // namespace KelvraStrings
