// Reading the counter and a clock at the same moment, as nearly as can be.
#pragma once

#include <cstdint>
#include <ctime>

namespace qn::cu
{
// The counter was read before the clock and behind it; `counter` is the middle, so the clock's `ns` belongs to
// a counter value that is at most width / 2 away.
struct clock_pair {
    uint64_t counter = 0;
    int64_t ns = 0;
    uint64_t width = 0;
};

// One reading. Returns 0 or errno.
int read_pair(clockid_t clock, clock_pair *pair);

// read_pair, or what stands in for it where clock and counter are to misbehave as told.
using pair_reader = int (*)(clockid_t clock, clock_pair *pair);

// The narrowest of several readings: one that was interrupted half-way does not count. About a microsecond.
int read_narrow_pair(clockid_t clock, clock_pair *pair, pair_reader read = read_pair);
} // namespace qn::cu
