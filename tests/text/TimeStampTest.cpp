#include "KelvraStrings.h"
#include "text/TimeStamp.h"

#include <gtest/gtest.h>

using KelvraTime::FormatTimeStamp;
using KelvraTime::StampStyle;

namespace
{

std::wstring StampOf(void(WINAPI* clock)(LPSYSTEMTIME), StampStyle style)
{
    SYSTEMTIME time;
    clock(&time);
    return FormatTimeStamp(time, style);
}

// stamp() must show clock's time up to the minute (its first `length` characters), read just
// before or just after: the minute may turn in between.
void ExpectMinuteOf(void(WINAPI* clock)(LPSYSTEMTIME), std::wstring (*stamp)(), StampStyle style,
                    size_t length)
{
    const std::wstring before = StampOf(clock, style), made = stamp(), after = StampOf(clock, style);
    EXPECT_TRUE(made.compare(0, length, before, 0, length) == 0 ||
                made.compare(0, length, after, 0, length) == 0)
        << made << " is neither " << before << " nor " << after;
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
    if (StampOf(::GetSystemTime, StampStyle::Compact).substr(0, 12) ==
        StampOf(::GetLocalTime, StampStyle::Compact).substr(0, 12))
        GTEST_SKIP() << "local time is universal time here; run with TZ=Asia/Kathmandu";
    ExpectMinuteOf(::GetSystemTime, KelvraTime::Time::Now, StampStyle::Readable, 16);    // dd-MM-yyyy hh:mm
    ExpectMinuteOf(::GetLocalTime, KelvraTime::Time::NowLocal, StampStyle::Compact, 12); // ddMMyyyyhhmm
}
