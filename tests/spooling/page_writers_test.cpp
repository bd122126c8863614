// Writers that fill one page after the other: no record is lost or torn at the seam.
#include <gtest/gtest.h>

#include "spooling/switched_set.h"

namespace
{
using namespace qn::test;

class PageWriters : public SwitchedSet
{
protected:
    // Ids first, first + 1, ... until a page is left; gives the id behind the last one.
    qn_uint32_t write_until_switch(qn_uint32_t first)
    {
        const trace_anchor_t *page = head->pActivePg;
        while (head->pActivePg == page) EXPECT_EQ(tr_ms_record_id_1("TEST", first++, head), 0);
        return first;
    }
    std::vector<uint32_t> ids_of(int number) const { return ids_in(page(number)->fileName); }
    static std::vector<uint32_t> from_to(uint32_t first, uint32_t behind)
    {
        std::vector<uint32_t> ids;
        while (first < behind) ids.push_back(first++);
        return ids;
    }
};

TEST_F(PageWriters, WriteTheRecordThatDidNotFitIntoTheNextPage)
{
    const qn_uint32_t behind = write_until_switch(1);
    EXPECT_EQ(ids_of(1), from_to(1, behind - 1));
    EXPECT_EQ(ids_of(2), from_to(behind - 1, behind));
    EXPECT_EQ(state(1), full);
    EXPECT_EQ(state(2), active);
    EXPECT_EQ(spq.cnt, 1);
}

TEST_F(PageWriters, GoRoundTheWholeSet)
{
    const qn_uint32_t second = write_until_switch(1);
    const qn_uint32_t third = write_until_switch(second);
    put_state(1, ready);
    const qn_uint32_t behind = write_until_switch(third);
    EXPECT_EQ(ids_of(2), from_to(second - 1, third - 1));
    EXPECT_EQ(ids_of(3), from_to(third - 1, behind - 1));
    EXPECT_EQ(ids_of(1), from_to(behind - 1, behind)) << "which was spooled, and is written anew";
}

TEST_F(PageWriters, FillAPageAlmostToItsEnd)
{
    write_until_switch(1);
    const auto records = image_of(1).records_of(1);
    ASSERT_FALSE(records.empty());
    const uint64_t behind = records.back().offset + records.back().length();
    EXPECT_GT(behind + 32 + 28, page_bytes);
    EXPECT_EQ(records.front().offset, 252U) << "behind the start record: nothing wrapped";
}

TEST_F(PageWriters, WriteTheSameThroughAnyPage)
{
    write_until_switch(1);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 70000, page(3)), 0);
    EXPECT_EQ(ids_of(2).back(), 70000U);
    EXPECT_TRUE(ids_of(3).empty());
}

// Behind the start record there is room for 2038 records of 32 bytes and 68 bytes more.
TEST_F(PageWriters, FillAPageExactly)
{
    write_ids(head, 2038);
    ASSERT_EQ(tr_ms_record_values_32_1("TEST", 9, head, 1, 4711), 0);
    EXPECT_EQ(head->pActivePg, head) << "nothing is switched before the next record";
    const auto values = image_of(1).records_of(12);
    ASSERT_EQ(values.size(), 1U);
    // Too little for a rest with a header of its own would be left: the record keeps it.
    ASSERT_EQ(values[0].offset + values[0].length(), page_bytes);

    ASSERT_EQ(tr_ms_record_id_1("TEST", 5000, head), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_EQ(ids_of(1), from_to(1, 2039));
    EXPECT_EQ(image_of(1).records_of(16).size(), 1U) << "the start record is not overwritten";
    EXPECT_EQ(ids_of(2), std::vector<uint32_t>{5000});
}

TEST_F(PageWriters, LeaveAPageThatWasFilledExactlyWhenTheSetIsStartedAgain)
{
    write_ids(head, 2038);
    ASSERT_EQ(tr_ms_record_values_32_1("TEST", 9, head, 1, 4711), 0);
    stop(head);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_EQ(state(1), full);
    ASSERT_EQ(spq.cnt, 1);
    EXPECT_EQ(spq.pFirst->pAnchor, head);
    EXPECT_EQ(ids_of(1), from_to(1, 2039));
    EXPECT_EQ(image_of(1).records_of(16).size(), 1U) << "that of the first start";
    EXPECT_EQ(image_of(2).records_of(16).size(), 1U);
}

TEST_F(PageWriters, GoOnInAPageThatHoldsItsNoticeAloneWhenTheSetIsStartedAgain)
{
    put_state(2, full);
    switch_from(1, too_long);
    ASSERT_EQ(image_of(2).records_of(2).size(), 1U);
    stop(head);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_EQ(image_of(2).records_of(16).size(), 1U);
}

// Such a set wraps, as a single file does.
TEST_F(PageSet, OfOnePageGoesOnAtItsStartWhenItWasFilledExactlyAndIsStartedAgain)
{
    ASSERT_EQ(start_set("t", 1, 65536), 0);
    write_ids(head, 2038);
    ASSERT_EQ(tr_ms_record_values_32_1("TEST", 9, head, 1, 4711), 0);
    ASSERT_EQ(head->pNextFree, head->pWrap);
    stop(head);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_EQ(head->pMap[192], 1);
    EXPECT_EQ(ids_in(head->fileName).size(), 2037U) << "one gave way to the start record, as the first one did";
    EXPECT_EQ(trace_image::of_file(head->fileName).records_of(12).size(), 1U);
}

TEST_F(PageWriters, LeaveAPageWhoseRestIsAWordTooShort)
{
    write_ids(head, 2038);
    ASSERT_EQ(tr_ms_record_values_32_1("TEST", 9, head, 2, 4711, 4712), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_TRUE(image_of(1).records_of(12).empty());
    EXPECT_EQ(image_of(2).records_of(12).size(), 1U);
    EXPECT_EQ(image_of(1).records_of(16).size(), 1U);
}

TEST_F(PageWriters, DropTheRecordsForWhichThereIsNoMemory)
{
    write_ids(head, 2038);
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    for (qn_uint32_t id = 9000; id < 9010; ++id) tr_ms_record_id_1("TEST", id, head);
    calls() = {};
    EXPECT_EQ(head->pActivePg, head);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 5000, head), 0);
    EXPECT_EQ(ids_of(2), std::vector<uint32_t>{5000});
    EXPECT_EQ(spq.cnt, 1);
}
} // namespace
