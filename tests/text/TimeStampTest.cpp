#include "KelvraStrings.h"
#include "text/TimeStamp.h"

#include <gtest/gtest.h>

using KelvraTime::FormatTimeStamp;
using KelvraTime::StampStyle;

namespace
{

// stamp() shows clock's minute in that style, read just before or after (the minute may turn).
void ExpectMinuteOf(void(WINAPI* clock)(LPSYSTEMTIME), StampStyle style, std::wstring (*stamp)())
{
    SYSTEMTIME before, after;
    clock(&before);
    const std::wstring made = stamp();
    clock(&after);
    const size_t length = style == StampStyle::Compact ? 12 : 16; // "ddMMyyyyhhmm", "dd-MM-yyyy hh:mm"
    EXPECT_TRUE(made.rfind(FormatTimeStamp(before, style).substr(0, length), 0) == 0 ||
                made.rfind(FormatTimeStamp(after, style).substr(0, length), 0) == 0)
        << made;
}

} // namespace

TEST(TimeStamp, FormatsEachFieldAsDocumented)
{
    // Year, month, day of week, day, hour, minute, second, milliseconds.
    const std::tuple<SYSTEMTIME, const wchar_t*, const wchar_t*> cases[] = {
        {{2026, 12, 5, 4, 9, 5, 3, 7}, L"04-12-2026 09:05:03.7", L"041220260905037"},
        {{2026, 12, 5, 4, 9, 5, 3, 250}, L"04-12-2026 09:05:03.250", L"04122026090503250"},
        {{987, 6, 0, 7, 0, 0, 0, 0}, L"07-06-987 00:00:00.0", L"07069870000000"}};
    for (const auto& [time, readable, compact] : cases)
    {
        EXPECT_EQ(FormatTimeStamp(time, StampStyle::Readable), readable);
        EXPECT_EQ(FormatTimeStamp(time, StampStyle::Compact), compact);
    }
}

TEST(TimeStamp, NowIsUniversalTimeAndNowLocalIsLocalTime)
{
    // The test run sets TZ to a zone 5:45 away from UTC, so that clocks swapped would show.
    SYSTEMTIME utc, local;
    ::GetSystemTime(&utc), ::GetLocalTime(&local);
    if (utc.wHour == local.wHour && utc.wMinute == local.wMinute)
        GTEST_SKIP() << "local time is universal time here; run with TZ=Asia/Kathmandu";
    ExpectMinuteOf(::GetSystemTime, StampStyle::Readable, KelvraTime::Time::Now);
    ExpectMinuteOf(::GetLocalTime, StampStyle::Compact, KelvraTime::Time::NowLocal);
}
