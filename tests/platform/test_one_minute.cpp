// The time base over a minute. A sample counts only where counter and clock were read close together, so that a thread
// that lost the processor in between says nothing; and the test says nothing when somebody steered the clock meanwhile.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <sys/timex.h>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "instrumented.h"
#include "platform/cu/clock_pair.h"

namespace
{
using qn::cu::clock_pair;

constexpr int64_t microsecond = 1000;
constexpr auto between_samples = std::chrono::milliseconds(100);
constexpr int samples_per_minute = 600;

// What makes CLOCK_REALTIME run otherwise than it did: steering, and steps.
struct steering {
    long frequency, tick, offset;
    int64_t ahead_of_monotonic_ns;
};

steering present_steering()
{
    timex state{};
    adjtimex(&state);
    clock_pair real, monotonic;
    EXPECT_EQ(qn::cu::read_narrow_pair(CLOCK_REALTIME, &real), 0);
    EXPECT_EQ(qn::cu::read_narrow_pair(CLOCK_MONOTONIC, &monotonic), 0);
    return {state.freq, state.tick, state.offset, real.ns - monotonic.ns};
}

bool steered(const steering &before, const steering &now)
{
    return before.frequency != now.frequency || before.tick != now.tick || before.offset != 0 || now.offset != 0 ||
           std::abs(before.ahead_of_monotonic_ns - now.ahead_of_monotonic_ns) > int64_t{1'000'000'000};
}

int64_t ns_of(const cu_timeinfo_t &base, qn_uint64_t counter)
{
    struct timespec when {
    };
    EXPECT_EQ(cu_ctr_to_time_1(&base, counter, &when), 0);
    return when.tv_sec * int64_t{1'000'000'000} + when.tv_nsec;
}

std::vector<clock_pair> narrow_samples(const cu_timeinfo_t &base, int count)
{
    const uint64_t narrow = base.timeinfo1 / 1'000'000 / 2; // half a microsecond
    std::vector<clock_pair> samples;
    for (int i = 0; i < count; ++i) {
        std::this_thread::sleep_for(between_samples);
        clock_pair sample;
        EXPECT_EQ(qn::cu::read_narrow_pair(CLOCK_REALTIME, &sample), 0);
        if (sample.width <= narrow) samples.push_back(sample);
    }
    return samples;
}

int64_t largest_error_ns(const cu_timeinfo_t &base, const std::vector<clock_pair> &samples)
{
    int64_t largest = 0;
    for (const clock_pair &sample : samples)
        largest = std::max(largest, std::abs(ns_of(base, sample.counter) - sample.ns));
    return largest;
}

TEST(OneMinute, EveryTimeBaseKeepsWithinAMicrosecondOfTheClock)
{
    if (instrumented) GTEST_SKIP() << "the readings are too uneven in an instrumented build";
    cu_timeinfo_t first{};
    ASSERT_EQ(cu_get_procspeed_1(&first), 0);
    const steering before = present_steering();

    auto samples = narrow_samples(first, samples_per_minute / 2);
    cu_timeinfo_t halfway = first;
    ASSERT_EQ(cu_compute_base_timeinfo_1(&halfway), 0);
    const auto more = narrow_samples(first, samples_per_minute / 2);
    samples.insert(samples.end(), more.begin(), more.end());
    cu_timeinfo_t last = first;
    ASSERT_EQ(cu_compute_base_timeinfo_1(&last), 0);

    if (steered(before, present_steering())) GTEST_SKIP() << "the clock was steered meanwhile";
    if (samples.size() < samples_per_minute / 10) GTEST_SKIP() << "this machine is too busy to read two clocks at once";
    for (const cu_timeinfo_t &base : {first, halfway, last}) {
        const int64_t error = largest_error_ns(base, samples);
        std::printf("rate %llu/s: at most %lld ns off in %zu samples\n",
                    static_cast<unsigned long long>(base.timeinfo1), static_cast<long long>(error), samples.size());
        EXPECT_LE(error, microsecond);
    }
}
} // namespace
