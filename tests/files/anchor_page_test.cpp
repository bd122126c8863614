// Page anchors: how their names are matched, what they take from their head, and how a page set is looked up.
#include <cstdlib>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"
#include "trace/spooling/spool_types.h"

namespace
{
using namespace qn::test;

struct name_pair {
    const char *page;
    const char *trace;
};

void PrintTo(const name_pair &names, std::ostream *out) { *out << names.page << " for " << names.trace; }

class PageName : public testing::TestWithParam<name_pair>
{
};

TEST_P(PageName, BelongsToTheTrace) { EXPECT_EQ(spool_name_match(GetParam().page, GetParam().trace), 0); }

INSTANTIATE_TEST_SUITE_P(Matches, PageName,
                         testing::Values(name_pair{"a.12.sp", "a"}, name_pair{"/var/x/trace.3.sp", "/var/x/trace"},
                                         name_pair{"/x/t.1.sp", "/x/t"}, name_pair{"a.b.1.sp", "a.b"},
                                         name_pair{"a.1.2.sp", "a.1"}, name_pair{"a.0000000000000000000000007.sp", "a"},
                                         name_pair{".1.sp", ""}));

class OtherName : public testing::TestWithParam<name_pair>
{
};

TEST_P(OtherName, IsNoPageOfTheTrace) { EXPECT_NE(spool_name_match(GetParam().page, GetParam().trace), 0); }

INSTANTIATE_TEST_SUITE_P(DoNotMatch, OtherName,
                         testing::Values(name_pair{"a.12.sp", "b"}, name_pair{"a.12.sp", "a.12"},
                                         name_pair{"a.12.sp", "a.12.sp"}, name_pair{"a.12.sp", ""},
                                         name_pair{"a.12.SP", "a"}, name_pair{"ab.1.sp", "a"},
                                         name_pair{"a.1.sp", "ab"}));

class NoPageName : public testing::TestWithParam<name_pair>
{
};

TEST_P(NoPageName, GivesMinusOne) { EXPECT_EQ(spool_name_match(GetParam().page, GetParam().trace), -1); }

INSTANTIATE_TEST_SUITE_P(Names, NoPageName,
                         testing::Values(name_pair{"12.sp", "12"}, name_pair{"12.sp", ""},
                                         name_pair{"a.sp.1.sp", "a.sp"}, name_pair{"a", "a"}, name_pair{"", ""},
                                         name_pair{".sp", ""}, name_pair{"/var/x/trace.sp", "/var/x/trace"},
                                         name_pair{"/var/x/trace.a.sp", "/var/x/trace"}, name_pair{"a1.sp", "a"},
                                         name_pair{"a.1.sp.save", "a"}, name_pair{"a.1x.sp", "a"},
                                         name_pair{"a..sp", "a"}, name_pair{"a.-1.sp", "a"}));

class PageAnchor : public testing::Test
{
protected:
    void SetUp() override
    {
        init_biased_mutex(&shared);
        head = anchor_for("/tmp/t.1.sp");
        head->uMaxSize = 4711 & ~3;
        head->pageSize = 16384;
        head->uRequestedFileSize = 123456;
        head->spool = &spool;
        head->pSpoolMutex = &shared;
        head->pActivePg = head;
    }
    void TearDown() override
    {
        if (page == nullptr) return;
        pthread_mutex_destroy(&page->anchorMutex);
        std::free(page);
        head->nextPage = nullptr;
    }

    trace_spool_spec_t spool{};
    qn::tr::biased_mutex shared_lock;
    pthread_mutex_t &shared = shared_lock.mutex;
    trace_anchor_t *head = nullptr;
    trace_anchor_t *page = nullptr; // one that the test has made
};

TEST_F(PageAnchor, TakesSizesSpecificationAndMutexFromTheHead)
{
    page = getSplAnchor(head, "/tmp/t.2.sp");
    ASSERT_NE(page, nullptr);
    EXPECT_STREQ(page->fileName, "/tmp/t.2.sp");
    EXPECT_EQ(page->uMaxSize, head->uMaxSize);
    EXPECT_EQ(page->pageSize, 16384);
    EXPECT_EQ(page->uRequestedFileSize, 123456U);
    EXPECT_EQ(page->spool, &spool);
    EXPECT_EQ(page->pSpoolMutex, &shared);
}

TEST_F(PageAnchor, PointsAtTheHeadsActivePage)
{
    page = getSplAnchor(head, "/tmp/t.2.sp");
    ASSERT_NE(page, nullptr);
    EXPECT_EQ(page->pActivePg, nullptr);
    EXPECT_EQ(page->ppActivePg, &head->pActivePg);
    EXPECT_EQ(page->p_head_spool_anchor, head);
    EXPECT_EQ(page->nextPage, nullptr);
    EXPECT_EQ(page->pMap, nullptr);
    EXPECT_EQ(page->mapFd, -1);
}

TEST_F(PageAnchor, IsNotInTheListOfTraceFiles)
{
    page = getSplAnchor(head, "/tmp/t.2.sp");
    ASSERT_NE(page, nullptr);
    EXPECT_EQ(anchors.numAnchors, 2U);
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/t.2.sp", 0), nullptr);
}

TEST_F(PageAnchor, IsTheTraceFileOfThatNameAsItStandsWhenThereIsOne)
{
    trace_anchor_t *file = anchor_for("/tmp/t.2.sp", 99);
    EXPECT_EQ(getSplAnchor(head, "/tmp/t.2.sp"), file);
    EXPECT_EQ(file->uRequestedFileSize, 99U);
    EXPECT_EQ(file->spool, nullptr);
    EXPECT_EQ(file->p_head_spool_anchor, nullptr);
}

TEST_F(PageAnchor, CannotBeMadeWithoutMemory)
{
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    EXPECT_EQ(getSplAnchor(head, "/tmp/t.2.sp"), nullptr);
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().message_number, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
}

class PageSetLookUp : public PageAnchor
{
protected:
    void SetUp() override
    {
        PageAnchor::SetUp();
        page = getSplAnchor(head, "/tmp/t.2.sp");
        head->nextPage = page;
        page->nextPage = head;
    }
};

TEST_F(PageSetLookUp, FindsTheHeadByTheNameOfTheTrace)
{
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/t", 1), head);
    EXPECT_EQ(anchors.numAnchors, 2U);
}

TEST_F(PageSetLookUp, FindsTheHeadByTheNameOfTheFirstPage)
{
    EXPECT_EQ(findOrCreateAnchorForFile("/tmp/t.1.sp", 1), head);
    EXPECT_EQ(anchors.numAnchors, 2U);
}

TEST_F(PageSetLookUp, CreatesASeparateAnchorForTheNameOfAnotherPage)
{
    trace_anchor_t *other = findOrCreateAnchorForFile("/tmp/t.2.sp", 1);
    EXPECT_NE(other, head);
    EXPECT_NE(other, page);
    EXPECT_EQ(anchors.numAnchors, 3U);
    EXPECT_EQ(anchors.next, other);
}
} // namespace
