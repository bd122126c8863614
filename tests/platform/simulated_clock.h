// A counter and a clock that run in a simulated machine, where the thread loses the processor exactly when it is told
// to. Stands in for read_pair; one per process.
#pragma once

#include <cstdint>
#include <ctime>

#include "platform/cu/clock_pair.h"
#include "platform/cu/kernel_rate.h"

namespace qn::test
{
constexpr uint64_t simulated_khz = 2'445'428;

struct simulated_clock {
    double hz = cu::kernel_tick_rate(simulated_khz);
    double ns = 1e12; // the machine's time
    int readings = 0;
    // Every so many readings the thread loses the processor for that long, between the clock and the counter on one side
    // of it: the middle of the reading is then half that time away from the clock's.
    int pause_every = 0; // 0: never
    bool pause_behind_clock = false;
    int most_pauses = 1'000'000;
    double pause_ns = 0;
    // From this reading on each takes that much longer.
    int wide_from = 1'000'000;
    double wide_ns = 0;
};
inline simulated_clock machine;

inline uint64_t simulated_counter() { return static_cast<uint64_t>(machine.ns / 1e9 * machine.hz); }

inline int read_simulated_pair(clockid_t, cu::clock_pair *pair)
{
    const int reading = ++machine.readings;
    const bool pause = machine.pause_every != 0 && reading % machine.pause_every == 0 && machine.most_pauses-- > 0;
    const uint64_t before = simulated_counter();
    machine.ns += 10 + reading * 7 % 4; // some readings are narrower than others
    if (pause && !machine.pause_behind_clock) machine.ns += machine.pause_ns;
    pair->ns = static_cast<int64_t>(machine.ns);
    machine.ns += 10 + reading * 5 % 3;
    if (reading >= machine.wide_from) machine.ns += machine.wide_ns;
    if (pause && machine.pause_behind_clock) machine.ns += machine.pause_ns;
    const uint64_t behind = simulated_counter();
    pair->width = behind - before;
    pair->counter = before + pair->width / 2;
    return 0;
}
} // namespace qn::test
