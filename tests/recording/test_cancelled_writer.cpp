// A thread that is cancelled inside a record writer, while it waits for a reader of the file.
#include <gtest/gtest.h>

#include "recording/blocked_calls.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/writers.h"

using namespace qn::test;

namespace
{
class CancelledWriter : public testing::TestWithParam<writer_call>
{
protected:
    // A reader holds the record that is overwritten next.
    void SetUp() override
    {
        EXPECT_EQ(tr_record_id_1("OLD1", 1), 0);
        anchors.pNextFree->seqNumber = 40;
        poke_u32(12, 40);
        ASSERT_TRUE(cancelled_in("usleep", [] { GetParam().write("COMP", nullptr); }));
    }
    void TearDown() override { poke_u32(12, 1); }

    const one_trace trace_{4096};
};

std::string name_of(const testing::TestParamInfo<writer_call> &info) { return info.param.name; }
} // namespace

INSTANTIATE_TEST_SUITE_P(Every, CancelledWriter, testing::ValuesIn(all_writers()), name_of);

TEST_P(CancelledWriter, LeavesTheLockFreeAndTheRingSound)
{
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_EQ(trace_.only_record().component(), "OLD1"); // nothing of the cancelled record is seen

    poke_u32(12, 1);
    EXPECT_EQ(GetParam().write("COMP", nullptr), 0);
    const auto records = trace_.written();
    ASSERT_EQ(records.size(), 2U);
    expect_record(records[1], GetParam().function, "COMP", GetParam().body);
}

TEST(CancelledWriterOfAToken, LeavesTheLockOfThatFileFree)
{
    const one_trace trace(4096);
    const tr_file_token_t token = start_another(trace.folder() / "other.trc", 4096);
    tail_reader reader(trace.folder() / "other.trc");
    token->pNextFree->seqNumber = 40;
    reader.set_u32(tail_reader::seq_lock, 40);
    ASSERT_TRUE(cancelled_in("usleep", [=] { tr_ms_record_id_1("COMP", 1, token); }));
    EXPECT_TRUE(is_free(token->anchorMutex));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    reader.set_u32(tail_reader::seq_lock, 1);
    EXPECT_EQ(tr_ms_record_id_1("COMP", 2, token), 0);
    EXPECT_EQ(trace_image::of_file(trace.folder() / "other.trc").records().back().u32(28), 2U);
}

TEST(CancelledWriterOfALongRecord, LeavesTheLockFree)
{
    const one_trace trace(4096);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1948);
    ASSERT_TRUE(cancelled_in("usleep", [] { tr_record_id_1("COMP", 1); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    reader.set_u32(tail_reader::tail_request, 0);
    EXPECT_EQ(tr_record_id_1("COMP", 2), 0);
    EXPECT_EQ(trace.only_record().u32(28), 2U);
}

TEST(WriterCancelledBehindAWrap, LeavesTheRingSound)
{
    const one_trace trace(4096);
    lay_out({{32, 1, 30}, {3824, 1, 32}, {40, 1, 34}}, 2, 34);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 30); // met behind the filler
    ASSERT_TRUE(cancelled_in("usleep", [] { tr_record_id_1("COMP", 1); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_EQ(trace.image().ring().size(), 3U);
    reader.set_u32(tail_reader::seq_lock, 1);
    EXPECT_EQ(tr_record_id_1("COMP", 2), 0);
    EXPECT_EQ(trace.image().ring().back().u32(28), 2U);
}

TEST(WriterCancelledInADebugLine, LeavesTheLockFreeAndTheRingSound)
{
    const one_trace trace(4096);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 104); // is clipped, which is worth a line
    qn::tr::store_relaxed(global_debug_level, 8);
    ASSERT_TRUE(cancelled_in("vsyslog", [] { tr_record_id_1("COMP", 1); }));
    qn::tr::store_relaxed(global_debug_level, 0);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_EQ(tr_record_id_1("COMP", 2), 0);
    EXPECT_EQ(trace.image().ring().back().u32(28), 2U);
}
