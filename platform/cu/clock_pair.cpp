// Reading the counter and a clock at the same moment. No state.
//
// No fences around the counter: the clock's own reading of it is ordered, and with fences the readings scatter
// more than they gain.
#include "platform/cu/clock_pair.h"

#include <cerrno>

#include <qn_cu.h>

namespace qn::cu
{
int read_pair(clockid_t clock, clock_pair *pair)
{
    timespec now{};
    qn_uint64_t before, behind;
    cu_get_ctr_1(&before);
    const int failed = clock_gettime(clock, &now);
    cu_get_ctr_1(&behind);
    if (failed != 0) return errno;
    pair->width = behind - before;
    pair->counter = before + pair->width / 2;
    pair->ns = static_cast<int64_t>(now.tv_sec) * 1'000'000'000 + now.tv_nsec;
    return 0;
}

int read_narrow_pair(clockid_t clock, clock_pair *pair, pair_reader read)
{
    constexpr int readings = 16;
    if (const int error = read(clock, pair); error != 0) return error;
    for (int i = 1; i < readings; ++i) {
        clock_pair another;
        if (read(clock, &another) == 0 && another.width < pair->width) *pair = another;
    }
    return 0;
}
} // namespace qn::cu
