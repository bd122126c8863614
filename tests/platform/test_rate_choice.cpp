// Which rate is chosen: from hints, from slopes, and what the line of a longer life makes of it.
#include "platform/cu/rate_choice.h"

#include <vector>

#include <gtest/gtest.h>

#include "platform/cu/kernel_rate.h"
#include "simulated_clock.h"

namespace
{
using namespace qn::cu;
using qn::test::machine;
using qn::test::simulated_khz;

const double true_hz = kernel_tick_rate(simulated_khz);
const double next_hz = kernel_tick_rate(simulated_khz + 1);
const hint_list right_hint{std::nullopt, simulated_khz, std::nullopt};
const hint_list next_hint{simulated_khz + 1, std::nullopt, std::nullopt};

slope smooth(double hz) { return {.hz = hz, .uncertainty = 3e-5, .smooth = true}; }
slope interrupted(double hz, double uncertainty) { return {.hz = hz, .uncertainty = uncertainty}; }

// Looks find these slopes, one after the other.
look finding(std::vector<slope> slopes)
{
    return [slopes = std::move(slopes), next = size_t{0}](int64_t) mutable {
        EXPECT_LT(next, slopes.size()) << "one look more than expected";
        return next < slopes.size() ? slopes[next++] : slope{};
    };
}

look no_look() { return finding({}); }

double no_choice()
{
    ADD_FAILURE() << "there was nothing to choose";
    return 0;
}

TEST(RateByHints, ABriefLookThatAgreesIsEnough)
{
    EXPECT_EQ(rate_by_hints(right_hint, finding({smooth(true_hz * (1 + 1.5e-7))})), true_hz);
}

TEST(RateByHints, TheMostTrustworthyHintThatAgreesIsTaken)
{
    const hint_list hints{simulated_khz + 1000, simulated_khz, simulated_khz + 1};
    EXPECT_EQ(rate_by_hints(hints, finding({smooth(true_hz)})), true_hz);
}

TEST(RateByHints, OneLookThatLiesAtAnotherRateDoesNotOverruleAHint)
{
    EXPECT_EQ(rate_by_hints(right_hint, finding({smooth(next_hz), smooth(next_hz), smooth(true_hz)})), true_hz);
    EXPECT_EQ(rate_by_hints(right_hint, finding({smooth(next_hz), smooth(next_hz), smooth(true_hz * (1 + 2e-7))})),
              true_hz);
}

TEST(RateByHints, TwoLooksThatFindTheSameOtherRateOverruleAHint)
{
    EXPECT_EQ(rate_by_hints(next_hint, finding({smooth(true_hz), smooth(true_hz), smooth(true_hz)})), true_hz);
}

TEST(RateByHints, InterruptedLooksDoNotOverruleAHint)
{
    const slope next = interrupted(next_hz, 1e-5);
    EXPECT_EQ(rate_by_hints(right_hint, finding({next, next, next})), true_hz);
}

TEST(RateByHints, AHintStandsWithinTheUncertaintyOfWildLooks)
{
    const slope wild = interrupted(true_hz / 2, 0.6), better = interrupted(true_hz * (1 + 4e-4), 5e-4);
    EXPECT_EQ(rate_by_hints(right_hint, finding({wild, wild, better})), true_hz);
    EXPECT_EQ(rate_by_hints(right_hint, finding({wild, wild, interrupted(true_hz / 2, 1)})), true_hz);
}

TEST(RateByHints, AHintThatTheLooksDisproveIsNotTaken)
{
    const slope measured = smooth(true_hz * (1 + 2e-7));
    EXPECT_FALSE(
        rate_by_hints({simulated_khz * 2, std::nullopt, std::nullopt}, finding({measured, measured, measured})));
}

TEST(RateByHints, WithoutAHintNothingIsMeasured) { EXPECT_FALSE(rate_by_hints({}, no_look())); }

TEST(RateByHints, AHintOfNothingIsNone)
{
    const slope measured = smooth(true_hz * (1 + 2e-7));
    EXPECT_FALSE(rate_by_hints({0, std::nullopt, std::nullopt}, finding({measured, measured, measured})));
}

TEST(RateByHints, AHintIsFoundAlthoughEveryLookIsInterruptedForMilliseconds)
{
    machine.pause_every = 1000;
    machine.pause_ns = 5e6;
    const auto measure = [](int64_t window_ns) { return measure_slope(window_ns, qn::test::read_simulated_pair); };
    EXPECT_EQ(rate_by_hints(right_hint, measure), true_hz);
}

TEST(RateByHints, AHintIsNotTakenWhereTheClockCannotBeRead)
{
    EXPECT_FALSE(rate_by_hints(right_hint, finding({slope{}, slope{}, slope{}})));
}

TEST(RateBySlope, IsTheKernelsRateNextToAGoodLook)
{
    EXPECT_EQ(rate_by_slope(finding({smooth(true_hz * (1 + 2e-8))})), true_hz);
}

TEST(RateBySlope, ALongerLookSettlesWhatTheFirstLeavesOpen)
{
    EXPECT_EQ(rate_by_slope(finding({smooth(true_hz * (1 + 1e-7)), smooth(true_hz * (1 + 4e-8))})), true_hz);
}

TEST(RateBySlope, AnInterruptedLookDoesNotTellWhichKernelRateItIs)
{
    const double measured = next_hz * (1 + 1e-8);
    EXPECT_EQ(rate_by_slope(finding({interrupted(next_hz, 1e-5), interrupted(measured, 1e-5)})), measured);
}

TEST(RateBySlope, IsTheLongestLooksWhereItLiesBetweenKernelRates)
{
    const double middle = (true_hz + next_hz) / 2;
    EXPECT_EQ(rate_by_slope(finding({smooth(middle), smooth(middle)})), middle);
}

TEST(RateOnLine, ARateThatTheLinePermitsStays)
{
    const slope line{.hz = true_hz * (1 + 1e-7), .uncertainty = 2e-7};
    const checked_rate checked = rate_on_line(true_hz, line, no_choice, no_look());
    EXPECT_EQ(checked.hz, true_hz);
    EXPECT_FALSE(checked.line_is_bent);
}

TEST(RateOnLine, ARateBesideTheLineIsMovedToTheEdgeOfWhatItPermits)
{
    const slope line{.hz = true_hz, .uncertainty = 1e-8};
    for (const double way : {1.0, -1.0}) {
        const checked_rate checked = rate_on_line(true_hz * (1 + way * 1e-6), line, no_choice, no_look());
        EXPECT_DOUBLE_EQ(checked.hz, true_hz * (1 + way * 1e-8));
        EXPECT_FALSE(checked.line_is_bent);
    }
}

TEST(RateOnLine, AGrossErrorIsHealedByAnotherChoice)
{
    const slope line{.hz = true_hz * (1 - 1e-6), .uncertainty = 3e-6};
    for (const double factor : {0.5, 1 - 1e-4, 2.0, 1e-9}) {
        const auto choose = [] { return true_hz; };
        const checked_rate checked = rate_on_line(true_hz * factor, line, choose, finding({smooth(true_hz)}));
        EXPECT_EQ(checked.hz, true_hz);
        EXPECT_FALSE(checked.line_is_bent);
    }
}

TEST(RateOnLine, AGrossErrorIsConfinedWhenTheOtherChoiceIsNoBetter)
{
    const slope line{.hz = true_hz, .uncertainty = 3e-6};
    const auto choose = [] { return true_hz / 2; };
    const checked_rate checked = rate_on_line(true_hz / 2, line, choose, finding({interrupted(true_hz / 2, 1)}));
    EXPECT_DOUBLE_EQ(checked.hz, true_hz * (1 - 3e-6));
    EXPECT_FALSE(checked.line_is_bent);
}

TEST(RateOnLine, ALineThatAMeasurementOfNowContradictsIsBent)
{
    const slope line{.hz = true_hz * 1.1, .uncertainty = 1e-8};
    const auto choose = [] { return true_hz; };
    const checked_rate checked = rate_on_line(true_hz, line, choose, finding({smooth(true_hz)}));
    EXPECT_EQ(checked.hz, true_hz);
    EXPECT_TRUE(checked.line_is_bent);
}
} // namespace
