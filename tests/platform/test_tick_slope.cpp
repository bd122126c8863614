// The slope of counter and clock, on a simulated machine that interrupts the measurement as it is told to.
#include "platform/cu/tick_slope.h"

#include <cerrno>
#include <cmath>

#include <gtest/gtest.h>

#include "platform/cu/clock_pair.h"
#include "simulated_clock.h"

namespace
{
using namespace qn::cu;
using qn::test::machine;
using qn::test::read_simulated_pair;

constexpr int64_t window_ns = 1'000'000;
constexpr double pause_ns = 5e6;

double off(const slope &measured) { return std::abs(measured.hz / machine.hz - 1); }

TEST(LineFit, FindsTheSlopeOfALine)
{
    line_fit fit;
    for (int x = 0; x < 100; ++x) fit.add(x, 3.5 * x + 1e12);
    EXPECT_NEAR(fit.slope(), 3.5, 1e-9);
    EXPECT_EQ(fit.points(), 100);
}

TEST(LineFit, EvensOutPointsBesideTheLine)
{
    line_fit fit;
    for (int x = 0; x < 100; ++x)
        for (const double beside : {-10.0, 10.0}) fit.add(x, 2.0 * x + beside);
    EXPECT_NEAR(fit.slope(), 2, 1e-12);
}

TEST(LineFit, TheSpreadIsTheStandardDeviationOfX)
{
    line_fit fit;
    EXPECT_EQ(fit.spread(), 0);
    for (const double x : {1e12 - 3, 1e12 + 3}) fit.add(x, 0);
    EXPECT_NEAR(fit.spread(), 3, 1e-9);
}

TEST(SlopeBetween, IsBoundedByTheWidthsOfTheReadings)
{
    const slope found =
        slope_between({.counter = 1000, .ns = 5000, .width = 20}, {.counter = 3000, .ns = 6000, .width = 60});
    EXPECT_DOUBLE_EQ(found.hz, 2e9);
    EXPECT_DOUBLE_EQ(found.uncertainty, 40.0 / 2000 + 10.0 / 1000);
    EXPECT_FALSE(found.smooth);
}

TEST(SlopeBetween, SaysNothingWhereNoTimePassed)
{
    const slope found =
        slope_between({.counter = 1000, .ns = 5000, .width = 20}, {.counter = 1010, .ns = 5000, .width = 20});
    EXPECT_EQ(found.hz, 0);
    EXPECT_EQ(found.uncertainty, 1);
}

TEST(TickSlope, IsSmoothAndExactWhenNothingInterrupts)
{
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_TRUE(found.smooth);
    EXPECT_LT(off(found), 3e-8);
    EXPECT_LT(found.uncertainty, 1e-4);
}

TEST(TickSlope, IsLookedForAgainAfterAnInterruption)
{
    machine.pause_every = 1000;
    machine.pause_ns = pause_ns;
    machine.most_pauses = 1;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_TRUE(found.smooth);
    EXPECT_LT(off(found), 3e-8);
}

TEST(TickSlope, IsRightWithinItsBoundWhenEveryLookIsInterruptedBeforeItReadsTheClock)
{
    machine.pause_every = 1000;
    machine.pause_ns = pause_ns;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_FALSE(found.smooth);
    EXPECT_LE(off(found), found.uncertainty);
    EXPECT_LT(found.uncertainty, 1e-4);
}

TEST(TickSlope, IsRightWithinItsBoundWhenEveryLookIsInterruptedBehindItsReadingOfTheClock)
{
    machine.pause_every = 1000;
    machine.pause_ns = pause_ns;
    machine.pause_behind_clock = true;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_FALSE(found.smooth);
    EXPECT_LE(off(found), found.uncertainty);
    EXPECT_LT(found.uncertainty, 1e-4);
}

TEST(TickSlope, IsRightWithinItsBoundWhenTheWidthToCompareWithWasInterruptedToo)
{
    machine.pause_every = 2;
    machine.pause_ns = pause_ns;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_LE(off(found), found.uncertainty);
    EXPECT_LT(found.uncertainty, 1e-4);
}

TEST(TickSlope, IsNotTakenFromNarrowReadingsInOnePartOfTheWindow)
{
    machine.wide_from = 150; // some after the first look has begun
    machine.wide_ns = 2000;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_FALSE(found.smooth);
    EXPECT_LE(off(found), found.uncertainty);
    EXPECT_LT(found.uncertainty, 5e-3);
}

TEST(TickSlope, IsRightWithinItsBoundWhenEveryReadingIsInterrupted)
{
    machine.pause_every = 1;
    machine.pause_ns = pause_ns;
    const slope found = measure_slope(window_ns, read_simulated_pair);
    EXPECT_FALSE(found.smooth);
    EXPECT_LE(off(found), found.uncertainty);
}

TEST(TickSlope, IsNoneWhereTheClockCannotBeRead)
{
    const slope found = measure_slope(window_ns, [](clockid_t, clock_pair *) { return EINVAL; });
    EXPECT_EQ(found.hz, 0);
    EXPECT_EQ(found.uncertainty, 1);
    EXPECT_FALSE(found.smooth);
}
} // namespace
