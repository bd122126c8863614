// Every msync() of the program, written down before it is made. A program linked with this file needs the linker's
// --wrap=msync.
#pragma once

#include <cstddef>
#include <functional>
#include <ostream>
#include <vector>

namespace qn::test
{
struct sync_call {
    const void *address;
    size_t bytes;
    int flags;
    bool operator==(const sync_call &) const = default;
};

inline std::ostream &operator<<(std::ostream &out, const sync_call &call)
{
    return out << call.address << '+' << call.bytes << " flags " << call.flags;
}

std::vector<sync_call> sync_calls(); // since the program started, or the last clear
void clear_sync_calls();

// The call with that number (counted from 1, from now on) fails with that errno.
void fail_sync(int number, int with_errno);

// What to do inside each call.
void during_sync(std::function<void()> action);
} // namespace qn::test
