// The slope of the line that counter and clock make. No state.
//
// Reading counter, clock, counter in a loop gives points that lie within some nanoseconds of a line. The slope of the
// narrow ones of a millisecond is good to some 1e-8 (measured: 95 in 100 within 3e-8 while others kept the machine
// busy; a quarter of a millisecond: within 2e-7).
//
// A thread can lose the processor at any point, half-way through a reading too, whose middle is then milliseconds away
// from the clock's time. So no slope is ever taken from a single reading: it is that of many narrow ones, or leads
// between two that are the narrowest of several.
#include "platform/cu/tick_slope.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace qn::cu
{
namespace
{
constexpr int most_attempts = 4;
constexpr int least_points = 16;
constexpr double clock_grain_ns = 10; // the clock's rounding, and that the processor may reorder a reading's parts

// A width that one reading in four does not exceed: narrow, and yet enough of them.
uint64_t narrow_width(pair_reader read)
{
    std::array<uint64_t, 64> widths{};
    for (uint64_t &width : widths) {
        clock_pair pair;
        width = read(CLOCK_MONOTONIC_RAW, &pair) == 0 ? pair.width : 0;
    }
    const auto quarter = widths.begin() + widths.size() / 4;
    std::nth_element(widths.begin(), quarter, widths.end());
    return *quarter;
}

// From a reading to the one that is made now; what happened in between does not matter.
slope slope_since(const clock_pair &start, pair_reader read)
{
    clock_pair now;
    return read_narrow_pair(CLOCK_MONOTONIC_RAW, &now, read) == 0 ? slope_between(start, now) : slope{};
}

// Of readings that are at most `narrow` wide. Not smooth when they are few, or all in one part of the window.
slope slope_of(const line_fit &fit, uint64_t narrow, int64_t window_ns)
{
    constexpr double enough_of_window = 1.0 / 6; // points all over it: 0.29
    if (fit.points() < least_points || fit.spread() < static_cast<double>(window_ns) * enough_of_window) return {};
    const double ticks_per_ns = fit.slope();
    const double beside = static_cast<double>(narrow) / 2 + ticks_per_ns * clock_grain_ns;
    return {.hz = ticks_per_ns * 1e9, .uncertainty = beside / (fit.spread() * ticks_per_ns), .smooth = true};
}

slope look_once(int64_t window_ns, uint64_t narrow, pair_reader read)
{
    clock_pair start;
    if (read_narrow_pair(CLOCK_MONOTONIC_RAW, &start, read) != 0) return {};
    line_fit fit;
    int64_t last_ns = start.ns;
    while (last_ns - start.ns < window_ns) {
        clock_pair now;
        if (read(CLOCK_MONOTONIC_RAW, &now) != 0) return {};
        if (now.ns - last_ns > window_ns / 4) return slope_since(start, read);
        if (now.width <= narrow)
            fit.add(static_cast<double>(now.ns - start.ns), static_cast<double>(now.counter - start.counter));
        last_ns = now.ns;
    }
    const slope found = slope_of(fit, narrow, window_ns);
    return found.smooth ? found : slope_since(start, read);
}
} // namespace

slope slope_between(const clock_pair &from, const clock_pair &to)
{
    if (to.ns <= from.ns) return {};
    const auto ticks = static_cast<double>(to.counter - from.counter);
    const auto ns = static_cast<double>(to.ns - from.ns);
    const double beside = static_cast<double>(from.width + to.width) / 2;
    return {.hz = ticks * 1e9 / ns, .uncertainty = beside / ticks + clock_grain_ns / ns};
}

slope measure_slope(int64_t window_ns, pair_reader read)
{
    const uint64_t narrow = narrow_width(read);
    slope best;
    for (int i = 0; i < most_attempts && !best.smooth; ++i) {
        const slope found = look_once(window_ns, narrow, read);
        if (found.smooth || best.hz == 0 || found.uncertainty < best.uncertainty) best = found;
    }
    return best;
}

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

double line_fit::spread() const { return points_ == 0 ? 0 : std::sqrt(static_cast<double>(xx_ / points_)); }
} // namespace qn::cu
