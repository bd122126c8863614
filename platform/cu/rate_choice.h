// Which rate the counter runs at, given what was measured and what the machine says. Pure policy, no state: how to
// measure comes from the caller.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "platform/cu/frequency_hints.h"
#include "platform/cu/tick_slope.h"

namespace qn::cu
{
// A slope that is measured now, in a window of so many nanoseconds.
using look = std::function<slope(int64_t window_ns)>;

constexpr int64_t brief_look_ns = 250'000, long_look_ns = 1'000'000, longest_look_ns = 2'000'000;

// The rate that a hint tells; nothing when there is no hint or what is measured disproves them all.
std::optional<double> rate_by_hints(const hint_list &hints, const look &measure);

// The rate of a kernel clock that is computed from the counter, without a hint.
double rate_by_slope(const look &measure);

// A rate, as the line through a good part of the process's life permits it.
struct checked_rate {
    double hz;
    bool line_is_bent; // it is no line: of no use now or later
};

// Moves a rate to the edge of what the line permits. One that is grossly off is chosen once more, and it is the line
// that is wrong when a measurement of now contradicts it.
checked_rate rate_on_line(double hz, const slope &line, const std::function<double()> &choose, const look &measure);
} // namespace qn::cu
