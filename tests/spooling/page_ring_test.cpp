// A ring that gets another number of pages while it is in use.
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include <gtest/gtest.h>

#include "spooling/changing_ring.h"

namespace
{
using namespace qn::test;

using names = std::vector<std::string>;

TEST_F(ChangingRing, GetsMorePages)
{
    change_to(6);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp", "t.5.sp", "t.6.sp"}));
    EXPECT_EQ(page(6)->nextPage, head);
}

TEST_F(ChangingRing, HasNewPagesThatBelongToTheSet)
{
    change_to(6);
    for (int number = 5; number <= 6; ++number) {
        EXPECT_EQ(page(number)->p_head_spool_anchor, head);
        EXPECT_EQ(page(number)->ppActivePg, &head->pActivePg);
        EXPECT_EQ(page(number)->pSpoolMutex, head->pSpoolMutex);
        EXPECT_EQ(page(number)->spool, &after);
        ASSERT_NE(page(number)->pMap, nullptr);
        EXPECT_EQ(page(number)->pMap[192], ready);
        EXPECT_EQ(page(number)->uActualFileSize, 65536U);
        EXPECT_TRUE(exists(page(number)->fileName));
    }
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(anchors.numAnchors, 2U) << "pages are not in the list";
}

TEST_F(ChangingRing, GivesEveryPageTheNewSpecification)
{
    change_to(4);
    for (int number = 2; number <= 4; ++number) EXPECT_EQ(page(number)->spool, &after);
}

TEST_F(ChangingRing, StaysAsItIsWithAsManyPages)
{
    const trace_anchor_t *second = page(2);
    change_to(4);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}));
    EXPECT_EQ(page(2), second);
}

TEST_F(ChangingRing, IsWrittenThroughItsNewPages)
{
    change_to(6);
    while (head->pActivePg != page(6)) ASSERT_EQ(tr_ms_record_id_1("TEST", 1, head), 0);
    ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
    EXPECT_EQ(ids_in(page(6)->fileName).back(), 4711U);
}

TEST_F(ChangingRing, LosesItsLastPages)
{
    change_to(2);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp"}));
    EXPECT_EQ(page(2)->nextPage, head);
    EXPECT_FALSE(is_mapped("t.3.sp"));
    EXPECT_FALSE(is_mapped("t.4.sp"));
    EXPECT_TRUE(exists(folder / "t.3.sp")) << "the files stay";
    EXPECT_EQ(obsolete(), names{});
}

TEST_F(ChangingRing, MayShrinkToItsHead)
{
    change_to(1);
    EXPECT_EQ(ring(), names{"t.1.sp"});
    EXPECT_EQ(head->nextPage, head);
}

TEST_F(ChangingRing, IsWrittenThroughTheFewerPages)
{
    change_to(2);
    for (int id = 1; id <= 10000; ++id) ASSERT_EQ(tr_ms_record_id_1("TEST", static_cast<qn_uint32_t>(id), head), 0);
    EXPECT_TRUE(head->pActivePg == head || head->pActivePg == page(2));
    EXPECT_EQ(ids_in(head->pActivePg->fileName).back(), 10000U);
}

// A trace that is one file when a specification comes to govern it goes on as one.
TEST_F(ChangingRing, IsNotMadeOfASingleFile)
{
    anchors.bMultipageEnabled = 0;
    trace_anchor_t *single = anchor_for(folder / "single");
    ASSERT_EQ(start(single), 0);
    single->spool = &after;
    after.pages = 6;
    {
        const qn::tr::anchor_set_lock set(single);
        reconfigure_pages(single, &spool, &after);
    }
    EXPECT_EQ(single->nextPage, nullptr);
    EXPECT_FALSE(exists(folder / "single.5.sp"));
    single->spool = nullptr;
    stop(single);
}

// ---- Adding pages.

TEST_F(ChangingRing, AnswersWithTheFirstPageThatIsAdded)
{
    trace_anchor_t *added = add(6);
    ASSERT_NE(added, nullptr);
    EXPECT_STREQ(added->fileName, (folder / "t.5.sp").c_str());
    EXPECT_EQ(page(4)->nextPage, added);
    EXPECT_STREQ(added->nextPage->fileName, (folder / "t.6.sp").c_str());
    EXPECT_EQ(added->nextPage->nextPage, head);
}

class AddingWithoutMemory : public ChangingRing, public testing::WithParamInterface<int>
{
};

TEST_P(AddingWithoutMemory, LeavesTheRingAsItWas)
{
    int made = 0;
    calls().calloc = [&](size_t count, size_t size) -> void * {
        if (count * size == sizeof(trace_anchor_t) && ++made == GetParam()) return nullptr;
        return __real_calloc(count, size);
    };
    EXPECT_EQ(add(7), nullptr);
    calls() = {};
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}));
    EXPECT_EQ(last_error().code, 14);
    // The records go on.
    for (int id = 1; id <= 10000; ++id) ASSERT_EQ(tr_ms_record_id_1("TEST", static_cast<qn_uint32_t>(id), head), 0);
    process();
}

INSTANTIATE_TEST_SUITE_P(ForPage, AddingWithoutMemory, testing::Values(1, 2, 3));

TEST_F(ChangingRing, GetsAPageThatCannotBeStarted)
{
    std::filesystem::create_directory(folder / "t.5.sp");
    change_to(6);
    EXPECT_EQ(ring().size(), 6U);
    EXPECT_EQ(page(5)->pMap, nullptr);
    EXPECT_NE(page(6)->pMap, nullptr);
    while (head->pActivePg != page(6)) ASSERT_EQ(tr_ms_record_id_1("TEST", 1, head), 0);
}

// A new size changes the number of pages that the specification names, and leaves the ring as it is.
TEST_F(ChangingRing, HasNoPageTwiceAfterItWasResized)
{
    change_to(8);
    ASSERT_EQ(tr_set_file_size_1((folder / "t").c_str(), 131072), 0);
    ASSERT_EQ(after.pages, 4U);
    ASSERT_EQ(ring().size(), 8U);
    change_back_to(9);
    EXPECT_EQ(ring(),
              (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp", "t.5.sp", "t.6.sp", "t.7.sp", "t.8.sp", "t.9.sp"}));
    for (const std::string &name : ring()) EXPECT_EQ(mappings(name), 1) << name;
}

TEST_F(ChangingRing, StaysAsItIsWhenItHasFewerPagesThanItsSpecificationNames)
{
    spool.pages = 8;
    change_to(6);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}));
    for (const std::string &name : ring()) EXPECT_TRUE(is_mapped(name)) << name;
}

TEST_F(ChangingRing, LeavesOutANumberWhosePageIsATraceOfItsOwn)
{
    trace_anchor_t *other = anchor_for(folder / "t.5.sp");
    change_to(6);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp", "t.6.sp"}));
    EXPECT_EQ(other->pMap, nullptr);
    EXPECT_EQ(other->nextPage, nullptr);
    EXPECT_EQ(other->p_head_spool_anchor, nullptr);
}

TEST_F(ChangingRing, GetsNoPageThatWouldNotHaveANameOfItsOwn)
{
    const std::string name = head->fileName;
    qn::tr::set_file_name(head, ("/" + std::string(4090, 'n')).c_str());
    EXPECT_EQ(add(6), nullptr);
    qn::tr::set_file_name(head, name.c_str());
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}));
}

// The file may say that it was being written when a process ended.
TEST_F(ChangingRing, StaysOnItsActivePageWhateverANewPagesFileSays)
{
    change_to(5);
    change_back_to(4);
    ASSERT_FALSE(is_mapped("t.5.sp"));
    put<uint8_t>(folder / "t.5.sp", 192, active);
    change_to(5);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(page(5)->pMap[192], ready);
}

// ---- While the trace is stopped.

class StoppedRing : public ChangingRing
{
protected:
    void SetUp() override
    {
        ChangingRing::SetUp();
        while (head->pActivePg != page(3)) ASSERT_EQ(tr_ms_record_id_1("TEST", 1, head), 0);
        stop(head);
    }
    // The trace goes on in that page.
    void expect_to_be_written_in(int number)
    {
        ASSERT_EQ(start(head), 0);
        EXPECT_EQ(head->pActivePg, page(number));
        ASSERT_EQ(tr_ms_record_id_1("TEST", 4711, head), 0);
        EXPECT_EQ(ids_in(page(number)->fileName).back(), 4711U);
    }
};

// The head is full.
TEST_F(StoppedRing, GoesOnBehindItsHeadWhenThePageThatWasWrittenIsCutOff)
{
    change_to(2);
    EXPECT_EQ(obsolete(), names{});
    expect_to_be_written_in(2);
}

TEST_F(StoppedRing, GoesOnWhereItWasWhenOtherPagesAreCutOff)
{
    change_to(3);
    EXPECT_EQ(obsolete(), names{});
    expect_to_be_written_in(3);
}

TEST_F(StoppedRing, GoesOnWhereItWasWhenItGetsMorePages)
{
    change_to(6);
    EXPECT_EQ(ring().size(), 6U);
    expect_to_be_written_in(3);
}

TEST_F(StoppedRing, GoesOnBehindItsHeadWhenThePageThatWasWrittenIsCutOffAndAdded)
{
    change_to(2);
    change_back_to(4);
    EXPECT_EQ(ring(), (names{"t.1.sp", "t.2.sp", "t.3.sp", "t.4.sp"}));
    expect_to_be_written_in(2);
}

struct head_name {
    const char *head;
    const char *added;
};

void PrintTo(const head_name &name, std::ostream *out) { *out << name.head; }

class AddedName : public ChangingRing, public testing::WithParamInterface<head_name>
{
};

TEST_P(AddedName, IsMadeOfTheHeadsName)
{
    std::filesystem::create_directory(folder / "d.d");
    std::strcpy(head->fileName, (folder / GetParam().head).c_str());
    const trace_anchor_t *added = add(5);
    ASSERT_NE(added, nullptr);
    EXPECT_EQ(added->fileName, folder / GetParam().added);
}

// Cut at the second dot from the end, wherever in the path that is; with fewer dots nothing is cut.
INSTANTIATE_TEST_SUITE_P(Values, AddedName,
                         testing::Values(head_name{"app.trc.1.sp", "app.trc.5.sp"}, head_name{"t.1.sp", "t.5.sp"},
                                         head_name{"a.b.c.d", "a.b.5.sp"}, head_name{"plain", "plain.5.sp"},
                                         head_name{"one.dot", "one.dot.5.sp"}, head_name{"d.d/t.sp", "d.5.sp"},
                                         head_name{"d.d/plain", "d.d/plain.5.sp"}));
} // namespace
