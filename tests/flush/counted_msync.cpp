#include "flush/counted_msync.h"

#include <cerrno>
#include <mutex>
#include <utility>

namespace
{
std::mutex guard;
std::vector<qn::test::sync_call> calls;
std::function<void()> action;
int calls_to_failure = 0;
int failure = 0;
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
int __real_msync(void *address, size_t bytes, int flags);

int __wrap_msync(void *address, size_t bytes, int flags)
{
    {
        const std::lock_guard lock(guard);
        calls.push_back({address, bytes, flags});
        if (action) action();
        if (calls_to_failure != 0 && --calls_to_failure == 0) {
            errno = failure;
            return -1;
        }
    }
    return __real_msync(address, bytes, flags);
}
}
#pragma GCC visibility pop

namespace qn::test
{
std::vector<sync_call> sync_calls()
{
    const std::lock_guard lock(guard);
    return calls;
}

void clear_sync_calls()
{
    const std::lock_guard lock(guard);
    calls.clear();
}

void fail_sync(int number, int with_errno)
{
    const std::lock_guard lock(guard);
    calls_to_failure = number;
    failure = with_errno;
}

void during_sync(std::function<void()> new_action)
{
    const std::lock_guard lock(guard);
    action = std::move(new_action);
}
} // namespace qn::test
