// The rates at which a kernel that keeps time by the time-stamp counter can run its clocks. Pure functions, no
// state.
//
// Such a kernel knows the counter's frequency in whole kilohertz, and turns counter values into nanoseconds
// with an integer multiplier of some 23 bits and a shift that follow from it. The clocks therefore run at one
// of few exact rates, up to 1e-7 beside the frequency and about 4e-7 from each other at 2.5 GHz: a measurement
// that is good to some 1e-8 tells which, and then the rate is known exactly.
#pragma once

#include <cstdint>
#include <optional>

namespace qn::cu
{
// Counter ticks per second of CLOCK_MONOTONIC_RAW for a counter of that frequency (100 kHz to 100 GHz).
double kernel_tick_rate(uint64_t frequency_khz);

// The kernel rate next to a measured one; nothing when none is within `tolerance` (relative).
std::optional<double> next_kernel_rate(double measured_hz, double tolerance);
} // namespace qn::cu
