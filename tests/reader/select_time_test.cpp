// Points in time as a user writes them.
#include <gtest/gtest.h>

#include <cstdlib>
#include <ctime>
#include <stdexcept>
#include <string>

#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/select/time.h"

namespace qn::test
{
namespace
{

constexpr timespec now = {1'795'237'920, 250'000'000};

// Nanoseconds since the epoch, or "refused".
std::string parsed(std::string_view text)
{
    try {
        return dump::nanoseconds_text(dump::parse_time(text, now));
    } catch (const std::invalid_argument &) {
        return "refused";
    }
}

void use_zone(const char *zone)
{
    setenv("TZ", zone, 1);
    tzset();
}

TEST(SelectTime, UtcIsMarkedWithZ)
{
    EXPECT_EQ(parsed("2026-11-21T05:12:00Z"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-11-21t05:12:00z"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-11-21 05:12:00Z"), "1795237920000000000");
    EXPECT_EQ(parsed("1970-01-01T00:00:00Z"), "0");
    EXPECT_EQ(parsed("1969-12-31T23:59:59Z"), "-1000000000");
    EXPECT_EQ(parsed("9999-12-31T23:59:59Z"), "253402300799000000000");
}

TEST(SelectTime, AZoneIsSubtracted)
{
    EXPECT_EQ(parsed("2026-11-21T06:12:00+01:00"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-11-20T23:42:00-05:30"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-11-21T05:12:00-00:00"), "1795237920000000000");
}

TEST(SelectTime, WithoutAZoneItIsLocal)
{
    use_zone("XYZ-5:30");
    EXPECT_EQ(parsed("2026-11-21T10:42:00"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-11-21T10:42:00.5"), "1795237920500000000");
}

TEST(SelectTime, TheZoneKnowsWhetherItsSummerTimeIsInForce)
{
    use_zone("CET-1CEST,M3.5.0,M10.5.0/3");
    EXPECT_EQ(parsed("2026-11-21T06:12:00"), "1795237920000000000");
    EXPECT_EQ(parsed("2026-07-01T12:00:00"), parsed("2026-07-01T10:00:00Z"));
}

TEST(SelectTime, AFractionIsExactToTheNanosecond)
{
    EXPECT_EQ(parsed("2026-11-21T05:12:00.123456789Z"), "1795237920123456789");
    EXPECT_EQ(parsed("2026-11-21T05:12:00.000000001Z"), "1795237920000000001");
    EXPECT_EQ(parsed("2026-11-21T05:12:00.5+00:00"), "1795237920500000000");
    EXPECT_EQ(parsed("1969-12-31T23:59:59.25Z"), "-750000000");
    EXPECT_EQ(parsed("2026-11-21T05:12:00.1234567891Z"), "refused");
    EXPECT_EQ(parsed("2026-11-21T05:12:00.Z"), "refused");
}

TEST(SelectTime, ALeapDayAndALeapSecondAreTaken)
{
    EXPECT_EQ(parsed("2028-02-29T00:00:00Z"), "1835395200000000000");
    EXPECT_EQ(parsed("2016-12-31T23:59:60Z"), parsed("2017-01-01T00:00:00Z"));
}

TEST(SelectTime, WhatNoCalendarOrClockHasIsRefused)
{
    for (const auto *text :
         {"2026-02-29T00:00:00Z", "2026-04-31T00:00:00Z", "2026-00-01T00:00:00Z", "2026-13-01T00:00:00Z",
          "2026-01-00T00:00:00Z", "2026-01-32T00:00:00Z", "2026-01-01T24:00:00Z", "2026-01-01T00:60:00Z",
          "2026-01-01T00:00:61Z", "2026-01-01T00:00:00+24:00", "2026-01-01T00:00:00+00:60"}) {
        EXPECT_EQ(parsed(text), "refused") << text;
    }
}

TEST(SelectTime, SecondsSinceTheEpochAreExact)
{
    EXPECT_EQ(parsed("@0"), "0");
    EXPECT_EQ(parsed("@1795237920"), "1795237920000000000");
    EXPECT_EQ(parsed("@1795237920.000000001"), "1795237920000000001");
    EXPECT_EQ(parsed("@1795237920.5"), "1795237920500000000");
    EXPECT_EQ(parsed("@9223372036854775807.999999999"), "9223372036854775807999999999");
}

TEST(SelectTime, AnAmountIsSubtractedFromNow)
{
    EXPECT_EQ(parsed("-1ns"), "1795237920249999999");
    EXPECT_EQ(parsed("-5us"), "1795237920249995000");
    EXPECT_EQ(parsed("-500ms"), "1795237919750000000");
    EXPECT_EQ(parsed("-30s"), "1795237890250000000");
    EXPECT_EQ(parsed("-10min"), "1795237320250000000");
    EXPECT_EQ(parsed("-2h"), "1795230720250000000");
    EXPECT_EQ(parsed("-1d"), "1795151520250000000");
    EXPECT_EQ(parsed("-0s"), "1795237920250000000");
    EXPECT_EQ(parsed("-1795237921s"), "-750000000");
}

TEST(SelectTime, WhatIsNoTimeIsRefused)
{
    for (const auto *text : {"",
                             "now",
                             "yesterday",
                             "2026",
                             "2026-11-21",
                             "2026-11-21T05:12Z",
                             "2026-11-21T05:12:00ZZ",
                             "2026-11-21T05:12:00 Z",
                             " 2026-11-21T05:12:00Z",
                             "2026-11-21T05:12:00+0100",
                             "2026-11-21T05:12:00+01",
                             "2026-11-21T05:12:00+1:00",
                             "2026-1-21T05:12:00Z",
                             "26-11-21T05:12:00Z",
                             "+2026-11-21T05:12:00Z",
                             "2026-11-21T05:12:-1Z",
                             "@",
                             "@-1",
                             "@1.",
                             "@1.1234567890",
                             "@1x",
                             "@9223372036854775808",
                             "-",
                             "-10",
                             "-min",
                             "-10 min",
                             "-10m",
                             "-1.5h",
                             "--1h",
                             "-10minutes",
                             "-9223372036854775808s",
                             "-9223372036854775807d",
                             "10min",
                             "+10min"}) {
        EXPECT_EQ(parsed(text), "refused") << text;
    }
}

TEST(SelectTime, TheErrorSaysWhatWasExpected)
{
    try {
        dump::parse_time("soon", now);
        FAIL();
    } catch (const std::invalid_argument &error) {
        const std::string what = error.what();
        for (const auto *form : {"2026-11-21T05:12:01.123456789Z", "+01:00", "@1795237921.123456789", "-10min"}) {
            EXPECT_NE(what.find(form), std::string::npos) << form;
        }
    }
}

} // namespace
} // namespace qn::test
