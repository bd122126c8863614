// The locks that each thread holds, and the check of their order.
#include "trace/files/lock_ranks.h"

#ifdef QN_TR_CHECK_LOCK_ORDER

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>
#include <span>

#include "trace/files/locks.h"

namespace
{
using namespace qn::tr;

struct held_lock {
    const pthread_mutex_t *mutex;
    lock_rank rank;
    int times; // the locks are recursive
};

// There are fewer locks than ranks that one thread may hold in order; those that it only tried for come on top.
constexpr size_t most_held = 16;

struct held_locks {
    std::array<held_lock, most_held> locks;
    size_t count;

    std::span<held_lock> all() { return {locks.data(), count}; }
    held_lock *find(const pthread_mutex_t *mutex)
    {
        const auto found = std::ranges::find(all(), mutex, &held_lock::mutex);
        return found != all().end() ? &*found : nullptr;
    }
};

constinit thread_local held_locks held{};

struct named_mutex {
    const pthread_mutex_t *mutex;
    lock_rank rank;
    const char *name;
};

const named_mutex named[] = {
    {&anchors.anchorMutex, lock_rank::global, "the global mutex"},
    {&spq.mutex, lock_rank::queue, "the spool queue mutex"},
    {&anchor_list_mutex, lock_rank::leaf, "the anchor list mutex"},
    {&component_list_mutex, lock_rank::leaf, "the component list mutex"},
    {&configuration_file_last_modified_mutex, lock_rank::leaf, "the configuration time mutex"},
    {&cluster_info_mutex, lock_rank::leaf, "the cluster info mutex"},
};

named_mutex identify(const pthread_mutex_t *mutex, lock_rank rank)
{
    const auto *found = std::ranges::find(named, mutex, &named_mutex::mutex);
    if (found != std::end(named)) return *found;
    const char *const names[] = {"", "a single file's lock", "a page set's lock", "a page's mutex", "", ""};
    return {mutex, rank, names[static_cast<int>(rank)]};
}

[[noreturn]] void end_program(const named_mutex &wanted, const held_lock &later)
{
    const named_mutex holds = identify(later.mutex, later.rank);
    std::fprintf(stderr, "lock order: a thread takes %s (%p) while it holds %s (%p)\n", wanted.name,
                 static_cast<const void *>(wanted.mutex), holds.name, static_cast<const void *>(holds.mutex));
    std::abort();
}
} // namespace

namespace qn::tr
{
void expect_in_order(const pthread_mutex_t *mutex, lock_rank rank)
{
    if (held.find(mutex) != nullptr) return;
    const named_mutex wanted = identify(mutex, rank);
    for (const held_lock &lock : held.all())
        if (lock.rank >= wanted.rank) end_program(wanted, lock);
}

void note_taken(const pthread_mutex_t *mutex, lock_rank rank)
{
    if (held_lock *again = held.find(mutex)) {
        again->times += 1;
        return;
    }
    if (held.count == most_held) {
        std::fprintf(stderr, "lock order: a thread holds more than %zu locks\n", most_held);
        std::abort();
    }
    held.locks[held.count++] = {mutex, identify(mutex, rank).rank, 1};
}

void note_released(const pthread_mutex_t *mutex)
{
    held_lock *lock = held.find(mutex);
    if (lock == nullptr || --lock->times > 0) return;
    *lock = held.locks[--held.count];
}

void forget_all_taken() { held.count = 0; }
} // namespace qn::tr

#endif
