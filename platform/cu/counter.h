// Which counter the process uses. Decided once, at load time as a rule, and never changed.
#pragma once

#include <cstdint>

namespace qn::cu
{
enum class counter_source {
    undecided,
    time_stamp_counter,
    monotonic_clock // nanoseconds
};

counter_source source_of_counter(); // decides if need be

// The counter, read neither earlier nor later than the code says; for measuring. About twice the price.
uint64_t read_counter_in_order();

// True when the kernel's own clocks are computed from the time-stamp counter.
bool kernel_keeps_time_by_tsc();
} // namespace qn::cu
