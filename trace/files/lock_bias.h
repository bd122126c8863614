// Biased locking: the one thread that writes to a trace need not take its set lock.
//
// The atomic instructions of a mutex are a third of what a record costs, and most traces have one busy writer. So a set
// lock is biased towards a thread that took it many times in a row. To write a record that one marks itself as inside, by
// a plain store, and sees whether the bias is still there. Whoever else wants the lock takes the mutex, and revokes the
// bias first:
//
//   the biased thread                     another one, which has the mutex
//     inside = this lock                    towards = nobody
//     (nothing)                             membarrier(): every running thread of the process passes a full barrier
//     towards still me? or else leave       inside != this lock? or else give the mutex back, and try again
//
// By that barrier one of the two at least sees what the other stored. A system without it has no biased locks.
//
// Inside by a bias, a thread takes no lock and makes no call that waits. For anything else it takes the mutex as well, and
// stays inside until it has it: it is never without the lock. That is why whoever waits for it gives the mutex back
// meanwhile. Only a page of memory that is not there can hold it up inside.
//
// Unlike one who took the mutex, a thread that entered does not look whether that mutex is still the trace's set lock.
// Whoever makes another one the set lock holds this one, and thus has revoked the bias.
//
// Guarded by the mutex that the bias belongs to: all of lock_bias. Each mark is stored by its thread alone.
#pragma once

#include <atomic>
#include <cstdint>
#include <pthread.h>

#include <qn_tr.h>

#include "trace/files/shared_words.h"

namespace qn::tr
{
struct lock_bias;

// A thread that a lock is or was biased towards. It may come to store its mark long after the bias was revoked, when the
// lock is biased towards another: so every thread has a mark of its own, which is never another's before it has ended.
struct alignas(64) biased_thread {
    uintptr_t thread; // its thread pointer
    const lock_bias *inside;
};

// What the calling thread is known by: its own mark, once it has written a record by a bias; before that, `not_biased`.
// In a guard of locks.h, `in_a_guard`, which is always inside. Nobody else reads or stores it, but for a signal handler
// that interrupts the thread, and that leaves it as it was.
extern constinit thread_local biased_thread *this_thread __attribute__((tls_model("initial-exec")));
extern biased_thread not_biased, in_a_guard;

struct lock_bias {
    biased_thread *towards; // null: nobody. Every writer reads it without the mutex
    biased_thread *leaving; // was inside when the bias was revoked
    uintptr_t holder;       // thread pointer of who took the mutex last; 0: nobody yet, or there is a bias to look at
    qn_uint32_t times;      // that it took it in a row, for whatever
    qn_uint32_t enough;     // times for a bias towards it
};

// A mutex whose lock may be biased, as it lies in memory.
struct biased_mutex {
    pthread_mutex_t mutex;
    lock_bias bias;
};

inline lock_bias &bias_of(pthread_mutex_t *mutex) { return reinterpret_cast<biased_mutex *>(mutex)->bias; }

inline uintptr_t own_thread_pointer() { return reinterpret_cast<uintptr_t>(__builtin_thread_pointer()); }

// From now on locks are biased, if the system has that barrier.
void allow_bias();

// In a forked child no other thread is inside of anything.
void forget_biased_threads();

// Enters without the mutex; null when the lock is not biased towards the calling thread, which is given.
[[gnu::always_inline]] inline biased_thread *enter_biased(pthread_mutex_t *mutex, biased_thread *self)
{
    const lock_bias &bias = bias_of(mutex);
    biased_thread *towards = load_relaxed(bias.towards);
    if (__builtin_expect(towards != self, 0)) {
        if (self != &not_biased || towards == nullptr || towards->thread != own_thread_pointer()) return nullptr;
        this_thread = self = towards; // the first time
    }
    store_release(self->inside, &bias); // who waits for it to leave another lock sees all that it did there
    std::atomic_signal_fence(std::memory_order_seq_cst);
    if (__builtin_expect(load_relaxed(bias.towards) == self, 1)) return self;
    store_release(self->inside, nullptr);
    return nullptr;
}

[[gnu::always_inline]] inline void leave_biased(biased_thread *self) { store_release(self->inside, nullptr); }

// For whoever has just taken the mutex: whether it has the lock by that. If not, a thread is inside by its bias: the caller
// gives the mutex back, which it must not have held before, and takes it again after wait_for_biased().
bool revoke_bias(lock_bias &bias);
void bias_towards_holder(lock_bias &bias);
inline bool has_lock(pthread_mutex_t *mutex)
{
    lock_bias &bias = bias_of(mutex);
    if (__builtin_expect(bias.holder != own_thread_pointer(), 0)) return revoke_bias(bias);
    if (__builtin_expect(++bias.times > bias.enough, 0)) bias_towards_holder(bias);
    return true;
}

// Waits for a thread that is inside, a longer time each time: 20 us, which is a long record's, to 5 ms.
void wait_for_biased(unsigned times_before);
} // namespace qn::tr
