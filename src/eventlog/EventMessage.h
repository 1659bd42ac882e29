// The text of one event-log entry, kept apart from the report so that tests can pin it.
#pragma once

#include <cstdarg>
#include <string>

namespace Kelvra
{

// Longest message an entry carries, in characters; longer ones are cut.
constexpr size_t kMaxEventMessageLength = 4095;

// Formats the message (Microsoft rules) and cuts it to kMaxEventMessageLength. False, with an
// empty message, when the format cannot be expanded.
bool FormatEventMessage(std::wstring& message, const wchar_t* format, va_list args);

} // namespace Kelvra
