#include "KelvraStrings.h"

#include "text/TimeStamp.h"

namespace KelvraTime
{

Time& Time::operator=(const Time&)
{
    return *this;
}

std::wstring Time::Now()
{
    SYSTEMTIME now;
    ::GetSystemTime(&now);
    return FormatTimeStamp(now, StampStyle::Readable);
}

std::wstring Time::NowLocal()
{
    SYSTEMTIME now;
    ::GetLocalTime(&now);
    return FormatTimeStamp(now, StampStyle::Compact);
}

} // namespace KelvraTime
