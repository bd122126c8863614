// The line from counter values to wall-clock time: making it from the clock, and following it. No state of its
// own, the rate is tick_rate's.
//
// A line is anchored where it is made, so the rounding of its rate to whole ticks per second (2e-10 at 2.5 GHz)
// shows only with the distance from there, 12 nanoseconds a minute, and not with the time since the counter was
// 0.
#include <cerrno>
#include <cmath>
#include <limits>

#include <qn_cu.h>

#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "platform/cu/tick_rate.h"

namespace qn::cu
{
namespace
{
__extension__ using wide = __int128; // a counter value in nanoseconds needs 94 bits

constexpr wide ns_per_second = 1'000'000'000;

// Nanoseconds from counter value 0 to `counter`, rounded down.
wide elapsed_ns(uint64_t counter, uint64_t ticks_per_second)
{
    return static_cast<wide>(counter) * ns_per_second / ticks_per_second;
}

// Whole ticks per second of CLOCK_REALTIME. The monotonic clock is steered just like the real-time clock.
uint64_t real_tick_rate()
{
    if (source_of_counter() == counter_source::monotonic_clock) return 1'000'000'000;
    const double ticks = ticks_per_second();
    return static_cast<uint64_t>(std::llround(ticks / recent_clock_speed(ticks)));
}

int make_time_base(cu_timeinfo_t *timeinfo)
{
    const uint64_t rate = real_tick_rate();
    if (rate == 0) return ENODATA;
    clock_pair now;
    if (const int error = read_narrow_pair(CLOCK_REALTIME, &now); error != 0) return error;
    timeinfo->timeinfo1 = rate;
    timeinfo->timeinfo2 = static_cast<uint64_t>(now.ns - static_cast<int64_t>(elapsed_ns(now.counter, rate)));
    return 0;
}
} // namespace
} // namespace qn::cu

int cu_get_procspeed_1(cu_timeinfo_t *timeinfo)
{
    return timeinfo != nullptr ? qn::cu::make_time_base(timeinfo) : EINVAL;
}

int cu_compute_base_timeinfo_1(cu_timeinfo_t *timeinfo)
{
    return timeinfo != nullptr ? qn::cu::make_time_base(timeinfo) : EINVAL;
}

int cu_ctr_to_time_1(const cu_timeinfo_t *timeinfo, qn_uint64_t ctr, struct timespec *time)
{
    using namespace qn::cu;
    if (timeinfo == nullptr || time == nullptr || timeinfo->timeinfo1 == 0) return EINVAL;
    const wide base = static_cast<int64_t>(timeinfo->timeinfo2);
    const wide ns = base + elapsed_ns(ctr, timeinfo->timeinfo1);
    wide seconds = ns / ns_per_second;
    wide rest = ns % ns_per_second;
    if (rest < 0) { // before the epoch
        rest += ns_per_second;
        --seconds;
    }
    if (seconds > std::numeric_limits<time_t>::max()) return EOVERFLOW;
    time->tv_sec = static_cast<time_t>(seconds);
    time->tv_nsec = static_cast<long>(rest);
    return 0;
}

int cu_get_current_time_1(struct timespec *time)
{
    if (time == nullptr) return EINVAL;
    return clock_gettime(CLOCK_REALTIME, time) == 0 ? 0 : errno;
}
