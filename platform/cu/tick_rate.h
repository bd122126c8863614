// How fast the counter runs.
#pragma once

namespace qn::cu
{
// Counter ticks per second of CLOCK_MONOTONIC_RAW. The first call measures; later ones check the rate in use against the
// time since the library was loaded, whenever that has doubled.
double ticks_per_second();

// How much faster than CLOCK_MONOTONIC_RAW the clock is made to run: adjtimex()'s `freq` (parts per million, 16
// binary places) and `tick` (microseconds per 1/100 s).
double clock_speed(long freq, long tick);

// The factor, as it was at most a second of that many ticks ago: every page of a trace asks for it, and a system call is
// much of what a page costs. 1 where adjtimex() may not be asked.
double recent_clock_speed(double ticks_per_second);
} // namespace qn::cu
