// Granting and revoking what lock_bias.h explains. The mutex of the bias, held by the caller.
#include "trace/files/lock_bias.h"

#include <algorithm>
#include <ctime>
#include <linux/membarrier.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace qn::tr
{
namespace
{
// To revoke a bias costs some hundred times what a record by a bias is cheaper. Twice as many records are asked for each
// time that another writer came by, up to a number that makes this nothing.
constexpr qn_uint32_t enough_at_first = 256;
constexpr qn_uint32_t most_that_is_enough = 1U << 20;

bool is_allowed = false;

// Threads that end leave theirs behind, for a later one with the same thread pointer. When all are taken, the locks of
// further threads are not biased.
constinit biased_thread threads[64];

int membarrier(int command) { return static_cast<int>(syscall(SYS_membarrier, command, 0, 0)); }

// The calling thread's; null when there is none left.
biased_thread *own_mark()
{
    const uintptr_t self = own_thread_pointer();
    for (biased_thread &each : threads) {
        uintptr_t expected = 0;
        if (load_relaxed(each.thread) == self) return &each;
        if (__atomic_compare_exchange_n(&each.thread, &expected, self, false, __ATOMIC_RELAXED, __ATOMIC_RELAXED))
            return &each;
    }
    return nullptr;
}

void wait(long nanoseconds)
{
    const timespec time{0, nanoseconds};
    syscall(SYS_nanosleep, &time, nullptr); // unlike nanosleep() no cancellation point, as a mutex is none
}
} // namespace

void allow_bias()
{
#ifndef __SANITIZE_THREAD__ // it knows nothing of that barrier
    store_relaxed(is_allowed, membarrier(MEMBARRIER_CMD_REGISTER_PRIVATE_EXPEDITED) == 0);
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
        if (membarrier(MEMBARRIER_CMD_PRIVATE_EXPEDITED) != 0) { // forbidden meanwhile
            store_relaxed(is_allowed, false);
            wait(1000000); // no store takes that long to be seen
        }
    }
    if (bias.leaving != nullptr && bias.leaving->thread != self && load_acquire(bias.leaving->inside) == &bias)
        return false;
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
    biased_thread *mark = own_mark();
    if (mark == nullptr) return;
    bias.holder = 0;
    store_relaxed(bias.towards, mark);
}

void wait_for_biased() { wait(20000); }
} // namespace qn::tr
