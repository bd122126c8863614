// tr_set_trace_levels_1 as a whole: taken whole or not at all, kept for later registrations, files started.
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "support/failing_memory.h"
#include "support/scratch.h"

namespace
{
using namespace qn::test;

TEST(SetLevels, AcceptsNothingAndChangesNothing)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    leave_marker();
    EXPECT_EQ(after(tr_set_trace_levels_1("")), success());
    EXPECT_EQ(made.levels, levels{1});
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
}

TEST(SetLevels, KeepsEveryElementInOrder)
{
    ASSERT_EQ(tr_set_trace_levels_1("A:a=1,B:b=2"), 0);
    ASSERT_EQ(tr_set_trace_levels_1("C:c=3"), 0);
    EXPECT_TRUE(is_well_linked(anchors.pFirstTraceSpec, anchors.pLastTraceSpec));
    ASSERT_EQ(count_of(anchors.pFirstTraceSpec), 3U);
    EXPECT_STREQ(anchors.pFirstTraceSpec->pCompId, "A");
    EXPECT_STREQ(anchors.pLastTraceSpec->pCompId, "C");
}

TEST(SetLevels, ReportsTheErrorAndKeepsNothingOfAFaultySpecification)
{
    client made("ok");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_set_trace_levels_1("ok:c0=9,bad")), syntax_error(11, 11));
    EXPECT_EQ(made.levels, levels{1});
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    EXPECT_EQ(anchors.pLastTraceSpec, nullptr);
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(SetLevels, KeepsWhatItHeldBeforeAFaultySpecification)
{
    ASSERT_EQ(tr_set_trace_levels_1("A:a=1"), 0);
    EXPECT_EQ(after(tr_set_trace_levels_1("B:b=2,:c")), syntax_error(10, 6));
    EXPECT_EQ(anchors.pFirstTraceSpec, anchors.pLastTraceSpec);
    EXPECT_STREQ(anchors.pFirstTraceSpec->pCompId, "A");
    EXPECT_EQ(anchors.pFirstTraceSpec->pNext, nullptr);
}

TEST(SetLevels, AppliesTheNewElementsAlone)
{
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(tr_set_trace_levels_1("AB:*=9"), 0);
    made.levels = {77, 77};
    ASSERT_EQ(tr_set_trace_levels_1("AB:c1=5"), 0);
    EXPECT_EQ(made.levels, (levels{77, 5})) << "the kept elements wait for later registrations";
}

TEST(SetLevels, ClearsTheErrorRecord)
{
    leave_marker();
    EXPECT_EQ(after(tr_set_trace_levels_1("*:*")), success());
}

TEST(SetLevels, AreSetAlsoOnceTracingIsStopped)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    global_stop_trace();
    leave_marker();
    EXPECT_EQ(after(tr_set_trace_levels_1("AB:*=9")), success());
    EXPECT_EQ(made.levels, levels{9});
    EXPECT_EQ(count_of(anchors.pFirstTraceSpec), 1U);
    EXPECT_EQ(after(tr_set_trace_levels_1(":")), syntax_error(10, 0));
}

TEST(SetLevels, FailsWhenTheGlobalMutexCannotBeTaken)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(tr_set_trace_levels_1("*:*=9"));
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(made.levels, levels{1});
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
}

TEST(SetLevels, ChangesNothingWhenMemoryRunsOut)
{
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    for (int number = 1; number <= 2; ++number) {
        qn_int32_t status = 0;
        {
            const failing_allocation out_of_memory(number);
            status = tr_set_trace_levels_1("AB:c0=9,AB:c1=9");
        }
        EXPECT_EQ(after(status), no_memory());
        EXPECT_EQ(made.levels, levels(2, 1));
        EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    }
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(SetLevels, ChangesNothingWhenTheThreadIsCancelledInTheParser)
{
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_TRUE(is_cancelled_in([] {
        const cancellation_in_pattern cancellation(3);
        tr_set_trace_levels_1("AB:c0=9,AB:c1=9");
    }));
    EXPECT_EQ(made.levels, levels(2, 1));
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(SetLevels, LeavesTheMutexFreeWhenTheThreadIsCancelledInAStart)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_TRUE(is_cancelled_in([] { tr_set_trace_levels_1("AB:*=9"); }));
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(after(tr_set_trace_levels_1("AB:*=8")), success());
    EXPECT_NE(anchors.pMap, nullptr);
}

TEST(SetLevels, StartsTheFilesThatNowHaveSomethingToTrace)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    ASSERT_EQ(tr_set_file_size_1((files / "b.trc").c_str(), 4096), 0);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(after(tr_set_trace_levels_1("AB:*=1")), success());
    EXPECT_TRUE(std::filesystem::exists(files / "a.trc"));
    EXPECT_TRUE(std::filesystem::exists(files / "b.trc"));
}

TEST(SetLevels, StopsNoFile)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(tr_set_trace_levels_1("AB:*=1"), 0);
    ASSERT_NE(anchors.pMap, nullptr);
    EXPECT_EQ(tr_set_trace_levels_1("AB:*=0"), 0);
    EXPECT_EQ(made.levels, levels{0});
    EXPECT_NE(anchors.pMap, nullptr);
}

// The list of trace files is walked from the default file to the oldest.
TEST(SetLevels, ReturnsWhatTheLastStartReturned)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "missing/default.trc").c_str()), 0);
    ASSERT_EQ(tr_set_file_size_1((files / "oldest.trc").c_str(), 4096), 0);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_set_trace_levels_1("AB:*=1")), success());
    EXPECT_EQ(made.levels, levels{1});
}

TEST(SetLevels, ReturnsTheFailureOfTheLastStartAndKeepsTheSpecification)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "default.trc").c_str()), 0);
    ASSERT_EQ(tr_set_file_size_1((files / "missing/oldest.trc").c_str(), 4096), 0);
    client made("AB", 1, 0);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_set_trace_levels_1("AB:*=1")), no_such_file());
    EXPECT_EQ(made.levels, levels{1});
    EXPECT_EQ(count_of(anchors.pFirstTraceSpec), 1U);
    EXPECT_NE(anchors.pMap, nullptr);
}

TEST(SetLevels, TriesAStartAgainEvenWithoutAnElement)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "missing/a.trc").c_str()), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 18);
    EXPECT_EQ(after(tr_set_trace_levels_1("")), no_such_file());
}
} // namespace
