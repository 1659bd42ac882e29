// Time-stamp text from a broken-down time, kept apart from the clock so that tests can pin it.
#pragma once

#include <windows.h>

#include <string>

namespace KelvraTime
{

enum class StampStyle
{
    Readable, // "04-12-2026 09:05:03.7"
    Compact,  // "041220260905037"
};

// Day, month, hour, minute and second get two digits; year and milliseconds are unpadded.
std::wstring FormatTimeStamp(const SYSTEMTIME& time, StampStyle style);

} // namespace KelvraTime
