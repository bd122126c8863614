// usleep() of the program, replaced: waiting takes no time, is counted, and can be watched while it lasts.
#pragma once

#include <functional>
#include <vector>

namespace qn::test
{
// Runs in the waiting thread, instead of the n-th sleep (from 1), until the next call of this.
void on_sleep(std::function<void(int)> action);

// The microseconds that were asked for, one entry a sleep.
std::vector<unsigned> sleeps();
} // namespace qn::test
