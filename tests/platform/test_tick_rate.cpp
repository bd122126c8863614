// How fast the counter runs: the kernel's possible rates, the hints, the steering of the clock.
#include "platform/cu/tick_rate.h"

#include <atomic>
#include <chrono>
#include <cmath>
#include <ctime>
#include <thread>
#include <vector>

#include <sys/timex.h>

#include <gtest/gtest.h>

#include "instrumented.h"
#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "platform/cu/frequency_hints.h"
#include "platform/cu/kernel_rate.h"

namespace
{
std::atomic<int> raw_clock_readings{0}, questions_for_steering{0};
}

// As the linker names what the library calls, and the real one.
extern "C" int __real_clock_gettime(clockid_t clock, timespec *time);
extern "C" int __wrap_clock_gettime(clockid_t clock, timespec *time)
{
    if (clock == CLOCK_MONOTONIC_RAW) ++raw_clock_readings;
    return __real_clock_gettime(clock, time);
}

extern "C" int __real_adjtimex(timex *state);
extern "C" int __wrap_adjtimex(timex *state)
{
    ++questions_for_steering;
    return __real_adjtimex(state);
}

namespace
{
using namespace qn::cu;

constexpr double tolerance = instrumented ? 5e-6 : 1e-7;

double distance(double one, double other) { return std::abs(one / other - 1); }

TEST(KernelRate, FollowsFromTheMultiplierAndNotFromTheFrequency)
{
    // 2445426 kHz: multiplier 6860652, shift 24, as measured on such a machine for a minute.
    EXPECT_DOUBLE_EQ(kernel_tick_rate(2'445'426), 16777216e9 / 6860652);
    // 1000000 kHz: the multiplier is a power of two, so nothing is rounded.
    EXPECT_DOUBLE_EQ(kernel_tick_rate(1'000'000), 1e9);
}

TEST(KernelRate, LiesWithinTheRoundingOfItsFrequency)
{
    for (uint64_t khz = 500'000; khz < 6'000'000; khz += 123'457)
        EXPECT_LT(distance(kernel_tick_rate(khz), static_cast<double>(khz) * 1000), 2.5e-7) << khz;
}

TEST(KernelRate, IsFoundFromAMeasurementNearIt)
{
    for (uint64_t khz = 800'001; khz < 4'000'000; khz += 98'765) {
        const double rate = kernel_tick_rate(khz);
        for (const double error : {-2e-8, 0.0, 2e-8}) {
            const auto found = next_kernel_rate(rate * (1 + error), 3e-8);
            ASSERT_TRUE(found) << khz;
            EXPECT_DOUBLE_EQ(*found, rate) << khz;
        }
    }
}

TEST(KernelRate, IsNotFoundBetweenTwo)
{
    const double middle = (kernel_tick_rate(2'445'426) + kernel_tick_rate(2'445'427)) / 2;
    EXPECT_FALSE(next_kernel_rate(middle, 3e-8));
    EXPECT_TRUE(next_kernel_rate(middle, 1e-6));
}

TEST(KernelRate, IsNotLookedForWhereNoCounterRuns)
{
    for (const double hz : {0.0, -1.0, 1000.0, 1e15, std::nan("")}) EXPECT_FALSE(next_kernel_rate(hz, 1)) << hz;
}

TEST(FrequencyHint, IsReadFromTheKernelsDescriptionOfTheProcessor)
{
    EXPECT_EQ(frequency_in_cpuinfo("processor\t: 0\ncpu MHz\t\t: 2445.426\nflags\t\t: fpu tsc_known_freq avx\n"),
              2'445'426U);
}

TEST(FrequencyHint, IsNoneWhereTheMomentarySpeedIsShown)
{
    EXPECT_FALSE(frequency_in_cpuinfo("cpu MHz\t\t: 2445.426\nflags\t\t: fpu tsc_known_freq aperfmperf avx\n"));
}

TEST(FrequencyHint, IsNoneWhereTheKernelDoesNotKnowTheFrequency)
{
    EXPECT_FALSE(frequency_in_cpuinfo("cpu MHz\t\t: 2445.426\nflags\t\t: fpu tsc avx\n"));
    EXPECT_FALSE(frequency_in_cpuinfo("cpu MHz\t\t: 2445.426\nflags\t\t: fpu not_tsc_known_freq avx\n"));
}

TEST(FrequencyHint, IsNoneInATextThatDoesNotSay)
{
    const std::string flags = "flags\t\t: tsc_known_freq\n";
    EXPECT_FALSE(frequency_in_cpuinfo(""));
    EXPECT_FALSE(frequency_in_cpuinfo(flags));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz"));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz :"));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz : fast\n"));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz : 2445\n"));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz : 2445.4\n"));
    EXPECT_FALSE(frequency_in_cpuinfo(flags + "cpu MHz : 2445.4x6\n"));
}

TEST(ClockSpeed, IsOneForAnUnsteeredClock) { EXPECT_DOUBLE_EQ(clock_speed(0, 10'000), 1); }

TEST(ClockSpeed, FollowsFrequencyAndTick)
{
    EXPECT_NEAR(clock_speed(65536, 10'000), 1 + 1e-6, 1e-15);
    EXPECT_NEAR(clock_speed(-65536 * 500, 10'000), 1 - 500e-6, 1e-15);
    EXPECT_NEAR(clock_speed(0, 10'001), 1 + 1e-4, 1e-15);
}

TEST(ClockSpeed, IsAskedForOnceASecond)
{
    const double rate = ticks_per_second();
    const auto asks = [rate] {
        const int before = questions_for_steering;
        recent_clock_speed(rate);
        return questions_for_steering != before;
    };
    asks();
    std::this_thread::sleep_for(std::chrono::milliseconds(1100));
    EXPECT_TRUE(asks());
    EXPECT_FALSE(asks());
}

TEST(TickRate, IsTheRateOfTheUnsteeredClock)
{
    const double rate = ticks_per_second();
    clock_pair from, to;
    ASSERT_EQ(read_narrow_pair(CLOCK_MONOTONIC_RAW, &from), 0);
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    ASSERT_EQ(read_narrow_pair(CLOCK_MONOTONIC_RAW, &to), 0);
    const double ticks = static_cast<double>(to.counter - from.counter);
    const double seconds = static_cast<double>(to.ns - from.ns) / 1e9;
    const double uncertainty = static_cast<double>(from.width + to.width) / 2 / ticks;
    EXPECT_LT(distance(ticks / seconds, rate), uncertainty + tolerance);
}

TEST(TickRate, ThreadsThatMeasureTogetherAgree)
{
    std::vector<double> rates(4);
    std::vector<std::thread> threads;
    for (double &rate : rates) threads.emplace_back([&rate] { rate = ticks_per_second(); });
    for (std::thread &thread : threads) thread.join();
    for (const double rate : rates) EXPECT_LT(distance(rate, rates[0]), tolerance);
}

TEST(TickRate, IsComparedWithTheLineSinceTheLoadWhenThatIsTwiceAsLong)
{
    if (source_of_counter() == counter_source::monotonic_clock) GTEST_SKIP() << "its rate is known";
    const auto compares = [] {
        const int before = raw_clock_readings;
        ticks_per_second();
        return raw_clock_readings != before;
    };
    const auto wait_until_it_compares = [&] {
        while (!compares()) std::this_thread::sleep_for(std::chrono::milliseconds(20));
    };
    std::this_thread::sleep_for(std::chrono::milliseconds(400)); // so much older it will not be at once
    wait_until_it_compares();
    EXPECT_FALSE(compares());
    wait_until_it_compares();
}

TEST(TickRate, StaysPutOnceItIsRight)
{
    const double first = ticks_per_second();
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    EXPECT_LT(distance(ticks_per_second(), first), tolerance);
}
} // namespace
