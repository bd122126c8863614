// Pages that are cut off from a ring before they were copied.
#include <algorithm>

#include <gtest/gtest.h>

#include "spooling/changing_ring.h"

namespace
{
using namespace qn::test;

using names = std::vector<std::string>;

TEST_F(ChangingRing, KeepsAPageThatIsQueued)
{
    enqueue(4);
    change_to(2);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp"}));
    EXPECT_EQ(obsolete(), names{"t.4.sp"});
    EXPECT_TRUE(is_mapped("t.4.sp"));
    EXPECT_FALSE(is_mapped("t.3.sp"));
    EXPECT_EQ(spq.cnt, 1);
}

class UncopiedState : public ChangingRing, public testing::WithParamInterface<int>
{
};

TEST_P(UncopiedState, KeepsAPage)
{
    page(3)->pMap[192] = static_cast<uint8_t>(GetParam());
    change_to(2);
    EXPECT_EQ(obsolete(), names{"t.3.sp"});
    EXPECT_TRUE(is_mapped("t.3.sp"));
    EXPECT_EQ(head->p_obsolete_pages->nextPage, nullptr);
}

INSTANTIATE_TEST_SUITE_P(Values, UncopiedState, testing::Values(0, 1, 2, 3, 8));

TEST_F(ChangingRing, KeepsPagesInTheOrderInWhichTheyWereCutOff)
{
    for (int number = 2; number <= 4; ++number) enqueue(number);
    change_to(3);
    EXPECT_EQ(obsolete(), names{"t.4.sp"});
    change_back_to(1);
    EXPECT_EQ(obsolete(), (names{"t.4.sp", "t.2.sp", "t.3.sp"}));
}

TEST_F(ChangingRing, ReleasesAPageOnceItWasCopied)
{
    enqueue(3);
    enqueue(4);
    change_to(2);
    ASSERT_EQ(obsolete(), (names{"t.3.sp", "t.4.sp"}));
    spool_dequeue_last_and_spool_inside_spq(&spq);
    EXPECT_TRUE(is_mapped("t.3.sp")) << "until the trace is bound again";
    process();
    EXPECT_EQ(obsolete(), names{"t.4.sp"});
    EXPECT_FALSE(is_mapped("t.3.sp"));
    EXPECT_TRUE(is_mapped("t.4.sp"));
    EXPECT_TRUE(exists(folder / "t.3.sp")) << "the file stays";

    spool_dequeue_last_and_spool_inside_spq(&spq);
    process();
    EXPECT_EQ(obsolete(), names{});
    EXPECT_FALSE(is_mapped("t.4.sp"));
}

TEST_F(ChangingRing, ReleasesPagesAlsoWhenAnotherPageIsBeforeThem)
{
    enqueue(3);
    enqueue(4);
    change_to(2);
    head->p_obsolete_pages_tail->pMap[192] = ready;
    process();
    EXPECT_EQ(obsolete(), names{"t.3.sp"});
    EXPECT_EQ(spq.cnt, 1) << "a page that is released leaves the queue";
}

TEST_F(ChangingRing, ReleasesNothingOfATraceThatWasBoundAlready)
{
    enqueue(3);
    change_to(2);
    head->p_obsolete_pages->pMap[192] = ready;
    head->bSpoolProcessed = 1;
    process_spool_spec(head, nullptr);
    EXPECT_EQ(obsolete(), names{"t.3.sp"});
}

TEST_F(ChangingRing, GivesAnObsoletePageTheNewestSpecification)
{
    enqueue(4);
    change_to(3);
    change_back_to(2);
    EXPECT_EQ(head->p_obsolete_pages->spool, &spool);
}

TEST_F(ChangingRing, TakesAnObsoletePageBack)
{
    enqueue(4);
    const trace_anchor_t *fourth = page(4);
    change_to(3);
    ASSERT_EQ(obsolete(), names{"t.4.sp"});
    change_back_to(5);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp", "t.5.sp"}));
    EXPECT_EQ(page(4), fourth);
    EXPECT_EQ(obsolete(), names{});
    EXPECT_EQ(mappings("t.4.sp"), 1) << "the file is not mapped a second time";
    EXPECT_EQ(fourth->pMap[192], full);
    EXPECT_EQ(spq.cnt, 1) << "its copy is still to be made";
}

TEST_F(ChangingRing, KeepsTheCopyToBeMadeOfAnObsoletePageWhenTheTraceIsStopped)
{
    enqueue(4);
    change_to(2);
    stop(head);
    EXPECT_TRUE(is_mapped("t.4.sp"));
    EXPECT_EQ(spq.cnt, 1);
}

TEST_F(ChangingRing, LeavesNoPageMappedWhenTracingEnds)
{
    enqueue(3);
    enqueue(4);
    change_to(2);
    tr_term();
    for (const char *name : {"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}) EXPECT_FALSE(is_mapped(name)) << name;
    EXPECT_EQ(spq.cnt, 0);
}

// ---- A page that is being written when it is cut off.

class ActivePageCutOff : public ChangingRing
{
protected:
    void SetUp() override
    {
        ChangingRing::SetUp();
        while (head->pActivePg != page(4)) ASSERT_EQ(tr_ms_record_id_1("TEST", ++last_id, head), 0);
        fourth = page(4);
        for (int number = 1; number <= 3; ++number) page(number)->pMap[192] = ready;
        change_to(2);
    }

    static std::vector<const void *> maps_synced_by(const std::function<void()> &action)
    {
        std::vector<const void *> maps;
        calls().msync = [&](void *map, size_t size, int flags) {
            maps.push_back(map);
            return __real_msync(map, size, flags);
        };
        action();
        calls() = {};
        return maps;
    }

    qn_uint32_t last_id = 0;
    trace_anchor_t *fourth = nullptr;
};

TEST_F(ActivePageCutOff, IsWrittenFurther)
{
    EXPECT_EQ(obsolete(), names{"t.4.sp"});
    EXPECT_EQ(head->pActivePg, fourth);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
    EXPECT_EQ(ids_in(fourth->fileName).back(), 4711U);
}

TEST_F(ActivePageCutOff, LeadsToTheHead)
{
    while (head->pActivePg == fourth) ASSERT_EQ(tr_ms_record_id_1("TEST", ++last_id, head), 0);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(ids_in(head->fileName), std::vector<uint32_t>{last_id});
    EXPECT_EQ(fourth->pMap[192], full);
    ASSERT_NE(spq.pFirst, nullptr);
    EXPECT_EQ(spq.pFirst->pAnchor, fourth);
}

TEST_F(ActivePageCutOff, IsNotReleasedWhateverItsStateSays)
{
    fourth->pMap[192] = ready;
    process();
    EXPECT_EQ(obsolete(), names{"t.4.sp"});
    ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
}

TEST_F(ActivePageCutOff, IsFlushed)
{
    const std::vector<const void *> synced = maps_synced_by([] { EXPECT_EQ(tr_flush_1(), 0); });
    EXPECT_EQ(std::count(synced.begin(), synced.end(), fourth->pMap), 1);
}

TEST_F(ActivePageCutOff, IsStoppedWithTheTrace)
{
    const void *map = fourth->pMap;
    fourth->pMap[4] = 0xff;
    const std::vector<const void *> synced = maps_synced_by([this] { stop(head); });
    EXPECT_EQ(std::count(synced.begin(), synced.end(), map), 1);
    EXPECT_FALSE(is_mapped("t.4.sp"));
    EXPECT_EQ(trace_image::of_file(fourth->fileName).u16(4), 0) << "closed in order";
}

// The head is full.
TEST_F(ActivePageCutOff, LeadsToThePageBehindTheHeadWhenTheTraceIsStartedAgain)
{
    stop(head);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
    EXPECT_EQ(ids_in(page(2)->fileName), std::vector<uint32_t>{4711});
    process();
    EXPECT_EQ(obsolete(), names{});
}

TEST_F(ActivePageCutOff, IsTakenBackAfterTheTraceWasStopped)
{
    stop(head);
    change_back_to(4);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(page(4), fourth);
    EXPECT_EQ(mappings("t.4.sp"), 1);
    EXPECT_EQ(obsolete(), names{});
    ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
    EXPECT_EQ(ids_in(head->pActivePg->fileName).back(), 4711U);
}

TEST_F(ActivePageCutOff, IsTakenBackWhileItIsWritten)
{
    change_back_to(4);
    EXPECT_EQ(page(4), fourth);
    EXPECT_EQ(head->pActivePg, fourth);
    EXPECT_EQ(fourth->pMap[192], active);
    EXPECT_EQ(fourth->nextPage, head);
}
} // namespace
