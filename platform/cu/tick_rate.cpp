// How fast the counter runs, to 1e-8 and better within the first half millisecond of a process.
//
// Reading counter, clock, counter in a loop gives points that lie within a few nanoseconds of a line; the narrow ones of half a
// millisecond, some thousand, give its slope to 1e-8. Where the kernel keeps time by the counter itself, that
// is enough to tell which of its few possible rates it is (kernel_rate.h), and the rate is exact. Otherwise the longest window's slope has to
// do, good to 1e-8 when the machine is not busy.
//
// Clocks are compared through CLOCK_MONOTONIC_RAW, which nobody steers; the steering of CLOCK_REALTIME is known (adjtimex)
// and comes on top. From the load of the library to now, two points far apart confine the rate ever more closely, with
// certainty: the clock was read between the two readings of the counter. A rate outside those confines is moved to
// their edge, so a bad measurement heals. Once the machine was suspended, when the clock stops and the counter may not, a
// process has no use of that line any more.
//
// No lock: the rate is one atomic word, and two threads that measure at the same time store equally good values.
#include "platform/cu/tick_rate.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cmath>
#include <sys/timex.h>

#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "platform/cu/kernel_rate.h"

namespace qn::cu
{
namespace
{
constexpr int64_t windows_ns[] = {500'000, 1'000'000, 2'000'000};
constexpr int fewest_points = 100;
constexpr double kernel_rate_tolerance = 3e-8;
constexpr int64_t shortest_line_ns = 10'000'000;
constexpr int64_t suspend_ns = 1'000'000; // the least that counts as one
constexpr double beyond_belief = 1e-5;    // a line that far off has another cause than a bad measurement

constinit std::atomic<double> rate_in_use{0}; // 0: not measured yet

// Written by the constructor, before the flag; constant afterwards.
struct load_time {
    clock_pair pair;
    int64_t suspended_ns;
};
constinit load_time at_load{};
constinit std::atomic<bool> have_load_time{false};

int64_t clock_ns(clockid_t clock)
{
    timespec now{};
    clock_gettime(clock, &now);
    return static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
}

// How long the machine has been suspended so far.
int64_t suspended_ns() { return clock_ns(CLOCK_BOOTTIME) - clock_ns(CLOCK_MONOTONIC); }

[[gnu::constructor]] void remember_load()
{
    at_load.suspended_ns = suspended_ns();
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &at_load.pair) == 0)
        have_load_time.store(true, std::memory_order_release);
}

// A width that one reading in four does not exceed: narrow, and yet enough of them.
uint64_t narrow_width()
{
    std::array<uint64_t, 64> widths{};
    for (uint64_t &width : widths) {
        clock_pair pair;
        width = read_pair(CLOCK_MONOTONIC_RAW, &pair) == 0 ? pair.width : 0;
    }
    const auto quarter = widths.begin() + widths.size() / 4;
    std::nth_element(widths.begin(), quarter, widths.end());
    return *quarter;
}

// The slope of the narrow readings during a window; 0 when the clock cannot be read.
double measure(int64_t window_ns)
{
    const uint64_t narrow = narrow_width();
    clock_pair start, now;
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &start) != 0) return 0;
    line_fit fit;
    do {
        if (read_pair(CLOCK_MONOTONIC_RAW, &now) != 0) return 0;
        if (now.width <= narrow)
            fit.add(static_cast<double>(now.ns - start.ns), static_cast<double>(now.counter - start.counter));
    } while (now.ns - start.ns < window_ns);
    if (fit.points() >= fewest_points) return fit.slope() * 1e9;
    return static_cast<double>(now.counter - start.counter) * 1e9 / static_cast<double>(now.ns - start.ns);
}

double first_rate()
{
    if (source_of_counter() == counter_source::monotonic_clock) return 1e9;
    const bool exact = kernel_keeps_time_by_tsc();
    double rate = 0;
    for (const int64_t window : windows_ns) {
        rate = measure(window);
        if (!exact) continue;
        if (const auto known = next_kernel_rate(rate, kernel_rate_tolerance)) return *known;
    }
    return rate;
}

// Confines a rate to what the line from the load of the library to now permits.
double confined(double rate)
{
    clock_pair now;
    if (!have_load_time.load(std::memory_order_acquire)) return rate;
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &now) != 0) return rate;
    if (now.ns - at_load.pair.ns < shortest_line_ns) return rate;
    if (std::abs(suspended_ns() - at_load.suspended_ns) > suspend_ns) return rate;
    const double seconds = static_cast<double>(now.ns - at_load.pair.ns) / 1e9;
    const double ticks = static_cast<double>(now.counter - at_load.pair.counter);
    if (std::abs(ticks / seconds / rate - 1) > beyond_belief) return rate;
    const double slack = static_cast<double>(now.width + at_load.pair.width) / 2 + rate / 1e9; // and a nanosecond
    return std::clamp(rate, (ticks - slack) / seconds, (ticks + slack) / seconds);
}
} // namespace

void line_fit::add(double x, double y)
{
    ++points_;
    const long double from_mean_x = x - mean_x_;
    mean_x_ += from_mean_x / points_;
    mean_y_ += (y - mean_y_) / points_;
    xx_ += from_mean_x * (x - mean_x_);
    xy_ += from_mean_x * (y - mean_y_);
}

double line_fit::slope() const { return static_cast<double>(xy_ / xx_); }

double ticks_per_second()
{
    double rate = rate_in_use.load(std::memory_order_relaxed);
    if (rate == 0) rate = first_rate();
    if (source_of_counter() == counter_source::time_stamp_counter) rate = confined(rate);
    rate_in_use.store(rate, std::memory_order_relaxed);
    return rate;
}

double clock_speed(long freq, long tick)
{
    constexpr double ticks_per_real_second = 100;
    const double tick_us = static_cast<double>(tick) * ticks_per_real_second;
    const double freq_us = static_cast<double>(freq) / 65536;
    return (tick_us + freq_us) / 1e6;
}

double present_clock_speed()
{
    timex state{};
    if (adjtimex(&state) < 0 || state.tick == 0) return 1;
    return clock_speed(state.freq, state.tick);
}
} // namespace qn::cu
