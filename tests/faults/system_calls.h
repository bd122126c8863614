// The system calls of a process, one by one: counted, made to fail, or its last. The kernel stops the process at each of
// them (ptrace), whoever makes it: the library, the C library in its name, the main thread or the spool thread.
#pragma once

#include <functional>
#include <sys/types.h>
#include <vector>

#include "faults/aftermath.h"

namespace qn::test
{
// What happens at one of the system calls of the watched stretch; they are counted from 1.
struct intervention {
    enum kind { nothing, fails, is_cut_short, kills_before, kills_behind };

    kind what = nothing;
    uint64_t number = 0;
    int error = 0;
};

// A system call that came back.
struct returned_call {
    long number;
    uint64_t arguments[6];
    int64_t result;
};

// A process that was watched.
struct watched {
    bool possible = true;                // false: no process may be traced here
    std::vector<long> calls;             // of the stretch, without those that no file or memory depends on
    std::vector<returned_call> returned; // of the stretch, all of them
    bool intervened = false;
    int ended_by = 0; // wait status
};

// Runs the body in a forked process. What lies between begin_watching() and end_watching() in it is watched.
watched watch(const std::function<void()> &body, const intervention &with);
void begin_watching();
void end_watching();

// Waiting, locking, giving memory back, signals and ends of threads: their failing would be the kernel's, and nothing in a
// program is prepared for it.
bool is_watched(long number);

// Reads and writes, which may transfer less than was asked for.
bool can_be_cut_short(long number);

// An attack that only marks the watched stretch.
attack watching();

// Plays an attacked call in a watched process.
aftermath play_watched(const attacked_call &call, const intervention &with, watched &process);
} // namespace qn::test
