// Stopping a trace file, and whether it has anything to trace.
#include <cerrno>

#include <sys/mman.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

struct sync_call {
    const void *map;
    size_t size;
    int flags;
    bool operator==(const sync_call &) const = default;
};

class StartedTrace : public testing::Test
{
protected:
    void SetUp() override
    {
        anchor = anchor_for(file);
        ASSERT_EQ(start(anchor), 0);
        calls().msync = [this](void *map, size_t size, int flags) {
            syncs.push_back({map, size, flags});
            flags_at_sync = trace_image::of_file(file).u16(4);
            return __real_msync(map, size, flags);
        };
    }
    void TearDown() override
    {
        calls() = {};
        stop(anchor);
    }

    void raise_flag() const { qn::tr::header_of(anchor)->uFlags = 0x8000; }

    scratch folder;
    std::string file = folder / "f";
    trace_anchor_t *anchor = nullptr;
    std::vector<sync_call> syncs;
    int flags_at_sync = -1;
};

TEST_F(StartedTrace, IsSyncedWholeWhenItStops)
{
    const void *map = anchor->pMap;
    EXPECT_EQ(stop_trace(anchor, 0), 0);
    EXPECT_EQ(syncs, (std::vector<sync_call>{{map, 65536, MS_SYNC}}));
}

TEST_F(StartedTrace, HasItsFlagsClearedBeforeItIsSynced)
{
    raise_flag();
    EXPECT_EQ(stop_trace(anchor, 0), 0);
    EXPECT_EQ(flags_at_sync, 0);
    EXPECT_EQ(trace_image::of_file(file).u16(4), 0);
}

TEST_F(StartedTrace, IsUnmappedWhenItStops)
{
    unsigned char *map = anchor->pMap;
    EXPECT_EQ(stop_trace_page(anchor, 0), 0);
    unsigned char resident[16];
    EXPECT_EQ(mincore(map, 65536, resident), -1);
    EXPECT_EQ(errno, ENOMEM);
}

TEST_F(StartedTrace, LeavesAnEmptyAnchorWhenItStops)
{
    EXPECT_EQ(stop_trace_page(anchor, 0), 0);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_EQ(anchor->pMapEnd, nullptr);
    EXPECT_EQ(anchor->uMaxSize, 0U);
    EXPECT_EQ(anchor->pWrap, nullptr);
    EXPECT_EQ(anchor->pNextFree, nullptr);
    EXPECT_EQ(anchor->uActualFileSize, 0U);
    EXPECT_EQ(anchor->uRequestedFileSize, 65536U) << "what was asked for stays";
    EXPECT_EQ(anchor->fileName, file);
}

TEST_F(StartedTrace, TakesNoRecordsOnceItIsStopped)
{
    EXPECT_EQ(stop_trace(anchor, 0), 0);
    const std::string before = file_bytes(file);
    EXPECT_EQ(tr_ms_record_id_1("TEST", 1, anchor), 0);
    EXPECT_EQ(file_bytes(file), before);
}

TEST_F(StartedTrace, IsStoppedOnlyOnce)
{
    EXPECT_EQ(stop_trace_page(anchor, 0), 0);
    EXPECT_EQ(stop_trace_page(anchor, 0), 0);
    EXPECT_EQ(stop_trace(anchor, 0), 0);
    EXPECT_EQ(syncs.size(), 1U);
}

TEST_F(StartedTrace, IsStoppedAlsoWhenItCannotBeSynced)
{
    calls().msync = [](void *, size_t, int) { return fail_with(EIO); };
    EXPECT_EQ(stop_trace(anchor, 0), 0);
    EXPECT_EQ(anchor->pMap, nullptr);
}

TEST_F(StartedTrace, IsNeitherTouchedNorSyncedByAForkedChild)
{
    raise_flag();
    const std::string before = file_bytes(file);
    debug_on();
    EXPECT_EQ(stop_trace(anchor, 1), 0);
    EXPECT_TRUE(syncs.empty());
    EXPECT_EQ(file_bytes(file), before);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_EQ(anchor->uMaxSize, 0U);
    EXPECT_EQ(anchor->uActualFileSize, 0U);
    EXPECT_EQ(debug_lines(), (std::vector<std::string>{
                                 "*** stop_trace for " + file, "**@ stop_trace_page enter for " + file + "\n",
                                 "spool_dequeue_element (" + file + ")\n", "spool_dequeue_element before: EMPTY\n",
                                 "spool_dequeue_element after: EMPTY\n"}));
}

class TraceState : public testing::Test
{
protected:
    client program{"ABCD", 3, 0};
};

TEST_F(TraceState, IsOffWithoutAFileName)
{
    ASSERT_EQ(program.register_now(), 0);
    program.levels[1] = 1;
    EXPECT_EQ(is_trace_on(&anchors), 0);
}

TEST_F(TraceState, IsOffWithoutComponents)
{
    ASSERT_EQ(tr_set_filename_1("/tmp/never-started"), 0);
    EXPECT_EQ(is_trace_on(&anchors), 0);
}

TEST_F(TraceState, IsOffWhileEveryLevelIsZero)
{
    ASSERT_EQ(tr_set_filename_1("/tmp/never-started"), 0);
    ASSERT_EQ(program.register_now(), 0);
    EXPECT_EQ(is_trace_on(&anchors), 0);
}

TEST_F(TraceState, IsOnWithOneLevelOfOneComponent)
{
    ASSERT_EQ(tr_set_filename_1("/tmp/never-started"), 0);
    ASSERT_EQ(program.register_now(), 0);
    client newer("EFGH", 2, 0);
    ASSERT_EQ(newer.register_now(), 0);
    program.levels[2] = 255;
    EXPECT_EQ(is_trace_on(&anchors), 1);
}

TEST_F(TraceState, IsTheSameForEveryAnchorWithAName)
{
    ASSERT_EQ(program.register_now(), 0);
    const trace_anchor_t *other = anchor_for("/tmp/never-started");
    EXPECT_EQ(is_trace_on(anchor_for("/tmp/never-started")), 0);
    program.levels[0] = 7;
    EXPECT_EQ(is_trace_on(anchor_for("/tmp/never-started")), 1) << "the default anchor's components count";
    EXPECT_EQ(other->pFirstComp, nullptr);
}
} // namespace
