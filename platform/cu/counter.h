// Which counter the process uses. Decided once, at load time as a rule, and never changed.
#pragma once

namespace qn::cu
{
enum class counter_source {
    undecided,
    time_stamp_counter,
    monotonic_clock // nanoseconds
};

counter_source source_of_counter(); // decides if need be

// True when the kernel's own clocks are computed from the time-stamp counter.
bool kernel_keeps_time_by_tsc();
} // namespace qn::cu
