// The text of one event-log entry, kept apart from the report so that tests can pin it.
#pragma once

#include <cstdarg>
#include <cstddef>

namespace Kelvra
{

// Characters an entry's message buffer holds, its terminator included: longer messages are cut
// to one less.
constexpr size_t kEventMessageCapacity = 4096;

// Formats the message (Microsoft rules) into message, cut to fit: the work stays within the
// buffer whatever widths the format asks for. False, with an empty message, when format is null
// or the runtime rejects it. Allocates nothing.
bool FormatEventMessage(wchar_t (&message)[kEventMessageCapacity], const wchar_t* format, va_list args);

} // namespace Kelvra
