// The end of the ring: one wrap, the filler that closes the file off, and page sets, which never wrap.
#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/sleeps.h"

using namespace qn::test;

namespace
{
constexpr uint32_t small_file = 4096;

// What page switching was asked for; it gives `next_page_record`.
struct {
    int calls = 0;
    const trace_anchor_t *page = nullptr;
    unsigned int *length = nullptr;
} page_switch;
trace_record_header_t next_page_record;

// A page set of one page, which is the default trace, under a specification of that many pages.
class page_set
{
public:
    explicit page_set(qn_uint32_t pages, qn_int32_t on = 1)
    {
        spool_.onoff = on;
        spool_.pages = pages;
        anchors.spool = &spool_;
        anchors.pActivePg = &anchors;
        anchors.ppActivePg = &anchors.pActivePg;
    }
    page_set(const page_set &) = delete;
    page_set &operator=(const page_set &) = delete;
    ~page_set()
    {
        anchors.spool = nullptr;
        anchors.ppActivePg = nullptr;
    }

private:
    trace_spool_spec_t spool_{};
};
} // namespace

// Stands in for page switching in this program (linked with --wrap).
extern "C" trace_record_header_t *__wrap__Z8pageFullP12trace_anchorPj(trace_anchor_t *page, unsigned int *length)
{
    ++page_switch.calls;
    page_switch.page = page;
    page_switch.length = length;
    return &next_page_record;
}

TEST(Wrap, ContinuesAtTheStartOfTheRing)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const allocated record = allocate(32);
    EXPECT_EQ(record.offset, 200U);
    EXPECT_EQ(record.length, 32U);
    EXPECT_EQ(trace.image().oldest_offset(), 232U);
}

TEST(Wrap, ClosesTheFileOffWithAFiller)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    allocate(32);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 4U); // the rest of the first record, the second, the filler, the new record
    EXPECT_EQ(ring[2].offset, 4056U);
    EXPECT_EQ(ring[2].length(), 40U);
    EXPECT_EQ(ring[2].function(), 0);
}

TEST(Wrap, GivesTheFillerASequenceNumber)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2, 700);
    allocate(32);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 4U);
    EXPECT_EQ(ring[2].sequence(), 702U);
    EXPECT_EQ(ring[3].sequence(), 704U);
    EXPECT_EQ(anchors.seqNumber, 704U);
}

TEST(Wrap, MakesOneFillerOfAllThatWasConsumedBeforeTheEnd)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3296}, {32}, {36}, {32}}, 2);
    allocate(80);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 4U);
    EXPECT_EQ(ring[2].offset, 3996U);
    EXPECT_EQ(ring[2].length(), 100U);
}

TEST(Wrap, IsLeftOutWhenTheSpanReachesTheEndJustRight)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3328}, {32}, {36}}, 2);
    const allocated record = allocate(40); // 68 bytes: exactly 28 more
    EXPECT_EQ(record.offset, 4028U);
    EXPECT_EQ(anchors.seqNumber, 1002U);
}

TEST(Wrap, NamesTheStartAsOldestFirstAndTheFreePointerInTheEnd)
{
    const one_trace trace(small_file);
    lay_out({{32, 1, 500}, {3824, 1, 502}, {40, 1, 400}}, 2);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 500); // the record at the start: looked at when the wrap is done
    std::vector<record_image> seen;
    uint32_t oldest_then = 0;
    on_sleep([&](int) {
        const trace_image now = trace.image();
        oldest_then = now.oldest_offset();
        seen = now.ring();
        reader.set_u32(tail_reader::seq_lock, 1);
    });
    allocate(32);
    EXPECT_EQ(oldest_then, 200U);
    ASSERT_EQ(seen.size(), 3U);
    EXPECT_EQ(seen[2].offset, 4056U); // the filler is done, nothing else
    EXPECT_EQ(seen[2].function(), 0);
    EXPECT_EQ(seen[2].sequence(), 1002U);
    EXPECT_EQ(seen[0].sequence(), 500U);
    EXPECT_EQ(trace.image().oldest_offset(), 232U);
}

TEST(Wrap, LeavesTheOldestRecordWhereItIsUntilTheEndIsReached)
{
    const one_trace trace(small_file);
    lay_out({{500, 1, 600}, {3324, 1, 602}, {32, 1, 400}, {40, 1, 402}}, 2);
    const std::string before = trace.image().bytes();
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 402); // the last record of the file, before the wrap
    std::string then;
    on_sleep([&](int) {
        reader.set_u32(tail_reader::seq_lock, 1);
        then = trace.image().bytes();
    });
    allocate(64);
    EXPECT_EQ(then, before); // not a byte was written so far
    EXPECT_EQ(trace.image().oldest_offset(), 264U);
}

TEST(Wrap, HappensAgainAndAgain)
{
    const one_trace trace(small_file);
    uint32_t last = 0;
    int wraps = 0;
    for (int i = 0; i < 1000; ++i) {
        const allocated record = allocate(100);
        ASSERT_TRUE(record.given);
        wraps += record.offset < last;
        last = record.offset;
    }
    EXPECT_GE(wraps, 1000 * 100 / 3896);
    trace.image().ring(); // it tiles
}

TEST(PageSet, SwitchesPagesInsteadOfWrapping)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const page_set pages(2);
    unsigned int length = 32;
    EXPECT_EQ(allocate_space(&anchors, &length), &next_page_record);
    EXPECT_EQ(page_switch.calls, 1);
    EXPECT_EQ(page_switch.page, &anchors);
    EXPECT_EQ(page_switch.length, &length);
}

TEST(PageSet, LeavesTheFullPageAsItWas)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const page_set pages(2);
    const std::string before = trace.image().bytes();
    unsigned int length = 32;
    allocate_space(&anchors, &length);
    EXPECT_EQ(trace.image().bytes(), before);
    EXPECT_EQ(anchors.seqNumber, 1000U);
}

TEST(PageSet, IsFullBehindARecordThatEndsWithThePage)
{
    const one_trace trace(small_file);
    lay_out({{3836}, {60}}, 1);
    const page_set pages(3);
    unsigned int length = 32;
    trace_record_header_t *last = allocate_space(&anchors, &length);
    EXPECT_EQ(page_switch.calls, 0);
    ASSERT_NE(last, nullptr);
    EXPECT_EQ(last->length, 60U);
    EXPECT_EQ(allocate_space(&anchors, &length), &next_page_record);
    EXPECT_EQ(page_switch.calls, 1);
    EXPECT_EQ(anchors.seqNumber, 1002U);
}

// Only a reader's request to wait lets a record through that is longer than half a page.
TEST(PageSet, StaysOnItsPageForARecordThatNoPageCanHold)
{
    const one_trace trace(small_file);
    const page_set pages(2);
    poke_u32(tail_reader::tail_request, 1);
    EXPECT_FALSE(allocate(3896 - 27).given);
    EXPECT_EQ(page_switch.calls, 0);
}

TEST(PageSet, GoesOnToAPageWithoutANoticeForARecordAsLongAsAPage)
{
    const one_trace trace(small_file);
    EXPECT_EQ(tr_record_id_1("TEST", 1), 0);
    anchors.pWrap = qn::tr::record_at(&anchors, 252); // behind a notice, in the start record's place
    const page_set pages(2);
    poke_u32(tail_reader::tail_request, 1);
    unsigned int length = 3896 - 28;
    EXPECT_EQ(allocate_space(&anchors, &length), &next_page_record);
    EXPECT_EQ(page_switch.calls, 1);
}

TEST(PageSet, OfOnePageWraps)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const page_set pages(1);
    EXPECT_EQ(allocate(32).offset, 200U);
    EXPECT_EQ(page_switch.calls, 0);
}

TEST(PageSet, WrapsWhileItsSpecificationIsOff)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const page_set pages(2, 0);
    EXPECT_EQ(allocate(32).offset, 200U);
    EXPECT_EQ(page_switch.calls, 0);
}

TEST(PageSet, IsNotMadeOfASingleFileByASpecificationThatComesLater)
{
    const one_trace trace(small_file);
    lay_out({{500}, {3356}, {40}}, 2);
    const page_set pages(2);
    anchors.ppActivePg = nullptr; // it was started as a single file
    EXPECT_EQ(allocate(32).offset, 200U);
    EXPECT_EQ(page_switch.calls, 0);
}
