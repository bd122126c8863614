// A page that is overwritten before it was spooled: its element, its stamp, its notice, and the ring behind that.
#include <algorithm>
#include <ctime>
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/switched_set.h"

namespace
{
using namespace qn::test;

class Overwritten : public SwitchedSet
{
protected:
    // Overwrites page 2 that many times, and it is never spooled in between.
    void overwrite(qn_uint32_t times, unsigned int length = 32)
    {
        for (qn_uint32_t time = 0; time < times; ++time) {
            put_state(2, full);
            switch_from(1, length);
        }
    }
    std::string notice_text(const std::string &count) const
    {
        return "SPOOL: " + std::string(page(2)->fileName) + " not spooled " + count;
    }
    static qn_uint32_t notice_bytes(const std::string &text)
    {
        return static_cast<qn_uint32_t>(text.size() + 1 + 35) & ~3U;
    }
    // Every record of page 2, through the ring, oldest first.
    std::vector<record_image> ring() const { return image_of(2).ring(); }
};

TEST_F(Overwritten, PageLeavesTheQueue)
{
    switch_from(1);
    switch_from(2);
    switch_from(3);
    ASSERT_EQ(spq.cnt, 2) << "page 1 was taken over";
    for (const sp_q_element_t *element = spq.pFirst; element != nullptr; element = element->pNext)
        EXPECT_NE(element->pAnchor, head);
}

TEST_F(Overwritten, PageIsActive)
{
    overwrite(1);
    EXPECT_EQ(state(2), active);
    EXPECT_EQ(head->pActivePg, page(2));
}

TEST_F(Overwritten, PageIsStampedWithTheTime)
{
    const auto before = static_cast<uint32_t>(std::time(nullptr));
    overwrite(1);
    const auto after = static_cast<uint32_t>(std::time(nullptr));
    EXPECT_GE(image_of(2).u32(reuse_time), before);
    EXPECT_LE(image_of(2).u32(reuse_time), after);
}

TEST_F(Overwritten, PageKeepsItsStampWhenItIsReusedInTime)
{
    overwrite(1);
    const uint32_t stamp = image_of(2).u32(reuse_time);
    put_state(2, ready);
    switch_from(1);
    EXPECT_EQ(image_of(2).u32(reuse_time), stamp);
}

TEST_F(Overwritten, PageBeginsWithANotice)
{
    overwrite(1);
    const auto notices = image_of(2).records_of(2);
    ASSERT_EQ(notices.size(), 1U);
    const std::string text = notice_text("1 consecutive time");
    EXPECT_EQ(notices[0].offset, 200U);
    EXPECT_EQ(notices[0].length(), notice_bytes(text));
    EXPECT_EQ(notices[0].text(28), text);
    EXPECT_EQ(notices[0].component(), "____");
    EXPECT_EQ(notices[0].sequence(), 0U);
    EXPECT_EQ(notices[0].thread(), static_cast<uint32_t>(pthread_self()));
    EXPECT_NE(notices[0].time_stamp(), 0U);
}

TEST_F(Overwritten, PageSpeaksOfTimesFromTheSecondOn)
{
    overwrite(2);
    const auto notices = image_of(2).records_of(2);
    ASSERT_EQ(notices.size(), 1U);
    EXPECT_EQ(notices[0].text(28), notice_text("2 consecutive times"));
    EXPECT_EQ(notices[0].length(), notice_bytes(notice_text("2 consecutive times")));
    EXPECT_EQ(page(2)->consecutiveSpoolNotCopied, 2U);
}

TEST_F(Overwritten, PageCountsAnyNumberOfTimes)
{
    page(2)->consecutiveSpoolNotCopied = 4294967294U;
    overwrite(1);
    const auto notices = image_of(2).records_of(2);
    ASSERT_EQ(notices.size(), 1U);
    EXPECT_EQ(notices[0].text(28), notice_text("4294967295 consecutive times"));
}

TEST_F(Overwritten, PageBeginsToCountAgainOnceItWasSpooled)
{
    overwrite(3);
    put_state(2, ready);
    switch_from(1);
    EXPECT_EQ(page(2)->consecutiveSpoolNotCopied, 0U);
    EXPECT_TRUE(image_of(2).records_of(2).empty());
    overwrite(1);
    const auto notices = image_of(2).records_of(2);
    ASSERT_EQ(notices.size(), 1U);
    EXPECT_EQ(notices[0].text(28), notice_text("1 consecutive time"));
}

class UnspooledState : public Overwritten, public testing::WithParamInterface<int>
{
};

TEST_P(UnspooledState, IsAnyButReady)
{
    put_state(2, static_cast<uint8_t>(GetParam()));
    switch_from(1);
    EXPECT_EQ(page(2)->consecutiveSpoolNotCopied, 1U);
    EXPECT_EQ(state(2), active);
    EXPECT_EQ(image_of(2).records_of(2).size(), 1U);
    EXPECT_NE(image_of(2).u32(reuse_time), 0U);
}

INSTANTIATE_TEST_SUITE_P(Values, UnspooledState, testing::Values(0, 1, 2, 3, 5, 8, 255));

TEST_F(Overwritten, PageKeepsItsNoticeInFrontOfItsRing)
{
    overwrite(1);
    const auto notice = static_cast<long>(notice_bytes(notice_text("1 consecutive time")));
    EXPECT_EQ(offset_in(2, page(2)->pWrap), 200 + notice);
}

TEST_F(Overwritten, PageHasAFreeRecordShorterByTheNotice)
{
    overwrite(1, too_long);
    const qn_uint32_t notice = notice_bytes(notice_text("1 consecutive time"));
    const trace_record_header_t *free_record = page(2)->pWrap;
    EXPECT_EQ(page(2)->pNextFree, free_record);
    EXPECT_EQ(free_record->function, 0);
    EXPECT_EQ(free_record->seqNumber, 0U);
    EXPECT_EQ(free_record->length, page_bytes - 200 - notice - notice);
}

TEST_F(Overwritten, PageIsClosedByAFillerOfTheNoticesLength)
{
    overwrite(1, too_long);
    const qn_uint32_t notice = notice_bytes(notice_text("1 consecutive time"));
    const trace_record_header_t *filler = qn::tr::record_at(page(2), page_bytes - notice);
    EXPECT_EQ(filler->function, 0);
    EXPECT_EQ(filler->seqNumber, 4095U);
    EXPECT_EQ(filler->length, notice);
}

TEST_F(Overwritten, PageGivesItsFirstSpaceBehindTheNotice)
{
    put_state(2, full);
    const trace_record_header_t *record = switch_from(1, 32);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(offset_in(2, record), 200 + static_cast<long>(notice_bytes(notice_text("1 consecutive time"))));
    EXPECT_EQ(record->seqNumber, 2U);
}

// The walk itself fails the test when the records do not tile the page.
TEST_F(Overwritten, PageIsTiledByItsRecords)
{
    overwrite(1);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 7, head), 0);
    EXPECT_GE(ring().size(), 4U);
    EXPECT_EQ(ids_in(page(2)->fileName), std::vector<uint32_t>{7});
}

TEST_F(Overwritten, PageIsTiledAlsoBeforeItsFirstRecord)
{
    overwrite(1, too_long);
    EXPECT_EQ(ring().size(), 3U) << "the notice, the free record, the filler";
}

TEST_F(Overwritten, PageHasNoNoticeOfTheLastTime)
{
    overwrite(1);
    put_state(2, ready);
    const trace_record_header_t *record = switch_from(1, 32);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(offset_in(2, record), 200);
    EXPECT_EQ(offset_in(2, page(2)->pWrap), 200);
    EXPECT_TRUE(image_of(2).records_of(2).empty());
}

TEST_F(Overwritten, PageIsFilledUpToItsEnd)
{
    overwrite(1);
    while (head->pActivePg == page(2)) ASSERT_EQ(tr_ms_record_id_1("TEST", 7, head), 0);
    const auto records = image_of(2).records_of(1);
    ASSERT_FALSE(records.empty());
    const uint64_t behind = records.back().offset + records.back().length();
    EXPECT_GT(behind + 32 + 28, page_bytes) << "one more record would have fitted";
    EXPECT_EQ(image_of(2).records_of(2).size(), 1U) << "the notice is still there";
}

TEST_F(Overwritten, PageTellsIt)
{
    global_debug_level = 2;
    overwrite(1);
    const auto log = system_log();
    ASSERT_EQ(log.size(), 2U);
    EXPECT_EQ(log[0].priority, LOG_WARNING);
    EXPECT_TRUE(std::regex_match(log[0].text, switch_line("overwrite", 2))) << log[0].text;
    EXPECT_EQ(log[1].priority, LOG_WARNING);
    EXPECT_EQ(log[1].text, std::string(page(2)->fileName) + " consec 1\n");
}

// The text is made in a buffer of 1024 bytes.
TEST(OverwrittenPage, HasANoticeThatEndsWhateverItsName)
{
    const scratch folder;
    std::string deep = folder.folder();
    for (int level = 0; level < 6; ++level) deep += "/" + std::string(200, 'd');
    std::filesystem::create_directories(deep);
    trace_spool_spec_t spool{};
    spool.onoff = 1;
    spool.pages = 2;
    anchors.bMultipageEnabled = 1;
    trace_anchor_t *head = anchor_for(deep + "/t", 131072);
    head->spool = &spool;
    head->bSpoolProcessed = 1;
    ASSERT_EQ(start(head), 0);
    {
        const qn::tr::anchor_set_lock set(head);
        head->nextPage->pMap[192] = 2;
        unsigned int length = 32;
        ASSERT_NE(pageFull(head, &length), nullptr);
    }
    const auto notices = trace_image::of_file(head->nextPage->fileName).records_of(2);
    ASSERT_EQ(notices.size(), 1U);
    const std::string text = notices[0].text(28);
    EXPECT_LE(text.size(), 1023U);
    EXPECT_EQ(text.substr(0, 1000), ("SPOOL: " + deep).substr(0, 1000));
    EXPECT_EQ(notices[0].length(), (text.size() + 36) & ~size_t{3});
    stop(head);
    head->spool = nullptr;
}
} // namespace
