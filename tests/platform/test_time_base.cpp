// From counter values to wall-clock time: the arithmetic, and the time base that the clock gives.
#include <cerrno>
#include <cstdint>
#include <limits>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "instrumented.h"
#include "platform/cu/clock_pair.h"

namespace
{
struct timespec time_of(const cu_timeinfo_t &base, qn_uint64_t counter)
{
    struct timespec when {
    };
    EXPECT_EQ(cu_ctr_to_time_1(&base, counter, &when), 0);
    return when;
}

int64_t ns_of(const cu_timeinfo_t &base, qn_uint64_t counter)
{
    const struct timespec when = time_of(base, counter);
    return when.tv_sec * int64_t{1'000'000'000} + when.tv_nsec;
}

void expect_time(const struct timespec &when, time_t seconds, long nanoseconds)
{
    EXPECT_EQ(when.tv_sec, seconds);
    EXPECT_EQ(when.tv_nsec, nanoseconds);
}

TEST(CounterToTime, CounterZeroIsTheBase)
{
    expect_time(time_of({.timeinfo1 = 1000, .timeinfo2 = 5'000'000'007}, 0), 5, 7);
}

TEST(CounterToTime, TicksAreAddedByTheRate)
{
    expect_time(time_of({.timeinfo1 = 1'000'000'000, .timeinfo2 = 0}, 1'500'000'000), 1, 500'000'000);
    expect_time(time_of({.timeinfo1 = 3, .timeinfo2 = 0}, 10), 3, 333'333'333);
}

TEST(CounterToTime, IsExactForCountersOfAllSizes)
{
    const cu_timeinfo_t base{.timeinfo1 = 2'445'425'887, .timeinfo2 = 1'795'236'699'566'623'553};
    expect_time(time_of(base, 123'456'789'012'345'678), 1'845'721'480, 16'788'828);
    const cu_timeinfo_t negative{.timeinfo1 = 2'445'425'887, .timeinfo2 = static_cast<qn_uint64_t>(-5)};
    expect_time(time_of(negative, std::numeric_limits<qn_uint64_t>::max()), 7'543'366'647, 1'374'285);
}

TEST(CounterToTime, TimesBeforeTheEpochHaveNanosecondsThatAreNotNegative)
{
    const cu_timeinfo_t base{.timeinfo1 = 1'000'000'000, .timeinfo2 = static_cast<qn_uint64_t>(-1'500'000'000)};
    expect_time(time_of(base, 0), -2, 500'000'000);
    expect_time(time_of(base, 500'000'000), -1, 0);
    expect_time(time_of(base, 1'499'999'999), -1, 999'999'999);
    expect_time(time_of(base, 1'500'000'000), 0, 0);
}

TEST(CounterToTime, ARateOfZeroIsRefused)
{
    const cu_timeinfo_t base{.timeinfo1 = 0, .timeinfo2 = 1};
    struct timespec when {
        .tv_sec = 3, .tv_nsec = 4
    };
    EXPECT_EQ(cu_ctr_to_time_1(&base, 1, &when), EINVAL);
    expect_time(when, 3, 4);
}

TEST(CounterToTime, NullArgumentsAreRefused)
{
    const cu_timeinfo_t base{.timeinfo1 = 1, .timeinfo2 = 1};
    struct timespec when;
    EXPECT_EQ(cu_ctr_to_time_1(nullptr, 1, &when), EINVAL);
    EXPECT_EQ(cu_ctr_to_time_1(&base, 1, nullptr), EINVAL);
}

TEST(CounterToTime, ATimeThatDoesNotFitIsRefused)
{
    const cu_timeinfo_t base{.timeinfo1 = 1, .timeinfo2 = 0};
    struct timespec when;
    EXPECT_EQ(cu_ctr_to_time_1(&base, std::numeric_limits<qn_uint64_t>::max(), &when), EOVERFLOW);
    EXPECT_EQ(cu_ctr_to_time_1(&base, std::numeric_limits<int64_t>::max(), &when), 0);
}

// What the clock says, as exactly as it can be told; the base may be that much and a microsecond off.
void expect_agreement_with_the_clock(const cu_timeinfo_t &base)
{
    qn::cu::clock_pair now;
    ASSERT_EQ(qn::cu::read_narrow_pair(CLOCK_REALTIME, &now), 0);
    const auto uncertainty_ns = static_cast<int64_t>(now.width * 1'000'000'000 / base.timeinfo1);
    EXPECT_NEAR(static_cast<double>(ns_of(base, now.counter) - now.ns), 0, static_cast<double>(uncertainty_ns + 1000));
}

TEST(TimeBase, TellsTheClocksTimeFromTheFirstMoment)
{
    cu_timeinfo_t base{};
    ASSERT_EQ(cu_get_procspeed_1(&base), 0);
    expect_agreement_with_the_clock(base);
}

TEST(TimeBase, ARecalibrationIgnoresWhatWasThereBefore)
{
    cu_timeinfo_t base{.timeinfo1 = 0, .timeinfo2 = 12345};
    ASSERT_EQ(cu_compute_base_timeinfo_1(&base), 0);
    expect_agreement_with_the_clock(base);
}

TEST(TimeBase, CountersFromBeforeARecalibrationConvertAlikeByBoth)
{
    cu_timeinfo_t first{}, second{};
    ASSERT_EQ(cu_get_procspeed_1(&first), 0);
    qn_uint64_t early = 0;
    cu_get_ctr_1(&early);
    std::this_thread::sleep_for(std::chrono::milliseconds(500));
    second = first;
    ASSERT_EQ(cu_compute_base_timeinfo_1(&second), 0);
    qn_uint64_t late = 0;
    cu_get_ctr_1(&late);
    for (const qn_uint64_t counter : {early, late})
        EXPECT_NEAR(static_cast<double>(ns_of(first, counter) - ns_of(second, counter)), 0, instrumented ? 5000 : 1000);
}

TEST(TimeBase, CanBeAskedForByManyThreads)
{
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([] {
            for (int i = 0; i < 100; ++i) {
                cu_timeinfo_t base{};
                EXPECT_EQ(cu_get_procspeed_1(&base), 0);
                EXPECT_EQ(cu_compute_base_timeinfo_1(&base), 0);
                EXPECT_GT(base.timeinfo1, 0U);
            }
        });
    for (std::thread &thread : threads) thread.join();
}

TEST(TimeBase, NullPointersAreRefused)
{
    EXPECT_EQ(cu_get_procspeed_1(nullptr), EINVAL);
    EXPECT_EQ(cu_compute_base_timeinfo_1(nullptr), EINVAL);
    EXPECT_EQ(cu_get_current_time_1(nullptr), EINVAL);
}

TEST(CurrentTime, LiesBetweenTwoReadingsOfTheClock)
{
    struct timespec before, now, behind;
    clock_gettime(CLOCK_REALTIME, &before);
    ASSERT_EQ(cu_get_current_time_1(&now), 0);
    clock_gettime(CLOCK_REALTIME, &behind);
    const auto in_order = [](const struct timespec &one, const struct timespec &other) {
        return one.tv_sec < other.tv_sec || (one.tv_sec == other.tv_sec && one.tv_nsec <= other.tv_nsec);
    };
    EXPECT_TRUE(in_order(before, now));
    EXPECT_TRUE(in_order(now, behind));
}
} // namespace
