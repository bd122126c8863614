// The check of the lock order: it lets every order pass that locks.h allows, and ends a program that takes any other.
#include <functional>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "trace/trace.h"

#ifndef QN_TR_CHECK_LOCK_ORDER
#error "for builds that check the order of locks"
#endif

namespace
{
using namespace qn::tr;

// A lock, and what runs while a thread holds it.
struct lock {
    const char *name;
    int rank;
    std::function<void(const std::function<void()> &)> hold;
};

lock named(const char *name, int rank, pthread_mutex_t &mutex)
{
    return {name, rank, [&mutex](const std::function<void()> &body) {
                const mutex_lock guard(mutex);
                body();
            }};
}

lock set_of(const char *file_name)
{
    trace_anchor_t *anchor = findOrCreateAnchorForFile(file_name, 1);
    return {"a single file.s lock", 2, [anchor](const std::function<void()> &body) {
                const anchor_set_lock guard(anchor);
                body();
            }};
}

const lock global_mutex{"the global mutex", 1, [](const std::function<void()> &body) {
                            const global_lock guard;
                            body();
                        }};

class LockOrder : public testing::Test
{
protected:
    LockOrder()
    {
        pthread_once(&trace_global_data_once, initialize_trace_global_data);
        for (pthread_mutex_t &page : pages_) init_recursive_mutex(&page);
        all = {global_mutex,
               set_of("/first.trc"),
               set_of("/second.trc"),
               named("a page's mutex", 3, pages_[0]),
               named("a page's mutex", 3, pages_[1]),
               named("the spool queue mutex", 4, spq.mutex),
               named("the anchor list mutex", 5, anchor_list_mutex),
               named("the component list mutex", 5, component_list_mutex),
               named("the configuration time mutex", 5, configuration_file_last_modified_mutex),
               named("the cluster info mutex", 5, cluster_info_mutex)};
    }
    ~LockOrder() override
    {
        for (pthread_mutex_t &page : pages_) pthread_mutex_destroy(&page);
    }

    std::vector<lock> all;
    const lock queue_mutex = named("the spool queue mutex", 4, spq.mutex);

private:
    pthread_mutex_t pages_[2];
};

TEST_F(LockOrder, LetsEachLockBeTakenUnderThoseBeforeIt)
{
    for (const lock &first : all)
        for (const lock &second : all) {
            if (first.rank >= second.rank) continue;
            bool taken = false;
            first.hold([&] { second.hold([&] { taken = true; }); });
            EXPECT_TRUE(taken);
        }
}

TEST_F(LockOrder, EndsAProgramThatTakesALockUnderOneThatComesLaterOrAnotherOfItsKind)
{
    unsigned caught = 0;
    for (const lock &first : all)
        for (const lock &second : all) {
            if (first.rank < second.rank || &first == &second) continue;
            EXPECT_DEATH(first.hold([&] { second.hold([] {}); }),
                         std::string("takes ") + second.name + ".* while it holds " + first.name);
            ++caught;
        }
    qn::test::count("Planted harm is found", "rounds", caught);
}

TEST_F(LockOrder, LetsAThreadTakeALockThatItHolds)
{
    for (const lock &first : all)
        for (const lock &second : all)
            if (first.rank < second.rank) first.hold([&] { second.hold([&] { first.hold([] {}); }); });
}

TEST_F(LockOrder, CountsALockAsHeldUntilItsLastRelease)
{
    EXPECT_DEATH(queue_mutex.hold([&] {
        queue_mutex.hold([] {});
        global_mutex.hold([] {});
    }),
                 "takes the global mutex.* while it holds the spool queue mutex");
}

TEST_F(LockOrder, LetsAThreadTryForAnyLock)
{
    queue_mutex.hold([] { EXPECT_TRUE(mutex_try_lock(anchors.anchorMutex)); });
}

TEST_F(LockOrder, CountsALockThatWasTriedForAsHeld)
{
    EXPECT_DEATH(
        {
            const mutex_try_lock queue(spq.mutex);
            global_mutex.hold([] {});
        },
        "takes the global mutex.* while it holds the spool queue mutex");
}

TEST_F(LockOrder, ForgetsALockThatWasReleased)
{
    queue_mutex.hold([] {});
    EXPECT_TRUE(global_lock());
}

TEST_F(LockOrder, HoldsForTheCallsWithoutAGuard)
{
    trace_anchor_t *anchor = findOrCreateAnchorForFile("/first.trc", 1);
    EXPECT_DEATH(queue_mutex.hold([] { lockGlobalMutex(); }), "takes the global mutex");
    EXPECT_DEATH(queue_mutex.hold([&] { lock_anchor_set(anchor); }), "takes a single file.s lock");
    EXPECT_DEATH(
        {
            lock_anchor_set(anchor);
            lockGlobalMutex();
        },
        "while it holds a single file.s lock");
    ASSERT_EQ(lock_anchor_set(anchor), 0);
    ASSERT_EQ(unlock_anchor_set(anchor), 0);
    ASSERT_EQ(lockGlobalMutex(), 0);
    EXPECT_EQ(unlockGlobalMutex(), 0);
}

TEST_F(LockOrder, IsThatOfEachThreadByItself)
{
    const mutex_lock queue(spq.mutex);
    bool taken = false;
    std::thread([&] { global_mutex.hold([&] { taken = true; }); }).join();
    EXPECT_TRUE(taken);
}

TEST_F(LockOrder, BeginsAnewInAForkedChildWhoseLocksAreFree)
{
    const mutex_lock queue(spq.mutex);
    const pid_t child = fork();
    if (child == 0) {
        const global_lock global;
        _exit(global ? 0 : 1);
    }
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_EQ(status, 0);
}
} // namespace
