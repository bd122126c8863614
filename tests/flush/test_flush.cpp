// Flushing: which mappings are synced, with which flags, in which order, and what ends the walk.
#include <cerrno>

#include <cu_tr_proxy.h>
#include <gtest/gtest.h>
#include <sys/mman.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "components/page_set.h"
#include "flush/counted_msync.h"
#include "support/scratch.h"
#include "support/system_log.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

using calls = std::vector<sync_call>;

sync_call sync_of(const trace_anchor_t *page, int flags = MS_SYNC)
{
    EXPECT_NE(page->pMap, nullptr) << page->fileName;
    return {page->pMap, page->uActualFileSize, flags};
}

outcome msync_failure(int error)
{
    return failure(32, 32,
                   "2625-031 Error " + std::to_string(error) +
                       " was returned from msync() attempting to flush trace file.\n");
}

// The default file, a page set of three and a single file, all of them started; and one that is not.
class Flush : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(tr_set_filename_1((files / "default.trc").c_str()), 0);
        ASSERT_EQ(tr_set_file_size_1((files / "single.trc").c_str(), 8192), 0);
        single = findOrCreateAnchorForFile((files / "single.trc").c_str(), 0);
        head = make_page_set(files / "paged", 3, 16384);
        ASSERT_EQ(made.register_now(), 0);
        pages = pages_of(head);
        idle = findOrCreateAnchorForFile((files / "idle.trc").c_str(), 1);
        ASSERT_EQ(idle->pMap, nullptr);
        clear_sync_calls();
    }
    void TearDown() override { during_sync({}); }

    // In the order of the list: the default file, then the newest first.
    calls all_pages(int flags = MS_SYNC) const
    {
        return {sync_of(&anchors, flags), sync_of(pages[0], flags), sync_of(pages[1], flags), sync_of(pages[2], flags),
                sync_of(single, flags)};
    }

    const scratch files;
    client made{"ABCD"};
    trace_anchor_t *single = nullptr;
    trace_anchor_t *head = nullptr;
    trace_anchor_t *idle = nullptr;
    std::vector<trace_anchor_t *> pages;
};

TEST_F(Flush, SyncsTheWholeOfEveryMappedPageAndWaits)
{
    leave_marker();
    EXPECT_EQ(after(tr_flush_1()), success());
    EXPECT_EQ(sync_calls(), all_pages());
}

TEST_F(Flush, IsWhatTheCommonUtilitiesReachThroughTheProxy)
{
    EXPECT_EQ(cu_trp_flush_1(), 0);
    EXPECT_EQ(sync_calls(), all_pages());
}

TEST_F(Flush, EndsAtThePageThatCannotBeSynced)
{
    fail_sync(3, EIO);
    EXPECT_EQ(after(tr_flush_1()), msync_failure(EIO));
    const calls all = all_pages();
    EXPECT_EQ(sync_calls(), calls(all.begin(), all.begin() + 3));
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST_F(Flush, KeepsTheErrorOfThePageThatCannotBeSyncedWhilePagesArePinned)
{
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    fail_sync(3, EIO);
    EXPECT_EQ(after(tr_flush_1()), msync_failure(EIO));
}

TEST_F(Flush, TouchesThePagesThatArePinnedEvenIfOneCannotBeSynced)
{
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    fail_sync(1, EIO);
    global_debug_level = 8;
    EXPECT_EQ(tr_flush_1(), 32);
    EXPECT_TRUE(system_log_has("load_trace_pages_to_memory Entered\n"));
    EXPECT_TRUE(
        system_log_has("\ttrace: Load all part of the pages to bring into memory (" + (files / "single.trc") + ")\n"));
    EXPECT_TRUE(system_log_has("load_trace_pages_to_memory() Leaving, rc=0\n"));
}

// A writer may have found its trace damaged, and have begun to start it afresh.
TEST_F(Flush, TakesNoNoticeOfAPageThatIsUnmappedMeanwhile)
{
    const calls all = all_pages();
    int syncs = 0;
    during_sync([&] {
        if (++syncs == 2) stop_trace_page(pages[0], 1);
    });
    fail_sync(2, ENOMEM);
    leave_marker();
    EXPECT_EQ(after(tr_flush_1()), success());
    EXPECT_EQ(sync_calls(), all);
}

TEST_F(Flush, GoesOnBehindAPageThatCannotBeSyncedWhenErrorsAreIgnored)
{
    fail_sync(3, EIO);
    leave_marker();
    EXPECT_EQ(after(msync_trace_pages(1, MS_ASYNC, 1)), success());
    EXPECT_EQ(sync_calls(), all_pages(MS_ASYNC));
}

TEST_F(Flush, ReachesTheActivePagesAloneWhenAskedTo)
{
    head->pActivePg = pages[1];
    EXPECT_EQ(after(msync_trace_pages(0, MS_ASYNC, 0)), success());
    EXPECT_EQ(sync_calls(), (calls{sync_of(pages[1], MS_ASYNC)})) << "a single file has no active page";
}

TEST_F(Flush, ReportsTheActivePageThatCannotBeSynced)
{
    fail_sync(1, ENOMEM);
    EXPECT_EQ(after(msync_trace_pages(0, MS_SYNC, 0)), msync_failure(ENOMEM));
}

TEST_F(Flush, LeavesAnActivePageAloneThatIsNotMapped)
{
    head->pActivePg = pages[1];
    ASSERT_EQ(stop_trace_page(pages[1], 1), 0);
    clear_sync_calls();
    EXPECT_EQ(after(msync_trace_pages(0, MS_SYNC, 0)), success());
    EXPECT_EQ(sync_calls(), calls{});
}

TEST_F(Flush, EndsBetweenPagesWhenTracingIsStopped)
{
    int syncs = 0;
    during_sync([&syncs] {
        if (++syncs == 2) global_stop_trace();
    });
    EXPECT_EQ(tr_flush_1(), 0);
    const calls all = all_pages();
    EXPECT_EQ(sync_calls(), calls(all.begin(), all.begin() + 2));
}

TEST_F(Flush, StillSyncsTheDefaultFileOnceTracingIsStopped)
{
    global_stop_trace();
    EXPECT_EQ(after(tr_flush_1()), success());
    EXPECT_EQ(sync_calls(), (calls{sync_of(&anchors)}));
}

TEST_F(Flush, FailsWhenTheGlobalMutexCannotBeTaken)
{
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(tr_flush_1());
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(sync_calls(), calls{});
}

TEST_F(Flush, LeavesTheMutexFreeWhenTheThreadIsCancelledInIt)
{
    ASSERT_TRUE(is_cancelled_in([] { tr_flush_1(); }));
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_EQ(after(tr_flush_1()), success());
}

TEST_F(Flush, SaysInTheLogWhatItDoes)
{
    global_debug_level = 8;
    ASSERT_EQ(tr_flush_1(), 0);
    ASSERT_EQ(msync_trace_pages(0, MS_ASYNC, 1), 0);
    const auto lines = system_log();
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_EQ(lines[0].text, "msync_trace_pages (incl_all_pages=1 flags=4, ignore=0) Entered\n");
    EXPECT_EQ(lines[1].text, "msync_trace_pages() Leaving\n");
    EXPECT_EQ(lines[2].text, "msync_trace_pages (incl_all_pages=0 flags=1, ignore=1) Entered\n");
    EXPECT_EQ(lines[3].text, "msync_trace_pages() Leaving\n");
    for (const log_line &line : lines) EXPECT_EQ(line.priority, LOG_WARNING) << line.text;
}

TEST_F(Flush, SaysNothingInTheLogBelowLevelEight)
{
    global_debug_level = 7;
    ASSERT_EQ(tr_flush_1(), 0);
    EXPECT_TRUE(system_log().empty());
}

TEST(FlushOfNothing, ClearsTheErrorRecordAndInitialisesTheLibrary)
{
    leave_marker();
    EXPECT_EQ(after(tr_flush_1()), success());
    EXPECT_EQ(sync_calls(), calls{});
    EXPECT_NE(anchors.bInitialized, 0);
}

TEST(FlushByTheProxy, ComesWithAWriterOfFormattedText)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("ABCD");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(cu_trp_printf_1("ABCD", 17, "%d of %s", 3, "four"), 0);
    constexpr uint16_t strings_record = 15;
    const auto records = trace_image::of_file(files / "a.trc").records_of(strings_record);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].u32(28), 17U);
    EXPECT_EQ(records[0].text(40), "3 of four");
}
} // namespace
