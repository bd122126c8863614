// The library's locks: recursive, shared by the pages of a set, and free again when their holder is cancelled.
#include <cerrno>

#include <gtest/gtest.h>

#include "files/support_files.h"
#include "trace/spooling/spool_types.h"

namespace
{
using namespace qn::test;

class Mutexes : public testing::Test
{
protected:
    void SetUp() override { pthread_once(&trace_global_data_once, initialize_trace_global_data); }
};

void expect_recursive(pthread_mutex_t &mutex)
{
    EXPECT_EQ(pthread_mutex_lock(&mutex), 0);
    EXPECT_EQ(pthread_mutex_trylock(&mutex), 0);
    EXPECT_FALSE(is_free(mutex));
    pthread_mutex_unlock(&mutex);
    pthread_mutex_unlock(&mutex);
    EXPECT_TRUE(is_free(mutex));
}

TEST_F(Mutexes, AreAllRecursive)
{
    expect_recursive(anchors.anchorMutex);
    expect_recursive(anchor_list_mutex);
    expect_recursive(configuration_file_last_modified_mutex);
    expect_recursive(spq.mutex);
}

TEST(RecursiveMutex, IsMadeFromRawMemory)
{
    pthread_mutex_t mutex;
    std::memset(static_cast<void *>(&mutex), 0x5A, sizeof mutex);
    init_recursive_mutex(&mutex);
    expect_recursive(mutex);
    pthread_mutex_destroy(&mutex);
}

TEST_F(Mutexes, OfTheDefaultAnchorIsTheGlobalOne)
{
    EXPECT_EQ(lockGlobalMutex(), 0);
    EXPECT_FALSE(is_free(anchors.anchorMutex));
    EXPECT_EQ(unlockGlobalMutex(), 0);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST_F(Mutexes, TellWhyTheyCannotBeLocked)
{
    {
        const exhausted_mutex global(anchors.anchorMutex);
        EXPECT_EQ(lockGlobalMutex(), EAGAIN);
        EXPECT_EQ(lock_anchor_set(&anchors), EAGAIN);
    }
    EXPECT_EQ(lockGlobalMutex(), 0);
    EXPECT_EQ(unlockGlobalMutex(), 0);
}

TEST_F(Mutexes, AreReleasedByTheirCleanUp)
{
    ASSERT_EQ(pthread_mutex_lock(&anchor_list_mutex), 0);
    mutex_cleanup(&anchor_list_mutex);
    EXPECT_TRUE(is_free(anchor_list_mutex));
}

// A page set of two pages, made by hand.
class AnchorSet : public testing::Test
{
protected:
    void SetUp() override
    {
        init_biased_mutex(&shared);
        head = anchor_for("/tmp/t.1.sp");
        head->spool = &spool;
        head->pSpoolMutex = &shared;
        page = getSplAnchor(head, "/tmp/t.2.sp");
        head->nextPage = page;
        page->nextPage = head;
        spool.onoff = 1;
        spool.pages = 2;
    }

    trace_spool_spec_t spool{};
    qn::tr::biased_mutex shared_lock;
    pthread_mutex_t &shared = shared_lock.mutex;
    trace_anchor_t *head = nullptr;
    trace_anchor_t *page = nullptr;
};

TEST_F(AnchorSet, IsLockedAsAWholeThroughAnyOfItsPages)
{
    for (trace_anchor_t *anchor : {head, page}) {
        EXPECT_EQ(lock_anchor_set(anchor), 0);
        EXPECT_FALSE(is_free(shared));
        EXPECT_TRUE(is_free(head->anchorMutex));
        EXPECT_TRUE(is_free(page->anchorMutex));
        EXPECT_EQ(unlock_anchor_set(anchor), 0);
        EXPECT_TRUE(is_free(shared));
    }
}

TEST_F(AnchorSet, IsLockedByTheOwnMutexWithoutSpecification)
{
    head->spool = nullptr;
    EXPECT_EQ(lock_anchor_set(head), 0);
    EXPECT_TRUE(is_free(shared));
    EXPECT_FALSE(is_free(head->anchorMutex));
    EXPECT_EQ(unlock_anchor_set(head), 0);
    EXPECT_TRUE(is_free(head->anchorMutex));
}

TEST_F(AnchorSet, IsLockedByTheOwnMutexWithoutASharedOne)
{
    head->pSpoolMutex = nullptr;
    EXPECT_EQ(lock_anchor_set(head), 0);
    EXPECT_TRUE(is_free(shared));
    EXPECT_FALSE(is_free(head->anchorMutex));
    EXPECT_EQ(unlock_anchor_set(head), 0);
    EXPECT_TRUE(is_free(head->anchorMutex));
}

TEST_F(AnchorSet, IsReleasedByItsCleanUp)
{
    ASSERT_EQ(lock_anchor_set(page), 0);
    cleanup_anchor_set(page);
    EXPECT_TRUE(is_free(shared));
}

TEST_F(AnchorSet, IsFreeAfterItsHolderWasCancelled)
{
    cancelled_thread thread;
    EXPECT_TRUE(thread.run([&] {
        const qn::tr::anchor_set_lock set(page);
        EXPECT_TRUE(static_cast<bool>(set));
        thread.block();
    }));
    EXPECT_TRUE(is_free(shared));
}

TEST_F(AnchorSet, IsFreeAfterACancelledHolderRanTheCleanUp)
{
    cancelled_thread thread;
    EXPECT_TRUE(thread.run([&] {
        EXPECT_EQ(lock_anchor_set(head), 0);
        pthread_cleanup_push(cleanup_anchor_set, head);
        thread.block();
        pthread_cleanup_pop(0);
    }));
    EXPECT_TRUE(is_free(shared));
}

TEST_F(AnchorSet, IsReleasedWithTheMutexThatWasTakenWhenAStartMadeItASet)
{
    head->spool = nullptr;
    {
        const qn::tr::anchor_set_lock set(head);
        head->spool = &spool;
    }
    EXPECT_TRUE(is_free(head->anchorMutex));
    EXPECT_TRUE(is_free(shared));
}

TEST_F(Mutexes, AreFreeAfterTheirHolderWasCancelled)
{
    cancelled_thread thread;
    EXPECT_TRUE(thread.run([&] {
        const qn::tr::global_lock global;
        const qn::tr::mutex_lock queue(spq.mutex);
        const qn::tr::mutex_lock list(anchor_list_mutex);
        thread.block();
    }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(anchor_list_mutex));
    EXPECT_TRUE(is_free(spq.mutex));
}
} // namespace
