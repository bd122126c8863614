// Which page comes next when some cannot be had: locked by another thread, not mapped, not of the set.
#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/switched_set.h"

namespace
{
using namespace qn::test;

class PageSearch : public SwitchedSet
{
protected:
    void unmap(int number)
    {
        const qn::tr::anchor_set_lock set(head);
        ASSERT_EQ(stop_trace_page(page(number), 0), 0);
    }
};

TEST_F(PageSearch, SkipsALockedPage)
{
    const held_by_another hold(page(2)->anchorMutex);
    switch_from(1);
    EXPECT_EQ(head->pActivePg, page(3));
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(state(3), active);
}

TEST_F(PageSearch, TellsThatItSkipsALockedPage)
{
    global_debug_level = 2;
    const held_by_another hold(page(2)->anchorMutex);
    switch_from(1);
    const auto log = system_log();
    ASSERT_EQ(log.size(), 2U);
    EXPECT_EQ(log[0].priority, LOG_ERR);
    char tail[96];
    std::snprintf(tail, sizeof tail, " locked (flags: 2, tid: %u, pNextPage: %p)\n",
                  static_cast<unsigned>(pthread_self()), static_cast<void *>(page(2)));
    EXPECT_EQ(log[0].text, page(2)->fileName + std::string(tail));
    EXPECT_TRUE(std::regex_match(log[1].text, switch_line("reuse", 3))) << log[1].text;
}

TEST_F(PageSearch, IsSilentAboutALockedPageBelowLevelTwo)
{
    global_debug_level = 1;
    const held_by_another hold(page(2)->anchorMutex);
    switch_from(1);
    EXPECT_TRUE(system_log().empty());
}

// Nobody holds the page that is being left: writing it again beats waiting.
TEST_F(PageSearch, ComesBackToTheFullPageWhenAllOthersAreLocked)
{
    const held_by_another second(page(2)->anchorMutex);
    const held_by_another third(page(3)->anchorMutex);
    EXPECT_NE(switch_from(1), nullptr);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(state(1), active);
    EXPECT_EQ(spq.cnt, 0) << "it is not to be spooled any more";
    EXPECT_EQ(head->consecutiveSpoolNotCopied, 1U);
    EXPECT_EQ(image_of(1).records_of(2).size(), 1U);
}

TEST_F(PageSearch, GoesRoundUntilAPageIsUnlocked)
{
    held_by_another first(page(1)->anchorMutex);
    held_by_another second(page(2)->anchorMutex);
    held_by_another third(page(3)->anchorMutex);
    global_debug_level = 2;
    int tries = 0;
    spool_calls().log_line = [&](const std::string &text) {
        if (text.find(" locked (") != std::string::npos) ++tries;
        if (tries == 10) third.let_go(); // after three whole rounds
        clear_system_log();
    };
    switch_from(1);
    EXPECT_EQ(head->pActivePg, page(3));
    EXPECT_GE(tries, 10);
    EXPECT_EQ(state(2), ready);
}

TEST_F(PageSearch, SkipsAPageThatIsNotMapped)
{
    unmap(2);
    EXPECT_NE(switch_from(1), nullptr);
    EXPECT_EQ(head->pActivePg, page(3));
    EXPECT_EQ(page(2)->pMap, nullptr);
}

TEST_F(PageSearch, ComesBackToTheFullPageWhenNoOtherIsMapped)
{
    unmap(2);
    unmap(3);
    EXPECT_NE(switch_from(1), nullptr);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(state(1), active);
    EXPECT_EQ(spq.cnt, 0);
}

// A trace file of its own that goes by a page's name is no part of the ring: its mapping and its records are its own.
TEST(PageSearchInARing, LeavesOutATraceThatHasAPagesName)
{
    const scratch folder;
    trace_anchor_t *foreign = anchor_for(folder / "t.2.sp");
    ASSERT_EQ(start(foreign), 0);
    trace_spool_spec_t spool{};
    spool.onoff = 1;
    spool.pages = 3;
    anchors.bMultipageEnabled = 1;
    trace_anchor_t *head = anchor_for(folder / "t", 196608);
    head->spool = &spool;
    head->bSpoolProcessed = 1;
    ASSERT_EQ(start(head), 0);
    ASSERT_EQ(head->nextPage->fileName, folder / "t.3.sp");
    EXPECT_EQ(head->nextPage->nextPage, head);
    EXPECT_EQ(foreign->nextPage, nullptr);
    {
        const qn::tr::anchor_set_lock set(head);
        unsigned int length = 32;
        EXPECT_NE(pageFull(head, &length), nullptr);
    }
    EXPECT_EQ(head->pActivePg, head->nextPage);
    EXPECT_EQ(trace_image::of_file(foreign->fileName).records_of(2).size(), 0U);
    EXPECT_EQ(foreign->pMap[192], 0);
    EXPECT_EQ(qn::tr::become_unbound(head), 0);
    EXPECT_NE(foreign->pMap, nullptr);
    stop(foreign);
}
} // namespace
