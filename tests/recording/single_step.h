// A call that is made one instruction at a time: the kernel stops the calling process behind each of them (ptrace).
#pragma once

#include <cstdint>
#include <functional>

namespace qn::test
{
struct stepped {
    bool possible = true; // false: no process may be traced here
    uint64_t instructions = 0;
    int ended_by = 0; // wait status; 0: the call returned 0
};

// In a forked process: prepares, is left alone for as long as `begins` looks at what is there, and makes the call,
// whose result is its exit status. `behind_each` runs in this process, behind each instruction.
stepped single_step(const std::function<void()> &prepare, const std::function<int32_t()> &call,
                    const std::function<void()> &begins, const std::function<void()> &behind_each);
} // namespace qn::test
