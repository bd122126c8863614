// Resizing a trace: a single file that is started, and the arithmetic of a page set.
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "components/page_set.h"
#include "support/scratch.h"
#include "support/system_log.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

constexpr uint16_t id_record = 1;
constexpr uint16_t start_record = 16;

using sizes = std::vector<qn_uint32_t>;

// A started default file with one id record in it.
class Resizing : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(tr_set_filename_1(file.c_str()), 0);
        ASSERT_EQ(made.register_now(), 0);
        ASSERT_EQ(tr_record_id_1("ABCD", 4711), 0);
    }
    size_t count(uint16_t kind) const { return trace_image::of_file(file).records_of(kind).size(); }

    const scratch files;
    const std::string file = files / "a.trc";
    client made{"ABCD"};
};

TEST_F(Resizing, GrowsAStartedFileAtOnce)
{
    EXPECT_EQ(after(tr_set_size_1(131072)), success());
    EXPECT_EQ(std::filesystem::file_size(file), 131072U);
    EXPECT_EQ(trace_image::of_file(file).file_size(), 131072U);
    EXPECT_EQ(count(id_record), 0U) << "another size is another ring";
    EXPECT_EQ(count(start_record), 1U);
    ASSERT_EQ(tr_record_id_1("ABCD", 1), 0);
    EXPECT_EQ(count(id_record), 1U);
}

TEST_F(Resizing, KeepsALargerFile)
{
    EXPECT_EQ(after(tr_set_size_1(4096)), success());
    EXPECT_EQ(anchors.uRequestedFileSize, 4096U);
    EXPECT_EQ(std::filesystem::file_size(file), 65536U);
    qn_uint32_t size = 0;
    EXPECT_EQ(tr_get_size_1(&size), 0);
    EXPECT_EQ(size, 65536U);
}

TEST_F(Resizing, StopsAndStartsAlsoToTheSameSize)
{
    EXPECT_EQ(after(tr_set_size_1(65536)), success());
    EXPECT_EQ(count(id_record), 1U) << "the ring is continued";
    EXPECT_EQ(count(start_record), 2U);
}

TEST_F(Resizing, ReturnsWhatTheNewStartReturns)
{
    std::filesystem::remove(file);
    std::filesystem::create_directory(file);
    EXPECT_EQ(after(tr_set_size_1(131072)), failure(18, 18, "2625-017 Error 21 opening trace file.\n"));
    EXPECT_EQ(anchors.pMap, nullptr);
    qn_uint32_t size = 0;
    EXPECT_EQ(tr_get_size_1(&size), 25);
    EXPECT_EQ(size, 131072U);
}

TEST_F(Resizing, LeavesTheMutexesFreeWhenTheThreadIsCancelledInIt)
{
    ASSERT_EQ(tr_set_file_size_1((files / "b.trc").c_str(), 8192), 0);
    ASSERT_EQ(tr_set_trace_levels_1("*:*=5"), 0); // starts it
    trace_anchor_t *anchor = findOrCreateAnchorForFile((files / "b.trc").c_str(), 0);
    ASSERT_NE(anchor->pMap, nullptr);
    ASSERT_TRUE(is_cancelled_in([&] { tr_set_file_size_1((files / "b.trc").c_str(), 16384); }));
    EXPECT_TRUE(free_for_others(anchor->anchorMutex));
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_EQ(after(tr_set_file_size_1((files / "b.trc").c_str(), 16384)), success());
}

class PageSetResizing : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(tr_set_size_1(65536), 0); // the library is initialised
        head = make_page_set(files / "t", 4, 65536);
        ASSERT_EQ(head->pageSize, 4096) << "the figures below are for memory pages of 4096 bytes";
    }
    outcome resize(qn_uint32_t size) { return after(tr_set_file_size_1((files / "t").c_str(), size)); }

    const scratch files;
    trace_anchor_t *head = nullptr;
};

TEST_F(PageSetResizing, DividesIntoAtLeastFourPages)
{
    EXPECT_EQ(resize(1048576), success());
    EXPECT_EQ(head->spool->pages, 4U);
    EXPECT_EQ(requested_sizes(head), (sizes{262144, 262144, 262144, 262144}));
    EXPECT_EQ(resize(100000), success());
    EXPECT_EQ(head->spool->pages, 4U);
    EXPECT_EQ(requested_sizes(head), (sizes{25000, 25000, 25000, 25000}));
    EXPECT_EQ(resize(0), success());
    EXPECT_EQ(head->spool->pages, 4U);
    EXPECT_EQ(requested_sizes(head), (sizes{0, 0, 0, 0}));
}

TEST_F(PageSetResizing, AddsAPagePer256KiB)
{
    EXPECT_EQ(resize(2097152), success());
    EXPECT_EQ(head->spool->pages, 8U);
    EXPECT_EQ(requested_sizes(head), (sizes{262144, 262144, 262144, 262144}));
    EXPECT_EQ(resize(5 * 262144 + 1), success());
    EXPECT_EQ(head->spool->pages, 5U);
    EXPECT_EQ(requested_sizes(head), (sizes{262144, 262144, 262144, 262144}));
    EXPECT_EQ(resize(6 * 262144 - 1), success());
    EXPECT_EQ(head->spool->pages, 5U);
}

TEST_F(PageSetResizing, AddsAMemoryPageToASizeThatHasItsBit)
{
    EXPECT_EQ(resize(4 * 28672), success()); // 0x7000 has the bit 0x1000
    EXPECT_EQ(requested_sizes(head), (sizes{32768, 32768, 32768, 32768}));
    EXPECT_EQ(resize(4 * 4096), success());
    EXPECT_EQ(requested_sizes(head), (sizes{8192, 8192, 8192, 8192}));
    EXPECT_EQ(resize(1048575), success()); // 0x3FFFF
    EXPECT_EQ(requested_sizes(head), (sizes{0x40FFF, 0x40FFF, 0x40FFF, 0x40FFF}));
    EXPECT_EQ(resize(4 * 24576), success()); // 0x6000 has not
    EXPECT_EQ(requested_sizes(head), (sizes{24576, 24576, 24576, 24576}));
}

TEST_F(PageSetResizing, GivesEachPageTheWholeSizeWhileSpoolingIsOff)
{
    head->spool->onoff = 0;
    EXPECT_EQ(resize(2097152), success());
    EXPECT_EQ(head->spool->pages, 4U);
    EXPECT_EQ(requested_sizes(head), (sizes{2097152, 2097152, 2097152, 2097152}));
}

TEST_F(PageSetResizing, LooksAtTheHeadsSizeAlone)
{
    head->nextPage->uRequestedFileSize = 77;
    EXPECT_EQ(resize(65536), success());
    EXPECT_EQ(head->spool->pages, 4U);
    EXPECT_EQ(requested_sizes(head), (sizes{65536, 77, 65536, 65536}));
}

TEST_F(PageSetResizing, LogsEachPage)
{
    global_debug_level = 8;
    EXPECT_EQ(resize(1048576), success());
    for (int page = 1; page <= 4; ++page)
        EXPECT_TRUE(system_log_has("^^^ setting size in " + (files / "t") + "." + std::to_string(page) + ".sp"));
}

TEST_F(PageSetResizing, RestartsEveryPage)
{
    client made("ABCD");
    ASSERT_EQ(made.register_now(), 0);
    for (const trace_anchor_t *page : pages_of(head)) ASSERT_NE(page->pMap, nullptr);
    EXPECT_EQ(resize(2097152), success());
    qn_uint32_t size = 0;
    EXPECT_EQ(tr_get_file_size_1((files / "t").c_str(), &size), 0);
    EXPECT_EQ(size, 262144U);
    for (const trace_anchor_t *page : pages_of(head)) {
        EXPECT_NE(page->pMap, nullptr);
        EXPECT_EQ(std::filesystem::file_size(page->fileName), 262144U) << page->fileName;
        const size_t starts = trace_image::of_file(page->fileName).records_of(start_record).size();
        EXPECT_EQ(starts, page == head->pActivePg ? 1U : 0U) << page->fileName;
    }
}
} // namespace
