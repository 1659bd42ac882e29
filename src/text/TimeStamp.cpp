#include "text/TimeStamp.h"

#include "KelvraStrings.h"

namespace KelvraTime
{

std::wstring FormatTimeStamp(const SYSTEMTIME& time, StampStyle style)
{
    using KelvraStrings::Strings;
    const bool readable = style == StampStyle::Readable;
    std::wstring stamp;
    stamp.reserve(24);
    stamp += Strings::Padd(time.wDay, 2);
    if (readable)
        stamp += L'-';
    stamp += Strings::Padd(time.wMonth, 2);
    if (readable)
        stamp += L'-';
    stamp += Strings::ToString(time.wYear);
    if (readable)
        stamp += L' ';
    stamp += Strings::Padd(time.wHour, 2);
    if (readable)
        stamp += L':';
    stamp += Strings::Padd(time.wMinute, 2);
    if (readable)
        stamp += L':';
    stamp += Strings::Padd(time.wSecond, 2);
    if (readable)
        stamp += L'.';
    stamp += Strings::ToString(time.wMilliseconds);
    return stamp;
}

} // namespace KelvraTime
