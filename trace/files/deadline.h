// Points in time to wait until, by a clock that nobody sets.
#pragma once

#include <ctime>

namespace qn::tr
{
// So many nanoseconds from now, of CLOCK_MONOTONIC.
inline timespec monotonic_deadline(long nanoseconds)
{
    constexpr long ns_per_second = 1000000000;
    timespec deadline{};
    clock_gettime(CLOCK_MONOTONIC, &deadline);
    deadline.tv_nsec += nanoseconds;
    deadline.tv_sec += deadline.tv_nsec / ns_per_second;
    deadline.tv_nsec %= ns_per_second;
    return deadline;
}
} // namespace qn::tr
