// The oldest element leaves the queue and is copied: what becomes of the page, the file and the element.
#include <cstring>
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "files/page_set.h"
#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

constexpr uint8_t full = 2;
constexpr uint8_t ready = 4;

class SpoolOldest : public PageSet
{
protected:
    void SetUp() override
    {
        std::filesystem::create_directory(copies);
        std::strcpy(spool.dest, copies.c_str());
        spool.dir = spool.dest;
        ASSERT_EQ(start_set("t", 3), 0);
    }

    void enqueue(int number)
    {
        page(number)->pMap[192] = full;
        spool_enqueue(nullptr, nullptr, page(number), &spq, 0);
    }
    void enqueue_file(const char *dest, int del)
    {
        write_file(file, "contents");
        spool_enqueue(file.c_str(), dest, nullptr, &spq, del);
    }
    static void spool_oldest()
    {
        const qn::tr::mutex_lock inside(spq.mutex);
        spool_dequeue_last_and_spool_inside_spq(&spq);
    }
    uint8_t state(int number) const { return page(number)->pMap[192]; }

    std::string copies = folder / "copies";
    std::string file = folder / "f";
};

TEST_F(SpoolOldest, CopiesThePageAndMakesItReady)
{
    enqueue(2);
    spool_oldest();
    const auto names = entries_of(copies);
    ASSERT_EQ(names.size(), 1U);
    EXPECT_EQ(names[0].rfind("t.2.sp.", 0), 0U) << names[0];
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_EQ(spq.pFirst, nullptr);
}

TEST_F(SpoolOldest, CopiesOneElementEachTime)
{
    enqueue(2);
    enqueue(3);
    spool_oldest();
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(state(3), full);
    EXPECT_EQ(spq.cnt, 1);
    spool_oldest();
    EXPECT_EQ(state(3), ready);
    EXPECT_EQ(entries_of(copies).size(), 2U);
}

TEST_F(SpoolOldest, MakesThePageReadyEvenIfItCannotBeCopied)
{
    std::filesystem::remove(copies);
    enqueue(2);
    spool_oldest();
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_FALSE(exists(copies));
}

TEST_F(SpoolOldest, MakesThePageReadyWithoutACopyWhenItIsToBeRecycled)
{
    std::strcpy(spool.dest, "/dev/null");
    enqueue(2);
    spool_oldest();
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_TRUE(entries_of(copies).empty());
}

TEST_F(SpoolOldest, RemovesAFileThatIsToBeRemoved)
{
    enqueue_file(copies.c_str(), 1);
    spool_oldest();
    const auto names = entries_of(copies);
    ASSERT_EQ(names.size(), 1U);
    EXPECT_EQ(file_bytes(copies + "/" + names[0]), "contents");
    EXPECT_FALSE(exists(file));
    EXPECT_EQ(spq.cnt, 0);
}

TEST_F(SpoolOldest, KeepsAFileThatIsNotToBeRemoved)
{
    for (const int del : {0, 2, -1}) {
        enqueue_file(copies.c_str(), del);
        spool_oldest();
        EXPECT_TRUE(exists(file)) << del;
    }
    EXPECT_EQ(entries_of(copies).size(), 3U);
}

TEST_F(SpoolOldest, RemovesAFileThatIsToBeRemovedWithoutACopy)
{
    enqueue_file("/dev/null", 1);
    spool_oldest();
    EXPECT_FALSE(exists(file));
    EXPECT_TRUE(entries_of(copies).empty());
}

TEST_F(SpoolOldest, RemovesAFileEvenIfItCannotBeCopied)
{
    const std::string missing = folder / "missing";
    enqueue_file(missing.c_str(), 1);
    spool_oldest();
    EXPECT_FALSE(exists(file));
    EXPECT_FALSE(exists(missing));
}

TEST_F(SpoolOldest, DoesNothingWithAnEmptyQueue)
{
    debug_on();
    spool_oldest();
    EXPECT_TRUE(system_log().empty());
    EXPECT_EQ(spq.cnt, 0);
}

TEST_F(SpoolOldest, TellsThatAPageIsOut)
{
    enqueue(2);
    debug_on();
    spool_oldest();
    EXPECT_TRUE(system_log_has(LOG_WARNING, std::string(page(2)->fileName) + " removed from queue (trace file)\n"));
}

TEST_F(SpoolOldest, TellsThatAFileIsOut)
{
    enqueue_file(copies.c_str(), 0);
    debug_on();
    spool_oldest();
    EXPECT_TRUE(system_log_has(LOG_WARNING, file + " removed from queue (other file)\n"));
}

TEST_F(SpoolOldest, TellsThatAPageIsOutThatCouldNotBeCopied)
{
    std::filesystem::remove(copies);
    enqueue(2);
    debug_on();
    spool_oldest();
    EXPECT_TRUE(system_log_has(std::string(page(2)->fileName) + " removed from queue (trace file)\n"));
}

// A stop takes the page out before its mapping goes.
TEST_F(SpoolOldest, HasNothingToDoForAPageThatWasStopped)
{
    enqueue(2);
    enqueue(3);
    {
        const qn::tr::anchor_set_lock set(head);
        ASSERT_EQ(stop_trace_page(page(2), 0), 0);
    }
    EXPECT_EQ(spq.cnt, 1);
    spool_oldest();
    const auto names = entries_of(copies);
    ASSERT_EQ(names.size(), 1U);
    EXPECT_EQ(names[0].rfind("t.3.sp.", 0), 0U) << names[0];
}
} // namespace
