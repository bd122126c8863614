// Run where the kernel's list of clock sources is hidden: succeeds when the counter then is CLOCK_MONOTONIC in
// nanoseconds and converts to the time of day. Says on standard error what is wrong.
#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include <qn_cu.h>

namespace
{
int64_t clock_ns(clockid_t clock)
{
    struct timespec now;
    clock_gettime(clock, &now);
    return now.tv_sec * int64_t{1'000'000'000} + now.tv_nsec;
}

bool require(bool holds, const char *what)
{
    if (!holds) std::fprintf(stderr, "not so: %s\n", what);
    return holds;
}
} // namespace

int main()
{
    cu_timeinfo_t base{};
    if (!require(cu_get_procspeed_1(&base) == 0, "there is a time base")) return 1;

    const int64_t real_before = clock_ns(CLOCK_REALTIME), before = clock_ns(CLOCK_MONOTONIC);
    qn_uint64_t counter = 0;
    cu_get_ctr_1(&counter);
    const int64_t behind = clock_ns(CLOCK_MONOTONIC), real_behind = clock_ns(CLOCK_REALTIME);

    struct timespec when;
    if (!require(cu_ctr_to_time_1(&base, counter, &when) == 0, "the counter converts")) return 1;
    const int64_t time = when.tv_sec * int64_t{1'000'000'000} + when.tv_nsec;
    const auto ns = static_cast<int64_t>(counter);
    bool right = require(base.timeinfo1 == 1'000'000'000, "the rate is that of nanoseconds");
    right = require(before <= ns && ns <= behind, "the counter is the monotonic clock") && right;
    right = require(real_before - 1000 <= time && time <= real_behind + 1000, "the time is right") && right;
    return right ? 0 : 1;
}
