// The specification that is made for a trace that may have pages and that no configured one matches.
#include <climits>
#include <cstdlib>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class DefaultBinding : public testing::Test
{
protected:
    DefaultBinding()
    {
        anchors.bMultipageEnabled = 1;
        anchor = anchor_for(folder / "a.trc", 1048576);
    }
    ~DefaultBinding() override
    {
        if (anchor->spool != nullptr && anchor->spool->isDefaultSpec == 1) std::free(anchor->spool);
        anchor->spool = nullptr;
    }

    trace_spool_spec_t *process()
    {
        const qn::tr::global_lock global;
        const qn::tr::anchor_set_lock set(anchor);
        return process_spool_spec(anchor, list.first);
    }

    scratch folder;
    specifications list;
    no_spool_thread thread;
    trace_anchor_t *anchor = nullptr;
};

TEST_F(DefaultBinding, CopiesNothing)
{
    EXPECT_EQ(process(), nullptr);
    ASSERT_NE(anchor->spool, nullptr);
    EXPECT_STREQ(anchor->spool->dest, "/dev/null");
    EXPECT_EQ(anchor->spool->onoff, 1);
    EXPECT_EQ(anchor->spool->isDefaultSpec, 1);
    EXPECT_EQ(anchor->spool->pg_size, 262144U);
    EXPECT_EQ(anchor->spool->sync_interval, 60U);
    EXPECT_STREQ(anchor->spool->pattern, "");
    EXPECT_EQ(anchor->spool->dir, nullptr);
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
}

TEST_F(DefaultBinding, IsInNoList)
{
    process();
    ASSERT_NE(anchor->spool, nullptr);
    EXPECT_EQ(anchor->spool->pNext, nullptr);
    EXPECT_EQ(anchor->spool->pPrev, nullptr);
    EXPECT_EQ(anchors.pFirstSpoolSpec, nullptr);
}

TEST_F(DefaultBinding, StartsTheSpoolThread)
{
    process();
    EXPECT_EQ(thread.attempts(), 1);
}

struct requested {
    qn_uint32_t bytes;
    qn_uint32_t pages;
};

void PrintTo(const requested &given, std::ostream *out) { *out << given.bytes; }

class DefaultPages : public DefaultBinding, public testing::WithParamInterface<requested>
{
};

TEST_P(DefaultPages, AreAsManyAsTheSizeHoldsAndFourAtLeast)
{
    anchor->uRequestedFileSize = GetParam().bytes;
    process();
    ASSERT_NE(anchor->spool, nullptr);
    EXPECT_EQ(anchor->spool->pages, GetParam().pages);
}

INSTANTIATE_TEST_SUITE_P(Values, DefaultPages,
                         testing::Values(requested{0, 4}, requested{65536, 4}, requested{1048576, 4},
                                         requested{1310719, 4}, requested{1310720, 5}, requested{4194304, 16},
                                         requested{UINT_MAX, 16383}));

TEST_F(DefaultBinding, IsNotMadeForATraceThatMatches)
{
    trace_spool_spec_t *spec = list.add("a.trc");
    process();
    EXPECT_EQ(anchor->spool, spec);
}

TEST_F(DefaultBinding, IsMadeForATraceThatDoesNotMatch)
{
    list.add("b.trc");
    process();
    ASSERT_NE(anchor->spool, nullptr);
    EXPECT_EQ(anchor->spool->isDefaultSpec, 1);
}

TEST_F(DefaultBinding, IsMadeOnlyWhenTracesMayHavePages)
{
    anchors.bMultipageEnabled = 0;
    process();
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
}

TEST_F(DefaultBinding, StaysAndIsNotGivenBack)
{
    process();
    const trace_spool_spec_t *spec = anchor->spool;
    anchor->bSpoolProcessed = 0;
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, spec);
}

TEST_F(DefaultBinding, GivesWayToASpecificationThatMatchesNow)
{
    process();
    trace_spool_spec_t *spec = list.add("a.trc");
    anchor->bSpoolProcessed = 0;
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, spec);
}

TEST_F(DefaultBinding, NeedsMemoryAndIsTriedAgain)
{
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(process(), nullptr);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(anchor->bSpoolProcessed, 0);
    EXPECT_EQ(thread.attempts(), 0);

    process();
    EXPECT_NE(anchor->spool, nullptr);
}

TEST_F(DefaultBinding, SplitsAMebibyteIntoFourPages)
{
    ASSERT_EQ(start(anchor), 0);
    for (const char *name : {"a.trc.1.sp", "a.trc.2.sp", "a.trc.3.sp", "a.trc.4.sp"})
        EXPECT_EQ(trace_image::of_file(folder / name).size(), 262144U) << name;
    EXPECT_FALSE(exists(folder / "a.trc.5.sp"));
    stop(anchor);
}

TEST_F(DefaultBinding, SplitsFourMebibytesIntoSixteenPages)
{
    anchor->uRequestedFileSize = 4194304;
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(trace_image::of_file(folder / "a.trc.16.sp").size(), 262144U);
    EXPECT_FALSE(exists(folder / "a.trc.17.sp"));
    stop(anchor);
}

TEST_F(DefaultBinding, HasItsPagesRecycledWithoutACopy)
{
    ASSERT_EQ(start(anchor), 0);
    const auto before = entries_of(folder.folder());
    sp_q_element_t element{};
    element.pAnchor = anchor;
    EXPECT_EQ(do_spool(&element), 0);
    EXPECT_EQ(entries_of(folder.folder()), before);
    stop(anchor);
}
} // namespace
