// Memory that runs out for everybody: a program linked with this file has malloc() and its kin of its own, through
// which come the allocations of the library, of the C and the C++ library (operator new, fopen()) and of the test. It needs
// the linker's --wrap for regcomp.
#pragma once

#include <cstdint>

namespace qn::test
{
enum class running_out { once, for_good };

// From now on the allocation with that number, counted from 1 over all threads, fails; and those behind it.
void fail_allocations(uint64_t number, running_out how);
// No allocation fails any more; how many have.
uint64_t stop_failing_allocations();

// Blocks that are allocated and not freed.
uint64_t live_allocations();
} // namespace qn::test
