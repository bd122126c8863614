// How fast the counter runs.
#pragma once

namespace qn::cu
{
// Counter ticks per second of CLOCK_MONOTONIC_RAW. The first call measures; each later one checks the rate in
// use against the time since the library was loaded.
double ticks_per_second();

// How much faster than CLOCK_MONOTONIC_RAW the clock is made to run: adjtimex()'s `freq` (parts per million, 16
// binary places) and `tick` (microseconds per 1/100 s).
double clock_speed(long freq, long tick);

// The factor at this moment; 1 where adjtimex() may not be asked.
double present_clock_speed();
} // namespace qn::cu
