#include "spooling/live_slow_disk.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <sched.h>
#include <sys/types.h>

namespace
{
std::atomic<bool> is_slow{false};
constexpr size_t most_at_once = 5000; // bytes
constexpr int turns_given = 50;       // turns that others get before a write is done
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
ssize_t __real_write(int fd, const void *bytes, size_t count);
ssize_t __wrap_write(int fd, const void *bytes, size_t count)
{
    if (!is_slow || count <= 1) return __real_write(fd, bytes, count);
    for (int i = 0; i < turns_given; ++i) sched_yield();
    return __real_write(fd, bytes, std::min(count, most_at_once));
}
}
#pragma GCC visibility pop

namespace qn::test
{
slow_disk::slow_disk() { is_slow = true; }
slow_disk::~slow_disk() { is_slow = false; }
} // namespace qn::test
