// Pages, sizes and intervals from what a configuration asks for.
#include <climits>

#include <gtest/gtest.h>

#include "trace/spooling/spool_shape.h"

namespace
{
using qn::tr::shape_from_environment;
using qn::tr::shape_from_section;
using qn::tr::spool_shape;

trace_element_t asked(qn_uint32_t pages, qn_uint32_t page_bytes, qn_uint32_t trace_bytes, qn_int32_t interval = 0)
{
    trace_element_t element{};
    element.pages = pages;
    element.pg_size = page_bytes;
    element.trace_size = trace_bytes;
    element.sync_interval = static_cast<qn_uint32_t>(interval);
    return element;
}

TEST(SpoolShape, OfASectionSyncsAsItSays)
{
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, 45)).sync_seconds, 45U);
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, INT_MAX)).sync_seconds, static_cast<qn_uint32_t>(INT_MAX));
}

TEST(SpoolShape, OfASectionSyncsHourlyWhenItSaysNothing)
{
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, 0)).sync_seconds, 3600U);
}

TEST(SpoolShape, OfASectionSyncsEveryMinuteWhenTheIntervalIsNegative)
{
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, -1)).sync_seconds, 60U);
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, -5)).sync_seconds, 60U);
    EXPECT_EQ(shape_from_section(asked(0, 0, 0, INT_MIN)).sync_seconds, 60U);
}

TEST(SpoolShape, OfASectionIsReckonedFromAtLeastThreePagesOf4096Bytes)
{
    const spool_shape shape = shape_from_section(asked(2, 1000, 0));
    EXPECT_EQ(shape.trace_bytes, 2097152U) << "three pages of 4096 bytes are raised to that";
    EXPECT_EQ(shape.pages, 8U);
    EXPECT_EQ(shape_from_section(asked(2, 1048576, 0)).trace_bytes, 3145728U);
    EXPECT_EQ(shape_from_section(asked(1024, 4095, 0)).trace_bytes, 4194304U);
    EXPECT_EQ(shape_from_section(asked(1024, 4097, 0)).trace_bytes, 4195328U);
}

TEST(SpoolShape, OfASectionIsOfItsTraceSizeWhenItHasOne)
{
    EXPECT_EQ(shape_from_section(asked(100, 262144, 1)).trace_bytes, 2097152U);
    EXPECT_EQ(shape_from_section(asked(100, 262144, 2097151)).trace_bytes, 2097152U);
    EXPECT_EQ(shape_from_section(asked(100, 262144, 2097152)).trace_bytes, 2097152U);
    EXPECT_EQ(shape_from_section(asked(100, 262144, 2097153)).trace_bytes, 2097153U);
    EXPECT_EQ(shape_from_section(asked(0, 0, UINT_MAX)).pages, 16383U);
}

TEST(SpoolShape, OfTheEnvironmentIsOfItsTraceSizeWhenItHasOne)
{
    EXPECT_EQ(shape_from_environment(100, 0).pages, 100U);
    EXPECT_EQ(shape_from_environment(100, 1048576).pages, 8U);
    EXPECT_EQ(shape_from_environment(1, 5242880).pages, 20U);
    EXPECT_EQ(shape_from_environment(0, 0).pages, 8U);
}

TEST(SpoolShape, OfTheEnvironmentSyncsEveryMinute) { EXPECT_EQ(shape_from_environment(100, 0).sync_seconds, 60U); }

TEST(SpoolShape, HasPagesOfOneSize)
{
    EXPECT_EQ(shape_from_environment(100, 0).page_bytes, 262144U);
    EXPECT_EQ(shape_from_section(asked(100, 4096, 0)).page_bytes, 262144U);
}

TEST(SpoolShape, DividesDownwards)
{
    EXPECT_EQ(shape_from_environment(0, 2359295).pages, 8U);
    EXPECT_EQ(shape_from_environment(0, 2359296).pages, 9U);
}

TEST(SpoolSwitch, IsOnWhenItSaysSoInAnyCase)
{
    for (const char *text : {"ON", "on", "On", "oN"}) EXPECT_TRUE(qn::tr::spooling_says_on(text)) << text;
    for (const char *text : {"", "O", "ONE", "OFF", "YES", " ON"}) EXPECT_FALSE(qn::tr::spooling_says_on(text)) << text;
}
} // namespace
