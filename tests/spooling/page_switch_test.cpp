// Going on to the next page: the states of both pages, and a page that was spooled in time.
#include <regex>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/switched_set.h"

namespace
{
using namespace qn::test;

TEST_F(SwitchedSet, MarksTheFullPageAndQueuesIt)
{
    switch_from(1);
    EXPECT_EQ(state(1), full);
    ASSERT_EQ(spq.cnt, 1);
    EXPECT_EQ(spq.pFirst->pAnchor, head);
}

TEST_F(SwitchedSet, MakesTheNextPageActive)
{
    switch_from(1);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_EQ(state(2), active);
    EXPECT_EQ(state(3), ready);
}

TEST_F(SwitchedSet, LeadsFromTheLastPageToTheHead)
{
    for (int number = 1; number <= 3; ++number) {
        put_state(number % 3 + 1, ready);
        switch_from(number);
    }
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(state(1), active);
}

TEST_F(SwitchedSet, GivesSpaceInTheNewPage)
{
    const trace_record_header_t *record = switch_from(1, 32);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(offset_in(2, record), 200);
    EXPECT_EQ(record->length, 32U);
    EXPECT_EQ(record->function, 0xFFFF);
    EXPECT_EQ(record->threadId, static_cast<qn_uint32_t>(pthread_self()));
}

TEST_F(SwitchedSet, RestartsTheSequenceNumbers)
{
    page(2)->seqNumber = 1000;
    const trace_record_header_t *record = switch_from(1, 32);
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(record->seqNumber, 2U);
    EXPECT_EQ(page(2)->seqNumber, 2U);
}

// The start record is in another page, which may be gone before this one.
TEST_F(SwitchedSet, RenewsTheTimeBaseOfThePage)
{
    calls().procspeed = [](cu_timeinfo_t *time) {
        *time = {4711, 4712};
        return 0;
    };
    switch_from(1);
    calls() = {};
    EXPECT_EQ(image_of(2).u64(24), 4711U);
    EXPECT_EQ(image_of(2).u64(32), 4712U);
    EXPECT_NE(image_of(1).u64(24), 4711U);
}

TEST_F(SwitchedSet, LeavesTheRequestedLengthAlone)
{
    unsigned int length = 44;
    const qn::tr::anchor_set_lock set(head);
    ASSERT_NE(pageFull(head, &length), nullptr);
    EXPECT_EQ(length, 44U);
}

TEST_F(SwitchedSet, SwitchesEvenIfTheRecordIsNotToBeHad)
{
    EXPECT_EQ(switch_from(1, too_long), nullptr);
    EXPECT_EQ(state(1), full);
    EXPECT_EQ(head->pActivePg, page(2));
}

TEST_F(SwitchedSet, WritesNoNoticeIntoAPageThatWasSpooledInTime)
{
    switch_from(1, too_long);
    const trace_image image = image_of(2);
    EXPECT_EQ(page(2)->consecutiveSpoolNotCopied, 0U);
    EXPECT_EQ(image.u32(reuse_time), 0U);
    EXPECT_TRUE(image.records_of(2).empty());
}

TEST_F(SwitchedSet, MakesOneFreeRecordOfAPageThatWasSpooledInTime)
{
    switch_from(1, too_long);
    EXPECT_EQ(page(2)->pWrap, qn::tr::record_at(page(2), 200));
    EXPECT_EQ(page(2)->pNextFree, page(2)->pWrap);
    EXPECT_EQ(page(2)->pWrap->function, 0);
    EXPECT_EQ(page(2)->pWrap->seqNumber, 0U);
    EXPECT_EQ(page(2)->pWrap->length, page_bytes - 200);
    EXPECT_EQ(page(2)->seqNumber, 0U);
}

TEST_F(SwitchedSet, ForgetsTheRecordsOfAPageThatIsReused)
{
    switch_from(1);
    for (qn_uint32_t id = 1; id <= 5; ++id) ASSERT_EQ(tr_ms_record_id_1("TEST", id, head), 0);
    ASSERT_EQ(ids_in(page(2)->fileName), (std::vector<uint32_t>{1, 2, 3, 4, 5}));
    switch_from(2);
    switch_from(3);
    put_state(2, ready);
    switch_from(1);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 6, head), 0);
    EXPECT_EQ(ids_in(page(2)->fileName), std::vector<uint32_t>{6});
}

TEST_F(SwitchedSet, ResetsTheCountOfAPageThatWasSpooledInTime)
{
    page(2)->consecutiveSpoolNotCopied = 5;
    switch_from(1);
    EXPECT_EQ(page(2)->consecutiveSpoolNotCopied, 0U);
    EXPECT_TRUE(image_of(2).records_of(2).empty());
}

TEST_F(SwitchedSet, NeedsMemoryForTheQueue)
{
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(switch_from(1), nullptr);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(spq.cnt, 0);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(state(1), full);
    EXPECT_EQ(state(2), ready);
}

TEST_F(SwitchedSet, GoesOnWhenThereIsMemoryAgain)
{
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    switch_from(1);
    calls() = {};
    EXPECT_NE(switch_from(1), nullptr);
    EXPECT_EQ(spq.cnt, 1);
    EXPECT_EQ(head->pActivePg, page(2));
}

TEST_F(SwitchedSet, LeavesThePageUnlocked)
{
    switch_from(1);
    EXPECT_TRUE(is_free(page(1)->anchorMutex));
    EXPECT_TRUE(is_free(page(2)->anchorMutex));
    EXPECT_TRUE(is_free(spq.mutex));
}

TEST_F(SwitchedSet, TellsThatAPageIsReused)
{
    global_debug_level = 2;
    switch_from(1);
    const auto log = system_log();
    ASSERT_EQ(log.size(), 1U);
    EXPECT_EQ(log[0].priority, LOG_WARNING);
    EXPECT_TRUE(std::regex_match(log[0].text, switch_line("reuse", 2))) << log[0].text;
}

TEST_F(SwitchedSet, IsSilentBelowLevelTwo)
{
    global_debug_level = 1;
    put_state(2, full);
    switch_from(1);
    EXPECT_TRUE(system_log().empty());
}
} // namespace
