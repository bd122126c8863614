#include "faults/clock_stand_ins.h"

#include <cstring>
#include <ctime>
#include <dlfcn.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <unistd.h>

#include <qn_cu.h>

namespace qn::test
{
std::atomic<counter_change> changed_counter{nullptr};
std::atomic<int64_t> clock_is_off{0};
} // namespace qn::test

namespace
{
using namespace qn::test;

timespec real_time_with_offset()
{
    timespec now{};
    syscall(SYS_clock_gettime, CLOCK_REALTIME, &now);
    now.tv_sec += clock_is_off;
    return now;
}
} // namespace

// Visible, because the shared libraries' calls come here too.
#pragma GCC visibility push(default)
extern "C" {
void cu_get_ctr_1(qn_uint64_t *counter)
{
    const qn_uint64_t value = __builtin_ia32_rdtsc();
    const counter_change change = changed_counter;
    const qn_uint64_t changed = change != nullptr ? change(value) : value;
    std::memcpy(counter, &changed, sizeof changed);
}

int clock_gettime(clockid_t clock, timespec *now) noexcept
{
    if (clock != CLOCK_REALTIME) return static_cast<int>(syscall(SYS_clock_gettime, clock, now));
    *now = real_time_with_offset();
    return 0;
}

int gettimeofday(timeval *now, void *) noexcept
{
    const timespec time = real_time_with_offset();
    *now = {time.tv_sec, time.tv_nsec / 1000};
    return 0;
}

time_t time(time_t *result) noexcept
{
    const time_t now = real_time_with_offset().tv_sec;
    if (result != nullptr) *result = now;
    return now;
}
}
#pragma GCC visibility pop
