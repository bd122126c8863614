// The slope of the line that counter and CLOCK_MONOTONIC_RAW make: measured in a short window, or between two readings.
#pragma once

#include <cstdint>

#include "platform/cu/clock_pair.h"

namespace qn::cu
{
// Ticks per second, and how far from it the true rate can be (relative). Each reading of the clock lay between two
// of the counter, so the bound holds however the thread was interrupted.
struct slope {
    double hz = 0; // 0: the clock cannot be read
    double uncertainty = 1;
    bool smooth = false; // of many readings all over the window, which makes it far better than the bound
};

// The slope between two readings.
slope slope_between(const clock_pair &from, const clock_pair &to);

// The slope during a window from now on. Looks again, some times, when the thread lost the processor meanwhile.
slope measure_slope(int64_t window_ns, pair_reader read = read_pair);

// The slope of the straight line that fits points best.
class line_fit
{
public:
    void add(double x, double y);
    double slope() const; // meaningless for fewer than two different x
    // The standard deviation of x. When no point is further than e beside a line, the slope is at most e / spread()
    // beside that line's.
    double spread() const;
    int points() const { return points_; }

private:
    int points_ = 0;
    long double mean_x_ = 0, mean_y_ = 0; // running means and sums of products around them: no digits are lost
    long double xx_ = 0, xy_ = 0;
};
} // namespace qn::cu
