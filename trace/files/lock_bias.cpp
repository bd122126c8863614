// Granting and revoking what lock_bias.h explains. The mutex of the bias, held by the caller.
#include "trace/files/lock_bias.h"

#include <algorithm>
#include <cerrno>
#include <linux/membarrier.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "trace/files/deadline.h"

namespace qn::tr
{
namespace
{
// To revoke a bias costs what some thousand records by it save. Whenever that happens, twice as many are asked for, up to
// a number that makes it next to nothing.
constexpr qn_uint32_t enough_at_first = 256;
constexpr qn_uint32_t most_that_is_enough = 1U << 16;

bool is_allowed = false;

// Threads that end leave theirs behind, for a later one with the same thread pointer. When all are taken, no lock is
// biased towards further threads.
constinit biased_thread threads[64] = {};

constinit const lock_bias no_lock = {};

// The calling thread's; null when there is none left.
biased_thread *mark_of_this_thread()
{
    const uintptr_t self = own_thread_pointer();
    for (biased_thread &each : threads) {
        uintptr_t taken_by = load_relaxed(each.thread);
        if (taken_by == 0 &&
            __atomic_compare_exchange_n(&each.thread, &taken_by, self, false, __ATOMIC_RELAXED, __ATOMIC_RELAXED))
            return &each;
        if (taken_by == self) return &each;
    }
    return nullptr;
}

// A record writer leaves errno alone.
class errno_kept
{
public:
    errno_kept() : before_(errno) {}
    errno_kept(const errno_kept &) = delete;
    errno_kept &operator=(const errno_kept &) = delete;
    ~errno_kept() { errno = before_; }

private:
    int before_;
};

bool membarrier(int command)
{
    const errno_kept of_caller;
    return syscall(SYS_membarrier, command, 0, 0) == 0;
}

// Signals do not end it. Unlike clock_nanosleep() no cancellation point, as a mutex is none.
void wait(long nanoseconds)
{
    const errno_kept of_caller;
    const timespec end = monotonic_deadline(nanoseconds);
    while (syscall(SYS_clock_nanosleep, CLOCK_MONOTONIC, TIMER_ABSTIME, &end, nullptr) != 0 && errno == EINTR) {
    }
}
} // namespace

constinit biased_thread not_biased = {}, in_a_guard = {0, &no_lock};
constinit thread_local biased_thread *this_thread = &not_biased;

void allow_bias()
{
#ifndef __SANITIZE_THREAD__ // it knows nothing of that barrier
    store_relaxed(is_allowed, membarrier(MEMBARRIER_CMD_REGISTER_PRIVATE_EXPEDITED));
#endif
}

void forget_biased_threads()
{
    for (biased_thread &each : threads) each.inside = nullptr;
}

bool revoke_bias(lock_bias &bias)
{
    const uintptr_t self = own_thread_pointer();
    if (bias.towards != nullptr) {
        if (bias.towards->thread == self) return true;
        bias.leaving = bias.towards;
        store_relaxed(bias.towards, nullptr);
        bias.enough = std::min(2 * bias.enough, most_that_is_enough);
        if (!membarrier(MEMBARRIER_CMD_PRIVATE_EXPEDITED)) { // forbidden meanwhile
            store_relaxed(is_allowed, false);
            wait(1000000); // no store takes that long to be seen
        }
    }
    if (bias.leaving != nullptr && load_acquire(bias.leaving->inside) == &bias) return bias.leaving->thread == self;
    bias.leaving = nullptr;
    bias.holder = self;
    bias.times = 0;
    if (bias.enough == 0) bias.enough = enough_at_first;
    return true;
}

void bias_towards_holder(lock_bias &bias)
{
    bias.times = 0;
    if (!load_relaxed(is_allowed)) return;
    biased_thread *mark = mark_of_this_thread();
    if (mark == nullptr) return;
    bias.holder = 0;
    store_relaxed(bias.towards, mark);
}

void wait_for_biased(unsigned times_before)
{
    constexpr long first_ns = 20000;
    constexpr unsigned most_doublings = 8;
    wait(first_ns << std::min(times_before, most_doublings));
}
} // namespace qn::tr
