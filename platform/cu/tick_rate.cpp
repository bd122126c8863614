// How fast the counter runs, to 1e-8 and better within the first milliseconds of a process.
//
// Reading counter, clock, counter in a loop gives points that lie within some nanoseconds of a line. The slope
// of the narrow ones of a millisecond is good to some 1e-8 (measured: 95 in 100 within 3e-8 while others kept
// the machine busy; a quarter of a millisecond: within 2e-7). Where the kernel keeps time by the counter, its
// clocks can only run at one of few exact rates (kernel_rate.h). Processor, hypervisor or kernel often name the
// frequency; a hint that agrees with a quarter of a millisecond's slope settles which rate it is, and if three
// looks come to nothing on a crowded machine, a hint that is about right is still better than the slope.
// Without a hint it takes a longer look. Where the kernel keeps time otherwise, the slope of the longest window
// has to do: 1e-8, on a busy machine 5e-8.
//
// Clocks are compared through CLOCK_MONOTONIC_RAW, which nobody steers; the steering of CLOCK_REALTIME is known
// (adjtimex) and comes on top. From the load of the library to now, two points far apart confine the rate ever
// more closely: the clock was read between the two readings of the counter. A rate outside those confines is
// moved to their edge, so a bad measurement heals. Once the machine was suspended, when the clock stops and the
// counter may not, a process has no use of that line any more.
//
// No lock: the rate is one atomic word, and two threads that measure at the same time store equally good
// values.
#include "platform/cu/tick_rate.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cmath>
#include <iterator>
#include <optional>
#include <sys/timex.h>

#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "platform/cu/frequency_hints.h"
#include "platform/cu/kernel_rate.h"

namespace qn::cu
{
namespace
{
// A look at the counter, and how near to its slope a rate must be to be the one.
struct look {
    int64_t window_ns;
    double with_hint;
    double without;
};
constexpr look looks[] = {{250'000, 2e-7, 0}, {1'000'000, 1.5e-7, 3e-8}, {2'000'000, 5e-6, 5e-8}};
constexpr int most_attempts = 4;

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

double ends_slope(const clock_pair &from, const clock_pair &to)
{
    return static_cast<double>(to.counter - from.counter) * 1e9 / static_cast<double>(to.ns - from.ns);
}

struct slope {
    double hz = 0;            // 0: the clock cannot be read
    bool interrupted = false; // no readings for a good part of the window
};

// The slope of the narrow readings during a window.
slope look_once(int64_t window_ns, uint64_t narrow)
{
    clock_pair start, last, now;
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &start) != 0) return {};
    line_fit fit;
    for (last = start; last.ns - start.ns < window_ns; last = now) {
        if (read_pair(CLOCK_MONOTONIC_RAW, &now) != 0) return {};
        if (now.ns - last.ns > window_ns / 4) return {.hz = ends_slope(start, now), .interrupted = true};
        if (now.width <= narrow)
            fit.add(static_cast<double>(now.ns - start.ns), static_cast<double>(now.counter - start.counter));
    }
    return {.hz = fit.points() >= 2 ? fit.slope() * 1e9 : ends_slope(start, last)};
}

// Looks again when the thread lost the processor meanwhile.
double measure(int64_t window_ns)
{
    slope found{.hz = 0, .interrupted = true};
    const uint64_t narrow = narrow_width();
    for (int i = 0; i < most_attempts && found.interrupted; ++i) found = look_once(window_ns, narrow);
    return found.hz;
}

std::optional<double> hinted_rate(const hint_list &hints, double measured_hz, double tolerance)
{
    for (const auto &khz : hints) {
        if (!khz || *khz == 0) continue;
        const double rate = kernel_tick_rate(*khz);
        if (std::abs(measured_hz / rate - 1) <= tolerance) return rate;
    }
    return std::nullopt;
}

double first_rate()
{
    if (!kernel_keeps_time_by_tsc()) return measure(looks[std::size(looks) - 1].window_ns);
    const hint_list hints = frequency_hints();
    double measured = 0;
    for (const look &one : looks) {
        measured = measure(one.window_ns);
        if (const auto rate = hinted_rate(hints, measured, one.with_hint)) return *rate;
        if (const auto rate = next_kernel_rate(measured, one.without)) return *rate;
    }
    return measured;
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
    const double slack = static_cast<double>(now.width + at_load.pair.width) / 2 + rate * 1e-8; // and 10 ns
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
    if (source_of_counter() == counter_source::monotonic_clock) return 1e9;
    double rate = rate_in_use.load(std::memory_order_relaxed);
    rate = confined(rate == 0 ? first_rate() : rate);
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
