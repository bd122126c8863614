// The offset of the local time zone, in minutes west of Greenwich.
#include <climits>
#include <cstdlib>
#include <ctime>

#include <gtest/gtest.h>

#include "recording/counter_stand_ins.h"
#include "recording/one_trace.h"
#include "trace/recording/time_zone.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr long noon_in_summer = 1689681600;               // 2023-07-18 12:00:00 UTC
constexpr long before_midnight = 1704065400;              // 2023-12-31 23:30:00 UTC
constexpr long after_midnight = 1704074400;               // 2024-01-01 02:00:00 UTC
constexpr long before_midnight_of_leap_year = 1735687800; // 2024-12-31 23:30:00 UTC

int offset_in(const char *zone, long at = noon_in_summer)
{
    setenv("TZ", zone, 1);
    tzset();
    set_clock(at);
    return get_tz_offset();
}

tm moment(int year, int day_of_year, int hour, int minute)
{
    tm when{};
    when.tm_year = year;
    when.tm_yday = day_of_year;
    when.tm_hour = hour;
    when.tm_min = minute;
    return when;
}
} // namespace

TEST(TimeZone, IsZeroInGreenwich) { EXPECT_EQ(offset_in("UTC0"), 0); }

TEST(TimeZone, IsPositiveInTheWest) { EXPECT_EQ(offset_in("WST5"), 300); }

TEST(TimeZone, IsNegativeInTheEast) { EXPECT_EQ(offset_in("EST-2"), -120); }

TEST(TimeZone, CountsHalfHours)
{
    EXPECT_EQ(offset_in("WST3:30"), 210);
    EXPECT_EQ(offset_in("EST-5:30"), -330);
    EXPECT_EQ(offset_in("EST-5:45"), -345);
}

TEST(TimeZone, ReachesTheFarthestZones)
{
    EXPECT_EQ(offset_in("WST12"), 720);
    EXPECT_EQ(offset_in("EST-14"), -840);
}

TEST(TimeZone, FollowsSummerTime)
{
    const char *zone = "WST5WDT,M3.2.0,M11.1.0";
    EXPECT_EQ(offset_in(zone, noon_in_summer), 240);
    EXPECT_EQ(offset_in(zone, after_midnight), 300);
}

TEST(TimeZone, CannotTellOneMinuteEastFromAFailure) { EXPECT_EQ(offset_in("EST-0:01"), -1); }

TEST(TimeZone, CountsAcrossMidnight)
{
    EXPECT_EQ(offset_in("EST-13", noon_in_summer), -780);
    EXPECT_EQ(offset_in("WST12:30", noon_in_summer), 750);
}

TEST(TimeZone, CountsAcrossNewYear)
{
    EXPECT_EQ(offset_in("EST-5", before_midnight), -300);
    EXPECT_EQ(offset_in("WST5", after_midnight), 300);
    EXPECT_EQ(offset_in("EST-14", before_midnight), -840);
    EXPECT_EQ(offset_in("WST12", after_midnight), 720);
}

TEST(TimeZone, CountsAcrossNewYearOfALeapYear) { EXPECT_EQ(offset_in("EST-5", before_midnight_of_leap_year), -300); }

TEST(TimeZone, IgnoresSeconds)
{
    EXPECT_EQ(offset_in("WST0:00:30", noon_in_summer + 40), 0); // 12:00:40 and 12:00:10
    EXPECT_EQ(offset_in("WST0:00:30", noon_in_summer + 10), 1); // 12:00:10 and 11:59:40
}

TEST(TimeZone, IsMinusOneForATimeThatCannotBeBrokenDown) { EXPECT_EQ(offset_in("WST5", LONG_MAX), -1); }

TEST(TimeZone, StandsInTheFilesHeader)
{
    setenv("TZ", "WST3:30", 1);
    tzset();
    const one_trace trace;
    EXPECT_EQ(trace.image().u32(196), 210U);
}

TEST(ZoneMinutes, SubtractsDaysHoursAndMinutes)
{
    EXPECT_EQ(qn::tr::zone_minutes(moment(123, 100, 1, 10), moment(123, 99, 20, 40)), 270);
    EXPECT_EQ(qn::tr::zone_minutes(moment(123, 100, 20, 40), moment(123, 101, 1, 10)), -270);
}

TEST(ZoneMinutes, CountsADayWhenGreenwichIsInTheNextYear)
{
    EXPECT_EQ(qn::tr::zone_minutes(moment(124, 0, 2, 15), moment(123, 364, 21, 0)), 315);
    EXPECT_EQ(qn::tr::zone_minutes(moment(125, 0, 2, 15), moment(124, 365, 21, 0)), 315);
}

TEST(ZoneMinutes, CountsADayBackWhenGreenwichIsInTheLastYear)
{
    EXPECT_EQ(qn::tr::zone_minutes(moment(123, 364, 21, 0), moment(124, 0, 2, 15)), -315);
}
