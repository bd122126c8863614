#include "recording/counter_stand_ins.h"

#include <ctime>

namespace
{
bool clock_is_set = false;
time_t clock_now = 0;
} // namespace

extern "C" {
int cu_get_procspeed_1(cu_timeinfo_t *time_info)
{
    *time_info = qn::test::time_base;
    return 0;
}

int cu_compute_base_timeinfo_1(cu_timeinfo_t *time_info)
{
    *time_info = qn::test::re_based(*time_info);
    return 0;
}

time_t time(time_t *result) noexcept
{
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    const time_t seconds = clock_is_set ? clock_now : now.tv_sec;
    if (result != nullptr) *result = seconds;
    return seconds;
}
}

namespace qn::test
{
void set_clock(long seconds)
{
    clock_is_set = true;
    clock_now = seconds;
}
} // namespace qn::test
