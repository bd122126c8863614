// A thread that is to be cancelled while its record leads to the next page of a page set: the switch is done as a whole,
// and only then may the thread end.
#include <gtest/gtest.h>

#include "components/page_set.h"
#include "recording/blocked_calls.h"
#include "recording/one_trace.h"
#include "support/scratch.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint8_t active = 1;
constexpr uint8_t full = 2;
constexpr uint32_t longest = 1948; // in a page of 4096 bytes

// A set of three pages that was never spooled: its pages are overwritten, with a notice, which is what logs most. Nothing
// empties the spool queue.
class CancelledPageSwitch : public testing::TestWithParam<const char *>
{
protected:
    void SetUp() override
    {
        head_ = make_page_set(folder_ / "t", 3, 4096);
        ASSERT_EQ(component_.register_now(), 0);
        pages_ = pages_of(head_);
        pages_[1]->pMap[192] = full;
    }
    void TearDown() override
    {
        qn::tr::store_relaxed(global_debug_level, 0);
        qn::tr::stop_trace_locked(head_);
        while (sp_q_element_t *element = spool_dequeue_last_element_inside_spq(&spq)) std::free(element);
    }

    // Ids 1, 2, ... until the first page is left.
    void write_until_switch() const
    {
        for (qn_uint32_t id = 1; head_->pActivePg == head_; ++id) tr_ms_record_id_1("COMP", id, head_);
    }
    void expect_whole_switch() const
    {
        EXPECT_TRUE(is_free(*head_->pSpoolMutex));
        EXPECT_TRUE(is_free(pages_[1]->anchorMutex));
        EXPECT_TRUE(is_free(spq.mutex));
        EXPECT_EQ(head_->pActivePg, pages_[1]);
        EXPECT_EQ(head_->pMap[192], full);
        EXPECT_EQ(pages_[1]->pMap[192], active);
        ASSERT_EQ(spq.cnt, 1);
        EXPECT_EQ(spq.pFirst->pAnchor, head_);
        EXPECT_EQ(spq.pFirst, spq.pLast);
        const auto records = second_page().records();
        ASSERT_FALSE(records.empty());
        EXPECT_EQ(records[0].function(), 2) << "the notice";
        const unsigned char *ring = pages_[1]->pMap + 200 + records[0].length();
        EXPECT_EQ(reinterpret_cast<const unsigned char *>(pages_[1]->pWrap), ring);
        EXPECT_GE(reinterpret_cast<const unsigned char *>(pages_[1]->pNextFree), ring);
    }
    trace_image second_page() const { return trace_image::of_file(pages_[1]->fileName); }

    const scratch folder_;
    client component_{"TEST"};
    trace_anchor_t *head_ = nullptr;
    std::vector<trace_anchor_t *> pages_;
};
} // namespace

// From level 2 on a switch is logged, from level 8 on the queue too.
INSTANTIATE_TEST_SUITE_P(At, CancelledPageSwitch, testing::Values("vsyslog"),
                         [](const auto &info) { return std::string(info.param); });

TEST_P(CancelledPageSwitch, IsDoneAsAWhole)
{
    qn::tr::store_relaxed(global_debug_level, 8);
    EXPECT_FALSE(cancelled_in(GetParam(), [this] { write_until_switch(); }));
    expect_whole_switch();
    EXPECT_EQ(second_page().records_of(1).size(), 1U);
}

TEST_F(CancelledPageSwitch, LetsTheThreadEndBehindIt)
{
    pages_[1]->pMap[tail_reader::tail_request + 1] = longest >> 8; // a reader of the next page makes writers wait
    pages_[1]->pMap[tail_reader::tail_request] = longest & 0xFF;
    ASSERT_TRUE(cancelled_in("usleep", [this] { write_until_switch(); }));
    expect_whole_switch();
    EXPECT_TRUE(second_page().records_of(1).empty());
    EXPECT_EQ(tr_ms_record_id_1("COMP", 7, head_), 0);
    EXPECT_EQ(second_page().records().back().u32(28), 7U);
}
