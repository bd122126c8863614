// The library's locks and the guards that hold them.
//
// Order, from first to last; a thread takes a lock only while it holds none that comes later:
//   1 global mutex            anchors.anchorMutex: components, specifications, starting and stopping of traces
//   2 anchor set lock         one per trace file or page set: the mapping and the ring; who makes a page set of a single
//                             file holds the file's and takes the set's
//   3 a page's anchorMutex    one page of a set, while it is reset or copied
//   4 spool queue mutex       the queue of full pages, and unmapping
//   leaves, under which no other lock is taken:
//     anchor list mutex       insertion into the list of trace files
//     component list mutex    the links of the component list, for the look-ups that hold no global mutex
//     configuration_file_last_modified_mutex
//     cluster info mutex      the cache of the cluster's facts
//
// Builds for finding faults check this order (lock_ranks.h). A lock may be tried for at any time. The first two may be
// biased towards a thread (lock_bias.h), which then writes records without the mutex.
//
// All of them are recursive. A guard releases its lock when it goes out of scope, also when the thread is cancelled:
// cancellation unwinds the stack like an exception. So nothing between a guard and a cancellation point may be noexcept.
// The guards that record writers use are inlined even where the stack is unwound: a call there, with the guard's address,
// would keep the guard in memory for every record.
#pragma once

#include <atomic>
#include <cerrno>
#include <optional>
#include <pthread.h>

#include "trace/files/anchor.h"
#include "trace/files/lock_bias.h"
#include "trace/files/lock_ranks.h"
#include "trace/files/shared_words.h"
#include "trace/spooling/spool_types.h"

// Makes a recursive mutex.
void init_recursive_mutex(pthread_mutex_t *mutex);

// The same for an anchor's or a page set's, which is part of a biased_mutex: it is biased towards nobody.
void init_biased_mutex(pthread_mutex_t *mutex);

// The global mutex; the lock's result, 0 on success.
int lockGlobalMutex(void);
int unlockGlobalMutex(void);

// Unlocks a mutex; what a cancelled holder runs.
void mutex_cleanup(void *mutex);

// The lock of the page set that the anchor belongs to, or of its single file; the lock's result, 0 on success.
int lock_anchor_set(trace_anchor_t *anchor);
int unlock_anchor_set(trace_anchor_t *anchor);

// Unlocks the anchor's set; what a cancelled holder runs.
void cleanup_anchor_set(void *anchor);

extern pthread_mutex_t anchor_list_mutex;
extern pthread_mutex_t component_list_mutex;
extern pthread_mutex_t configuration_file_last_modified_mutex;
extern pthread_mutex_t cluster_info_mutex;

namespace qn::tr
{
// What every guard begins and ends with: tells a signal handler on the same thread that a lock is held, or just being taken
// or released. The locks are recursive and would let the handler in, amid what the thread is doing.
inline biased_thread *enter_guard()
{
    biased_thread *before = this_thread;
    this_thread = &in_a_guard;
    std::atomic_signal_fence(std::memory_order_seq_cst);
    return before;
}
[[gnu::always_inline]] inline void leave_guard(biased_thread *before)
{
    std::atomic_signal_fence(std::memory_order_seq_cst);
    this_thread = before;
}

class guard_mark
{
public:
    guard_mark() = default;
    guard_mark(const guard_mark &) = delete;
    guard_mark &operator=(const guard_mark &) = delete;
    [[gnu::always_inline]] ~guard_mark() { leave_guard(before_); }

private:
    biased_thread *before_ = enter_guard();
};

// Whether the caller, the given thread, interrupts the library: in a guard, or inside by a bias.
inline bool interrupts_a_guard(const biased_thread *self) { return self->inside != nullptr; }

// The locks under which records are written may be biased towards a thread.
constexpr bool may_be_biased(lock_rank rank) { return rank <= lock_rank::set; }

// Takes such a mutex by lock(mutex), when no thread is inside by its bias.
template <class Lock>
inline int lock_for_itself(pthread_mutex_t *mutex, Lock lock)
{
    for (unsigned times = 0;; ++times) {
        const int result = lock(mutex);
        if (__builtin_expect(result != 0, 0) || has_lock(mutex)) return result;
        pthread_mutex_unlock(mutex);
        wait_for_biased(times);
    }
}

// What everything that takes or releases one of the library's mutexes calls: the checked order knows no other. A mutex
// without a name of its own is taken for a page's.
inline int lock_mutex(pthread_mutex_t *mutex, lock_rank rank = lock_rank::page)
{
    expect_in_order(mutex, rank);
    const int result = may_be_biased(rank) ? lock_for_itself(mutex, pthread_mutex_lock) : pthread_mutex_lock(mutex);
    if (result == 0) note_taken(mutex, rank);
    return result;
}
inline int try_mutex(pthread_mutex_t *mutex, lock_rank rank)
{
    int result = pthread_mutex_trylock(mutex);
    if (result == 0 && may_be_biased(rank) && !has_lock(mutex)) {
        pthread_mutex_unlock(mutex);
        result = EBUSY;
    }
    if (result == 0) note_taken(mutex, rank);
    return result;
}
inline int unlock_mutex(pthread_mutex_t *mutex)
{
    note_released(mutex);
    return pthread_mutex_unlock(mutex);
}

// Holds a plain mutex. Test it: a lock that could not be taken is not released.
class mutex_lock
{
public:
    explicit mutex_lock(pthread_mutex_t &mutex, lock_rank rank = lock_rank::page)
        : mutex_(&mutex), result_(lock_mutex(&mutex, rank))
    {
    }
    mutex_lock(const mutex_lock &) = delete;
    mutex_lock &operator=(const mutex_lock &) = delete;
    ~mutex_lock()
    {
        if (result_ == 0) mutex_cleanup(mutex_);
    }
    explicit operator bool() const { return result_ == 0; }
    int result() const { return result_; }

protected:
    using lock_call = int(pthread_mutex_t *, lock_rank);
    mutex_lock(pthread_mutex_t &mutex, lock_rank rank, lock_call *lock) : mutex_(&mutex), result_(lock(&mutex, rank)) {}

private:
    guard_mark mark_;
    pthread_mutex_t *mutex_;
    int result_;
};

// Holds a plain mutex if it is free, or this thread's already; never waits. Test it.
class mutex_try_lock : public mutex_lock
{
public:
    explicit mutex_try_lock(pthread_mutex_t &mutex, lock_rank rank = lock_rank::page)
        : mutex_lock(mutex, rank, &try_mutex)
    {
    }
};

// Holds the global mutex.
class global_lock : public mutex_lock
{
public:
    global_lock() : mutex_lock(anchors.anchorMutex, lock_rank::global) {}
};

// Holds the global mutex, whatever came of locking it; releases it with its scope unless it is to stay locked.
class global_lock_that_may_stay
{
public:
    global_lock_that_may_stay() { lockGlobalMutex(); }
    global_lock_that_may_stay(const global_lock_that_may_stay &) = delete;
    global_lock_that_may_stay &operator=(const global_lock_that_may_stay &) = delete;
    ~global_lock_that_may_stay()
    {
        if (!stays_) unlockGlobalMutex();
    }
    void stay() { stays_ = true; }

private:
    guard_mark mark_;
    bool stays_ = false;
};

// The mutex that is the anchor's set lock right now.
inline pthread_mutex_t *anchor_set_mutex(trace_anchor_t *anchor)
{
    pthread_mutex_t *shared = load_acquire(anchor->pSpoolMutex);
    return shared != nullptr && load_relaxed(anchor->spool) != nullptr ? shared : &anchor->anchorMutex;
}

// Goes on after a try that did not take the mutex: when another thread holds it, tries for some microseconds, which is
// what a record takes, then waits. Any other result of the try is final.
[[gnu::cold]] int lock_busy_mutex(pthread_mutex_t *mutex, int result_of_try);

// pthread_mutex_lock() for a lock that is held for an instant only. With two writers on one trace, to sleep and be woken
// costs many times the record that was waited for.
inline int lock_briefly_held(pthread_mutex_t *mutex)
{
#ifdef __SANITIZE_THREAD__
    return pthread_mutex_lock(mutex); // the order of locks is not learned from trying
#else
    const int result = pthread_mutex_trylock(mutex);
    return __builtin_expect(result == 0, 1) ? 0 : lock_busy_mutex(mutex, result);
#endif
}

inline lock_rank rank_of_set_mutex(const trace_anchor_t *anchor, const pthread_mutex_t *mutex)
{
    return mutex == &anchor->anchorMutex ? lock_rank::file : lock_rank::set;
}

// Takes that mutex and returns it if it is the anchor's set lock. Null when it could not be taken, with the lock's result
// in `result`; or, with 0 there, when it is the right one no more: a start may turn a single file into a page set while a
// thread waits.
[[gnu::always_inline]] inline pthread_mutex_t *take_if_right(trace_anchor_t *anchor, pthread_mutex_t *mutex,
                                                             int &result)
{
    const lock_rank rank = rank_of_set_mutex(anchor, mutex);
    expect_in_order(mutex, rank);
    const int taken = lock_for_itself(mutex, lock_briefly_held);
    if (__builtin_expect(taken != 0, 0)) {
        result = taken;
        return nullptr;
    }
    note_taken(mutex, rank);
    if (__builtin_expect(mutex == anchor_set_mutex(anchor), 1)) return mutex;
    unlock_mutex(mutex);
    return nullptr;
}

// Takes the anchor set lock and returns which mutex that was; null when it could not be taken, with the lock's result in
// `result`.
pthread_mutex_t *take_anchor_set(trace_anchor_t *anchor, int &result);

// Holds an anchor set lock. It releases the mutex that it took, whatever a start made of the anchor meanwhile.
class anchor_set_lock
{
public:
    explicit anchor_set_lock(trace_anchor_t *anchor) : mutex_(take_anchor_set(anchor, result_)) {}
    anchor_set_lock(const anchor_set_lock &) = delete;
    anchor_set_lock &operator=(const anchor_set_lock &) = delete;
    ~anchor_set_lock()
    {
        if (mutex_ != nullptr) unlock_mutex(mutex_);
    }
    explicit operator bool() const { return mutex_ != nullptr; }
    int result() const { return result_; }

private:
    guard_mark mark_;
    int result_ = 0;
    pthread_mutex_t *mutex_;
};

// Holds an anchor set lock to write a record: by a bias, or else by the mutex, and then in a guard.
class writer_lock
{
public:
    [[gnu::always_inline]] explicit writer_lock(trace_anchor_t *anchor, biased_thread *self = this_thread)
        : mutex_(anchor_set_mutex(anchor)), biased_(enter_biased(mutex_, self)), before_(self)
    {
        if (__builtin_expect(biased_ != nullptr, 1)) {
            note_taken(mutex_, rank_of_set_mutex(anchor, mutex_));
            return;
        }
        enter_guard();
        int result = 0;
        mutex_ = take_if_right(anchor, mutex_, result);
        if (__builtin_expect(mutex_ == nullptr && result == 0, 0)) mutex_ = take_anchor_set(anchor, result);
    }
    writer_lock(const writer_lock &) = delete;
    writer_lock &operator=(const writer_lock &) = delete;
    [[gnu::always_inline]] ~writer_lock()
    {
        if (__builtin_expect(biased_ != nullptr, 1)) {
            note_released(mutex_);
            leave_biased(biased_);
            return;
        }
        if (mutex_ != nullptr) unlock_mutex(mutex_);
        leave_guard(before_);
    }
    explicit operator bool() const { return mutex_ != nullptr; }

    // From here on the mutex is held, for what may have to wait; false when it could not be taken.
    bool take_mutex()
    {
        if (biased_ == nullptr) return true;
        before_ = enter_guard();
        if (pthread_mutex_lock(mutex_) != 0) {
            leave_guard(before_);
            return false;
        }
        leave_biased(biased_);
        biased_ = nullptr;
        return true;
    }

private:
    pthread_mutex_t *mutex_;
    biased_thread *biased_;
    biased_thread *before_; // what the guard's end restores, if it is in one
};

// Holds the lock of the page set that a single file may become. Binding the file to a specification makes that one its set
// lock at once: who does so holds it too until the file is ready for whoever comes by the new lock.
class future_set_lock
{
public:
    explicit future_set_lock(const trace_anchor_t *anchor)
    {
        if (anchor->pSpoolMutex != nullptr) take(*anchor->pSpoolMutex);
    }
    void take(pthread_mutex_t &mutex)
    {
        if (!lock_) lock_.emplace(mutex, lock_rank::set);
    }

private:
    std::optional<mutex_lock> lock_;
};

// Makes every lock free again in a forked child, where the threads that held them do not exist, and empties the spool
// queue.
void reset_locks_in_child();
} // namespace qn::tr
