// The counter that stamps records and the clocks of the wall, in the hands of a test.
#pragma once

#include <atomic>
#include <cstdint>
#include <functional>

namespace qn::test
{
// Makes of the counter's value what the library gets; null: as it is. Set it while no other thread is inside the library.
using counter_change = uint64_t (*)(uint64_t);
extern std::atomic<counter_change> changed_counter;

// How many seconds the clock of the wall is off. The clocks that nobody sets are left alone.
extern std::atomic<int64_t> clock_is_off;
} // namespace qn::test
