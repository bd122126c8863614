// The list of trace files: the default anchor, finding and creating the others, and what an anchor starts with.
#include <atomic>
#include <cstdlib>
#include <memory>
#include <thread>

#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

TEST(DefaultAnchor, StartsUnnamedAndAlone)
{
    EXPECT_EQ(anchors.bInitialized, 0);
    EXPECT_EQ(anchors.bMultipageEnabled, 0);
    EXPECT_EQ(anchors.mapFd, -1);
    EXPECT_EQ(anchors.seqNumber, 1U);
    EXPECT_EQ(anchors.uRequestedFileSize, 65536U);
    EXPECT_EQ(anchors.numAnchors, 1U);
    EXPECT_EQ(anchors.next, nullptr);
    EXPECT_STREQ(anchors.fileName, "");
}

TEST(DefaultAnchor, StartsWithoutMappingListsAndPages)
{
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(anchors.pMapEnd, nullptr);
    EXPECT_EQ(anchors.pNextFree, nullptr);
    EXPECT_EQ(anchors.pWrap, nullptr);
    EXPECT_EQ(anchors.uMaxSize, 0U);
    EXPECT_EQ(anchors.uActualFileSize, 0U);
    EXPECT_EQ(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    EXPECT_EQ(anchors.pLastTraceSpec, nullptr);
    EXPECT_EQ(anchors.pFirstMapSpec, nullptr);
    EXPECT_EQ(anchors.pLastMapSpec, nullptr);
    EXPECT_EQ(anchors.pFirstSpoolSpec, nullptr);
    EXPECT_EQ(anchors.pLastSpoolSpec, nullptr);
    EXPECT_EQ(anchors.alloc_cnt, 0U);
    EXPECT_EQ(anchors.spool, nullptr);
    EXPECT_EQ(anchors.nextPage, nullptr);
    EXPECT_EQ(anchors.bSpoolProcessed, 0);
    EXPECT_EQ(anchors.pSpoolMutex, nullptr);
    EXPECT_EQ(anchors.pActivePg, nullptr);
    EXPECT_EQ(anchors.ppActivePg, nullptr);
    EXPECT_EQ(anchors.consecutiveSpoolNotCopied, 0U);
    EXPECT_EQ(anchors.p_head_spool_anchor, nullptr);
    EXPECT_EQ(anchors.p_obsolete_pages, nullptr);
    EXPECT_EQ(anchors.p_obsolete_pages_tail, nullptr);
}

class AnchorList : public testing::Test
{
protected:
    void SetUp() override { pthread_once(&trace_global_data_once, initialize_trace_global_data); }
};

TEST_F(AnchorList, GivesTheDefaultAnchorForTheEmptyNameAndCreatesNothing)
{
    EXPECT_EQ(findOrCreateAnchorForFile("", 1), &anchors);
    EXPECT_EQ(findOrCreateAnchorForFile("", 0), &anchors);
    EXPECT_EQ(anchors.numAnchors, 1U);
    EXPECT_EQ(anchors.next, nullptr);
}

TEST_F(AnchorList, GivesTheDefaultAnchorForItsOwnName)
{
    qn::tr::set_file_name(&anchors, "/tmp/default");
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/default", 1), &anchors);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST_F(AnchorList, CreatesNothingUnlessAsked)
{
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/a", 0), nullptr);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST_F(AnchorList, FindsWhatItCreated)
{
    trace_anchor_t *created = findOrCreateAnchorForFile("/tmp/a", 1);
    ASSERT_NE(created, nullptr);
    EXPECT_STREQ(created->fileName, "/tmp/a");
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/a", 1), created);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/a", 0), created);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/A", 0), nullptr);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/", 0), nullptr);
    EXPECT_EQ(anchors.numAnchors, 2U);
}

TEST_F(AnchorList, IsOrderedFromTheDefaultAnchorOverTheNewestToTheOldest)
{
    trace_anchor_t *first = findOrCreateAnchorForFile("/tmp/1", 1);
    trace_anchor_t *second = findOrCreateAnchorForFile("/tmp/2", 1);
    trace_anchor_t *third = findOrCreateAnchorForFile("/tmp/3", 1);
    EXPECT_EQ(anchors.numAnchors, 4U);
    EXPECT_EQ(anchors.next, third);
    EXPECT_EQ(third->next, second);
    EXPECT_EQ(second->next, first);
    EXPECT_EQ(first->next, nullptr);
}

TEST_F(AnchorList, KeepsAtMost4095CharactersOfAName)
{
    const std::string name = "/tmp/" + std::string(5000, 'n');
    trace_anchor_t *anchor = findOrCreateAnchorForFile(name.c_str(), 1);
    ASSERT_NE(anchor, nullptr);
    EXPECT_EQ(std::string(anchor->fileName), name.substr(0, 4095));
}

TEST_F(AnchorList, GivesANewAnchorItsDefaults)
{
    const trace_anchor_t *anchor = findOrCreateAnchorForFile("/tmp/a", 1);
    EXPECT_EQ(anchor->uRequestedFileSize, 65536U);
    EXPECT_EQ(anchor->mapFd, -1);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_EQ(anchor->pageSize, sysconf(_SC_PAGESIZE));
}

TEST_F(AnchorList, ReportsThatThereIsNoMemoryForAnAnchor)
{
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/a", 1), nullptr);
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(anchors.numAnchors, 1U);
    EXPECT_EQ(anchors.next, nullptr);
}

// Without its ring of pages, an anchor is what its name says.
TEST_F(AnchorList, DoesNotTakeAFileWithAPagesNameForAPageSet)
{
    const trace_anchor_t *file = findOrCreateAnchorForFile("/tmp/t.1.sp", 1);
    EXPECT_NE(findOrCreateAnchorForFile("/tmp/t", 1), file);
    EXPECT_EQ(anchors.numAnchors, 3U);
}

TEST_F(AnchorList, GrowsByOneForANameThatManyThreadsAskFor)
{
    constexpr int threads = 8;
    constexpr int names = 200;
    std::vector<std::vector<trace_anchor_t *>> found(threads, std::vector<trace_anchor_t *>(names));
    std::atomic<int> ready{0};
    std::vector<std::thread> running;
    for (int t = 0; t < threads; ++t)
        running.emplace_back([&, t] {
            ++ready;
            while (ready.load() < threads) std::this_thread::yield();
            for (int n = 0; n < names; ++n)
                found[t][n] = findOrCreateAnchorForFile(("/tmp/" + std::to_string(n)).c_str(), 1);
        });
    for (std::thread &thread : running) thread.join();

    for (int t = 1; t < threads; ++t) EXPECT_EQ(found[t], found[0]);
    EXPECT_EQ(anchors.numAnchors, 1U + names);
    int listed = 0;
    for (const trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = anchor->next) ++listed;
    EXPECT_EQ(listed, 1 + names);
}

// Every thread has found that the name is new before the first of them inserts it.
TEST_F(AnchorList, GrowsByOneForThreadsThatMissedANameTogether)
{
    constexpr int threads = 8;
    std::atomic<int> missed{0};
    calls().calloc = [&](size_t count, size_t size) {
        ++missed;
        while (missed.load() < threads) std::this_thread::yield();
        return __real_calloc(count, size);
    };
    std::vector<trace_anchor_t *> found(threads);
    std::vector<std::thread> running;
    for (int t = 0; t < threads; ++t)
        running.emplace_back([&, t] { found[t] = findOrCreateAnchorForFile("/tmp/a", 1); });
    for (std::thread &thread : running) thread.join();

    EXPECT_EQ(found, std::vector<trace_anchor_t *>(threads, found[0]));
    EXPECT_NE(found[0], nullptr);
    EXPECT_EQ(anchors.numAnchors, 2U);
    EXPECT_EQ(anchors.next, found[0]);
    EXPECT_EQ(found[0]->next, nullptr);
}

class InitAnchor : public testing::Test
{
protected:
    void SetUp() override
    {
        std::memset(static_cast<void *>(anchor.get()), 0x5A, sizeof *anchor);
        initAnchor(anchor.get());
    }
    void TearDown() override { pthread_mutex_destroy(&anchor->anchorMutex); }

    std::unique_ptr<trace_anchor_t> anchor = std::make_unique<trace_anchor_t>();
};

TEST_F(InitAnchor, SetsNameSizesAndCounters)
{
    EXPECT_EQ(anchor->bMultipageEnabled, 0);
    EXPECT_EQ(anchor->mapFd, -1);
    EXPECT_EQ(anchor->uRequestedFileSize, 65536U);
    EXPECT_STREQ(anchor->fileName, "");
    EXPECT_EQ(anchor->uActualFileSize, 0U);
    EXPECT_EQ(anchor->uMaxSize, 0U);
    EXPECT_EQ(anchor->numAnchors, 0U);
    EXPECT_EQ(anchor->alloc_cnt, 0U);
    EXPECT_EQ(anchor->bSpoolProcessed, 0);
    EXPECT_EQ(anchor->consecutiveSpoolNotCopied, 0U);
    EXPECT_EQ(anchor->pageSize, sysconf(_SC_PAGESIZE));
}

TEST_F(InitAnchor, ClearsEveryPointer)
{
    EXPECT_EQ(anchor->pFirstComp, nullptr);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_EQ(anchor->pMapEnd, nullptr);
    EXPECT_EQ(anchor->pNextFree, nullptr);
    EXPECT_EQ(anchor->pWrap, nullptr);
    EXPECT_EQ(anchor->pFirstTraceSpec, nullptr);
    EXPECT_EQ(anchor->pLastTraceSpec, nullptr);
    EXPECT_EQ(anchor->pFirstMapSpec, nullptr);
    EXPECT_EQ(anchor->pLastMapSpec, nullptr);
    EXPECT_EQ(anchor->pFirstSpoolSpec, nullptr);
    EXPECT_EQ(anchor->pLastSpoolSpec, nullptr);
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(anchor->nextPage, nullptr);
    EXPECT_EQ(anchor->pSpoolMutex, nullptr);
    EXPECT_EQ(anchor->pActivePg, nullptr);
    EXPECT_EQ(anchor->ppActivePg, nullptr);
    EXPECT_EQ(anchor->p_head_spool_anchor, nullptr);
    EXPECT_EQ(anchor->p_obsolete_pages, nullptr);
    EXPECT_EQ(anchor->p_obsolete_pages_tail, nullptr);
}

TEST_F(InitAnchor, LeavesSequenceLinkStateAndBufferAlone)
{
    EXPECT_EQ(anchor->seqNumber, 0x5A5A5A5AU);
    EXPECT_EQ(anchor->bInitialized, 0x5A5A5A5A);
    EXPECT_EQ(reinterpret_cast<uintptr_t>(anchor->next), 0x5A5A5A5A5A5A5A5AU);
    EXPECT_EQ(std::string(anchor->buffer, sizeof anchor->buffer), std::string(1024, '\x5A'));
}

TEST_F(InitAnchor, MakesARecursiveMutex)
{
    EXPECT_EQ(pthread_mutex_lock(&anchor->anchorMutex), 0);
    EXPECT_EQ(pthread_mutex_lock(&anchor->anchorMutex), 0);
    EXPECT_FALSE(is_free(anchor->anchorMutex));
    pthread_mutex_unlock(&anchor->anchorMutex);
    EXPECT_FALSE(is_free(anchor->anchorMutex));
    pthread_mutex_unlock(&anchor->anchorMutex);
    EXPECT_TRUE(is_free(anchor->anchorMutex));
}

TEST(InitDefaultAnchor, KeepsTheGlobalMutexAsItIs)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    ASSERT_EQ(lockGlobalMutex(), 0);
    initAnchor(&anchors);
    EXPECT_FALSE(is_free(anchors.anchorMutex));
    EXPECT_EQ(unlockGlobalMutex(), 0);
}
} // namespace
