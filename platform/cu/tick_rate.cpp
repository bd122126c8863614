// How fast the counter runs, to 1e-8 and better within the first milliseconds of a process.
//
// Clocks are compared through CLOCK_MONOTONIC_RAW, which nobody steers; the steering of CLOCK_REALTIME is known
// (adjtimex) and comes on top. Where the kernel keeps time by the counter the rate can be known exactly
// (rate_choice.h); elsewhere the slope of the longest window has to do: 1e-8, on a busy machine 5e-8.
//
// From the load of the library to now, two points far apart confine the rate ever more closely. A rate outside those
// confines is corrected, so a bad measurement heals, however bad. Once the machine was suspended, when the clock stops
// and the counter may not, a process has no use of that line any more.
//
// No lock: the rate is one atomic word, and two threads that measure at the same time store equally good
// values.
#include "platform/cu/tick_rate.h"

#include <atomic>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <sys/timex.h>

#include <qn_cu.h>

#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "platform/cu/frequency_hints.h"
#include "platform/cu/rate_choice.h"
#include "platform/cu/tick_slope.h"

namespace qn::cu
{
namespace
{
constexpr int64_t shortest_line_ns = 10'000'000;
constexpr int64_t suspend_ns = 1'000'000; // the least that counts as one

constinit std::atomic<double> rate_in_use{0}; // 0: not measured yet

// Written by the constructor, before the flag; constant afterwards.
struct load_time {
    clock_pair pair;
    int64_t suspended_ns;
};
constinit load_time at_load{};
constinit std::atomic<bool> load_time_is_useful{false};

// In ticks, the line that was looked at last: one that is not twice as long tells little more. Every page of a trace asks
// for the rate.
constinit std::atomic<uint64_t> seen_line{0};

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
        load_time_is_useful.store(true, std::memory_order_release);
}

slope look_at_counter(int64_t window_ns) { return measure_slope(window_ns); }

double measured_rate()
{
    if (!kernel_keeps_time_by_tsc()) return look_at_counter(longest_look_ns).hz;
    if (const auto rate = rate_by_hints(frequency_hints(), look_at_counter)) return *rate;
    return rate_by_slope(look_at_counter);
}

double present_clock_speed()
{
    timex state{};
    if (adjtimex(&state) < 0 || state.tick == 0) return 1;
    return clock_speed(state.freq, state.tick);
}

uint64_t ticks_since_load()
{
    qn_uint64_t now = 0;
    cu_get_ctr_1(&now);
    return now - at_load.pair.counter;
}

// From the load of the library to now; nothing when that is too short, tells nothing new, or nothing at all.
std::optional<slope> line_since_load()
{
    clock_pair now;
    if (!load_time_is_useful.load(std::memory_order_acquire)) return std::nullopt;
    if (ticks_since_load() / 2 < seen_line.load(std::memory_order_relaxed)) return std::nullopt;
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &now) != 0) return std::nullopt;
    if (now.ns - at_load.pair.ns < shortest_line_ns) return std::nullopt;
    seen_line.store(now.counter - at_load.pair.counter, std::memory_order_relaxed);
    if (std::abs(suspended_ns() - at_load.suspended_ns) > suspend_ns) return std::nullopt;
    return slope_between(at_load.pair, now);
}
} // namespace

double ticks_per_second()
{
    if (source_of_counter() == counter_source::monotonic_clock) return 1e9;
    double rate = rate_in_use.load(std::memory_order_relaxed);
    if (rate == 0) rate = measured_rate();
    if (const auto line = line_since_load()) {
        const checked_rate checked = rate_on_line(rate, *line, measured_rate, look_at_counter);
        if (checked.line_is_bent) load_time_is_useful.store(false, std::memory_order_relaxed);
        rate = checked.hz;
    }
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

double recent_clock_speed(double ticks_per_second)
{
    static constinit std::atomic<double> speed{0};
    static constinit std::atomic<uint64_t> asked{0}; // a counter value
    qn_uint64_t now = 0;
    cu_get_ctr_1(&now);
    double recent = speed.load(std::memory_order_relaxed);
    const auto age = static_cast<double>(now - asked.load(std::memory_order_relaxed));
    if (recent != 0 && age < ticks_per_second) return recent;
    recent = present_clock_speed();
    speed.store(recent, std::memory_order_relaxed);
    asked.store(now, std::memory_order_relaxed);
    return recent;
}
} // namespace qn::cu
