// The counter and its time base, replaced in the test program by numbers that a test can expect.
#pragma once

#include <qn_cu.h>

namespace qn::test
{
// What cu_get_procspeed_1() gives.
inline constexpr cu_timeinfo_t time_base{0x1111222233334444, 0x5555666677778888};

// What cu_compute_base_timeinfo_1() makes of a time base.
constexpr cu_timeinfo_t re_based(const cu_timeinfo_t &from) { return {from.timeinfo2 + 1, from.timeinfo1 + 2}; }

// Stops the program's clock, time(), at that second.
void set_clock(long seconds);
} // namespace qn::test
