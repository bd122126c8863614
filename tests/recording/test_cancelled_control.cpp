// A thread that is cancelled while it registers, unregisters or names a file: what was half made is undone, every lock
// is free, and the next caller succeeds.
#include <cstdlib>
#include <filesystem>

#include <gtest/gtest.h>

#include "recording/blocked_calls.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
size_t open_descriptors()
{
    size_t count = 0;
    for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) count += !entry.path().empty();
    return count;
}

std::pair<std::string, int> at(const char *call, int count) { return {call, count}; }

// The call at which the registering thread is cancelled, and how many of them it makes before.
class CancelledRegistration : public testing::TestWithParam<std::pair<std::string, int>>
{
};
} // namespace

INSTANTIATE_TEST_SUITE_P(At, CancelledRegistration,
                         testing::Values(at("open", 1), at("write", 1), at("write", 2), at("fsync", 1),
                                         at("vsyslog", 1), at("vsyslog", 2), at("vsyslog", 3), at("vsyslog", 4),
                                         at("vsyslog", 5), at("vsyslog", 6), at("vsyslog", 7)),
                         [](const auto &info) { return info.param.first + std::to_string(info.param.second); });

TEST_P(CancelledRegistration, LeavesNothingBehind)
{
    const scratch folder;
    const std::string file = folder / "app.trc";
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    ASSERT_EQ(tr_set_filename_1(file.c_str()), 0);
    ASSERT_EQ(tr_set_size_1(1048576), 0); // written in several calls
    client half("HALF");
    const size_t descriptors = open_descriptors();
    ASSERT_TRUE(cancelled_in(
        GetParam().first, [&] { half.register_now(); }, GetParam().second));

    EXPECT_EQ(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(anchors.uMaxSize, 0U);
    EXPECT_EQ(open_descriptors(), descriptors);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(component_list_mutex));
    EXPECT_TRUE(is_free(anchor_list_mutex));
    EXPECT_TRUE(is_free(spq.mutex));

    EXPECT_EQ(half.register_now(), 0);
    EXPECT_EQ(tr_record_id_1("HALF", 1), 0);
    EXPECT_EQ(trace_image::of_file(file).records().back().u32(28), 1U);
}

TEST(CancelledRegistrationWithAReader, LeavesTheFileUnmapped)
{
    const one_trace trace(4096);
    EXPECT_EQ(tr_record_id_1("OLD1", 1), 0);
    anchors.pNextFree->seqNumber = 40; // what the start record is to overwrite
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 40);
    EXPECT_EQ(tr_unregister_component_1("TEST"), 0);
    client half("HALF");
    ASSERT_TRUE(cancelled_in("usleep", [&] { half.register_now(); }));
    EXPECT_EQ(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(anchors.uMaxSize, 0U);
    EXPECT_TRUE(is_free(anchors.anchorMutex));

    reader.set_u32(tail_reader::seq_lock, 1);
    EXPECT_EQ(half.register_now(), 0);
    EXPECT_EQ(tr_record_id_1("HALF", 2), 0);
    EXPECT_EQ(trace.written().size(), 2U); // the old one too: the file was continued
}

TEST(CancelledRegistration, KeepsTheOtherComponents)
{
    const one_trace trace;
    const std::string other = trace.folder() / "other.trc";
    ASSERT_NE(findOrCreateAnchorForFile(other.c_str(), 1), nullptr); // started by the next registration
    client half("HALF");
    ASSERT_TRUE(cancelled_in("open", [&] { half.register_now(); }));
    ASSERT_NE(anchors.pFirstComp, nullptr);
    EXPECT_STREQ(anchors.pFirstComp->compId, "TEST");
    EXPECT_EQ(anchors.pFirstComp->pNext, nullptr);
    EXPECT_EQ(tr_record_id_1("TEST", 1), 0);
    EXPECT_EQ(trace.written().size(), 1U);
    EXPECT_EQ(tr_unregister_component_1("HALF"), 26);
}

TEST(CancelledUnregistration, LeavesTheLocksFree)
{
    const one_trace trace;
    ASSERT_TRUE(cancelled_in("msync", [] { tr_unregister_component_1("TEST"); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(component_list_mutex));
    EXPECT_TRUE(is_free(spq.mutex));
    client next("NEXT");
    EXPECT_EQ(next.register_now(), 0);
    EXPECT_EQ(tr_record_id_1("NEXT", 1), 0);
    EXPECT_EQ(trace.only_record().component(), "NEXT");
}

TEST(CancelledNaming, LeavesTheLocksFree)
{
    const one_trace trace;
    const std::string next = trace.folder() / "next.trc";
    ASSERT_TRUE(cancelled_in("open", [&] { tr_set_filename_1(next.c_str()); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(tr_set_filename_1(trace.file().c_str()), 0);
    EXPECT_EQ(tr_record_id_1("TEST", 1), 0);
    EXPECT_EQ(trace.written().size(), 1U);
}
