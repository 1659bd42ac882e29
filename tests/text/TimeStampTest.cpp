#include "KelvraStrings.h"
#include "text/TimeStamp.h"

#include <gtest/gtest.h>

#include <regex>

using KelvraTime::FormatTimeStamp;
using KelvraTime::StampStyle;

namespace
{

SYSTEMTIME At(WORD year, WORD month, WORD day, WORD hour, WORD minute, WORD second, WORD ms)
{
    SYSTEMTIME time = {};
    time.wYear = year;
    time.wMonth = month;
    time.wDay = day;
    time.wDayOfWeek = 5;
    time.wHour = hour;
    time.wMinute = minute;
    time.wSecond = second;
    time.wMilliseconds = ms;
    return time;
}

SYSTEMTIME Read(void(WINAPI* clock)(LPSYSTEMTIME))
{
    SYSTEMTIME time;
    clock(&time);
    return time;
}

// The first `length` characters of stamp() (up to its minute) must be those of clock's time, read
// just before or just after: the minute may turn in between.
void ExpectMinuteOf(void(WINAPI* clock)(LPSYSTEMTIME), std::wstring (*stamp)(), StampStyle style,
                    size_t length)
{
    const std::wstring before = FormatTimeStamp(Read(clock), style).substr(0, length);
    const std::wstring made = stamp().substr(0, length);
    const std::wstring after = FormatTimeStamp(Read(clock), style).substr(0, length);
    EXPECT_TRUE(made == before || made == after) << made << " is neither " << before << " nor " << after;
}

} // namespace

TEST(TimeStamp, FormatsEachFieldAsDocumented)
{
    struct Case
    {
        SYSTEMTIME time;
        const wchar_t* readable;
        const wchar_t* compact;
    };
    const Case cases[] = {
        {At(2026, 12, 4, 9, 5, 3, 7), L"04-12-2026 09:05:03.7", L"041220260905037"},
        {At(2026, 12, 4, 9, 5, 3, 250), L"04-12-2026 09:05:03.250", L"04122026090503250"},
        {At(2026, 12, 4, 9, 5, 3, 999), L"04-12-2026 09:05:03.999", L"04122026090503999"},
        {At(2026, 12, 4, 9, 5, 3, 0), L"04-12-2026 09:05:03.0", L"041220260905030"},
        {At(2031, 1, 2, 3, 4, 5, 60), L"02-01-2031 03:04:05.60", L"0201203103040560"},
        {At(1999, 10, 31, 23, 59, 59, 10), L"31-10-1999 23:59:59.10", L"3110199923595910"},
        {At(987, 6, 7, 0, 0, 0, 1), L"07-06-987 00:00:00.1", L"07069870000001"},
    };
    for (const Case& c : cases)
    {
        EXPECT_EQ(FormatTimeStamp(c.time, StampStyle::Readable), c.readable);
        EXPECT_EQ(FormatTimeStamp(c.time, StampStyle::Compact), c.compact);
    }
}

TEST(TimeStamp, NowIsUniversalTimeAndNowLocalIsLocalTime)
{
    // The test run sets TZ to a zone 5:45 away from UTC, so that clocks swapped would show.
    const SYSTEMTIME utc = Read(::GetSystemTime), local = Read(::GetLocalTime);
    if (utc.wHour == local.wHour && utc.wMinute == local.wMinute)
        GTEST_SKIP() << "local time is universal time here; run with TZ=Asia/Kathmandu";
    ExpectMinuteOf(::GetSystemTime, KelvraTime::Time::Now, StampStyle::Readable, 16);    // dd-MM-yyyy hh:mm
    ExpectMinuteOf(::GetLocalTime, KelvraTime::Time::NowLocal, StampStyle::Compact, 12); // ddMMyyyyhhmm
}

TEST(TimeStamp, NowAndNowLocalReadTheClock)
{
    EXPECT_TRUE(std::regex_match(KelvraTime::Time::Now(), std::wregex(LR"(\d\d-\d\d-\d{4} \d\d:\d\d:\d\d\.\d{1,3})")));
    EXPECT_TRUE(std::regex_match(KelvraTime::Time::NowLocal(), std::wregex(LR"(\d{15,17})")));
}
