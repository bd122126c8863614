// The end of all tracing: tr_term, by hand and at exit.
#include <cstdlib>

#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"
#include "trace/spooling/spool.h"

namespace
{
using namespace qn::test;

class Termination : public testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(tr_set_filename_1(file.c_str()), 0);
        ASSERT_EQ(program.register_now(), 0);
        other = anchor_for(folder / "other");
        ASSERT_EQ(start(other), 0);
        ASSERT_EQ(tr_record_id_1("ABCD", 1), 0);
        ASSERT_EQ(tr_ms_record_id_1("ABCD", 2, other), 0);
    }

    scratch folder;
    std::string file = folder / "f";
    client program{"ABCD", 2};
    trace_anchor_t *other = nullptr;
};

TEST_F(Termination, StopsTracingForGood)
{
    EXPECT_EQ(master_override_off(), 0);
    tr_term();
    EXPECT_NE(master_override_off(), 0);
    EXPECT_EQ(global_switch, 1);
}

TEST_F(Termination, StopsEveryTraceOfTheList)
{
    qn::tr::header_of(&anchors)->uFlags = 0x8000;
    qn::tr::header_of(other)->uFlags = 0x8000;
    tr_term();
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(other->pMap, nullptr);
    EXPECT_EQ(trace_image::of_file(file).u16(4), 0);
    EXPECT_EQ(trace_image::of_file(folder / "other").u16(4), 0);
    EXPECT_EQ(ids_in(file), std::vector<uint32_t>{1});
    EXPECT_EQ(ids_in(folder / "other"), std::vector<uint32_t>{2});
}

TEST_F(Termination, EmptiesTheAnchorsButKeepsThemInTheList)
{
    ASSERT_EQ(tr_set_trace_levels_1("ABCD:*=3"), 0);
    ASSERT_EQ(tr_set_file_map_1("", "ABCD:c0"), 0);
    trace_spool_spec_t spool{};
    anchors.pFirstSpoolSpec = anchors.pLastSpoolSpec = &spool;
    ASSERT_NE(anchors.pFirstTraceSpec, nullptr);
    ASSERT_NE(anchors.pFirstMapSpec, nullptr);
    tr_term();
    EXPECT_EQ(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.pFirstTraceSpec, nullptr);
    EXPECT_EQ(anchors.pLastTraceSpec, nullptr);
    EXPECT_EQ(anchors.pFirstMapSpec, nullptr);
    EXPECT_EQ(anchors.pLastMapSpec, nullptr);
    EXPECT_EQ(anchors.pFirstSpoolSpec, &spool) << "spool specifications are kept";
    EXPECT_EQ(anchors.pLastSpoolSpec, &spool);
    EXPECT_STREQ(anchors.fileName, "");
    EXPECT_STREQ(other->fileName, "");
    EXPECT_EQ(anchors.bInitialized, 0);
    EXPECT_EQ(anchors.next, other);
    anchors.pFirstSpoolSpec = anchors.pLastSpoolSpec = nullptr;
}

TEST_F(Termination, LeadsAForkedChildToNoFreedSpecification)
{
    ASSERT_EQ(tr_set_trace_levels_1("ABCD:*=3"), 0);
    int children = 0;
    calls().free = [&children, spec = anchors.pLastTraceSpec](void *memory) {
        if (memory == spec) {
            EXPECT_TRUE(in_child([] {
                return tr_set_trace_levels_1("ABCD:*=4") == 0 && anchors.pFirstTraceSpec == anchors.pLastTraceSpec &&
                       anchors.pFirstTraceSpec->pPrev == nullptr;
            }));
            ++children;
        }
        __real_free(memory);
    };
    tr_term();
    calls() = {};
    EXPECT_EQ(children, 1);
}

TEST_F(Termination, LeavesEveryWriterReturningZeroWithoutWriting)
{
    tr_term();
    const std::string default_before = file_bytes(file);
    const std::string other_before = file_bytes(folder / "other");
    cu_error_t *error = nullptr;
    for (tr_file_token_t token : {tr_file_token_t{nullptr}, other}) {
        EXPECT_EQ(tr_ms_record_id_1("ABCD", 1, token), 0);
        EXPECT_EQ(tr_ms_record_strings_1("ABCD", 1, token, 1, "text"), 0);
        EXPECT_EQ(tr_ms_record_fmt_string_1("ABCD", 1, token, "%d", 1), 0);
        EXPECT_EQ(tr_ms_record_data_1("ABCD", 1, token, 1, "text", 4), 0);
        EXPECT_EQ(tr_ms_record_values_32_1("ABCD", 1, token, 1, 1), 0);
        EXPECT_EQ(tr_ms_record_values_64_1("ABCD", 1, token, 1, qn_int64_t{1}), 0);
        EXPECT_EQ(tr_ms_record_error_1("ABCD", 1, token, "f", 1, "s.c", &error), 0);
    }
    EXPECT_EQ(file_bytes(file), default_before);
    EXPECT_EQ(file_bytes(folder / "other"), other_before);
}

TEST_F(Termination, LeavesEveryWriterReturningZeroBeforeItsArgumentsAreLookedAt)
{
    tr_term();
    EXPECT_EQ(tr_record_id_1(nullptr, 1), 0);
    EXPECT_EQ(tr_record_id_1("", 1), 0);
}

TEST_F(Termination, FindsNothingToDoASecondTime)
{
    tr_term();
    const std::string before = file_bytes(file);
    int syncs = 0;
    calls().msync = [&](void *, size_t, int) { return ++syncs; };
    tr_term();
    EXPECT_EQ(syncs, 0);
    EXPECT_EQ(file_bytes(file), before);
}

TEST_F(Termination, TerminatesNothingWithoutTheGlobalMutex)
{
    {
        const exhausted_mutex global(anchors.anchorMutex);
        tr_term();
    }
    EXPECT_NE(master_override_off(), 0);
    EXPECT_NE(anchors.pMap, nullptr);
    EXPECT_NE(other->pMap, nullptr);
    EXPECT_NE(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.fileName, file);
}

TEST_F(Termination, WakesTheSpoolThread)
{
    std::vector<pthread_cond_t *> signalled;
    calls().cond_signal = [&](pthread_cond_t *condition) {
        signalled.push_back(condition);
        return 0;
    };
    tr_term();
    EXPECT_EQ(signalled, std::vector<pthread_cond_t *>{&spq.cond});
}

TEST_F(Termination, WaitsForTheSpoolThreadAtMostAHundredTimes20Milliseconds)
{
    std::vector<useconds_t> waits;
    calls().usleep = [&](useconds_t time) {
        waits.push_back(time);
        return 0;
    };
    is_spool_running = 1;
    tr_term();
    is_spool_running = 0;
    EXPECT_EQ(waits, std::vector<useconds_t>(100, 20000));
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST_F(Termination, GoesOnWhenTheSpoolThreadHasEnded)
{
    int waits = 0;
    calls().usleep = [&](useconds_t) {
        if (++waits == 3) is_spool_running = 0;
        EXPECT_NE(anchors.pMap, nullptr) << "the traces stay until then";
        return 0;
    };
    is_spool_running = 1;
    tr_term();
    EXPECT_EQ(waits, 3);
    EXPECT_EQ(anchors.pMap, nullptr);
}

TEST_F(Termination, DoesNotWaitWithoutASpoolThread)
{
    int waits = 0;
    calls().usleep = [&](useconds_t) { return ++waits; };
    tr_term();
    EXPECT_EQ(waits, 0);
}

TEST_F(Termination, OfOneAnchorLeavesTheOthers)
{
    {
        const qn::tr::global_lock global;
        const qn::tr::anchor_set_lock set(other);
        tr_term_file_anchor(other);
    }
    EXPECT_EQ(other->pMap, nullptr);
    EXPECT_STREQ(other->fileName, "");
    EXPECT_NE(anchors.pMap, nullptr);
    EXPECT_NE(anchors.pFirstComp, nullptr);
    EXPECT_EQ(master_override_off(), 0);
}

// Only exit handlers run between the mark in the header and the end of the child.
TEST(ExitHandler, TerminatesTracing)
{
    const scratch folder;
    const std::string file = folder / "f";
    const auto trace = [&] {
        static client program("ABCD");
        if (tr_set_filename_1(file.c_str()) != 0 || program.register_now() != 0) return false;
        qn::tr::header_of(&anchors)->uFlags = 0x8000;
        return true;
    };
    ASSERT_TRUE(in_child(trace, false));
    EXPECT_EQ(trace_image::of_file(file).u16(4), 0x8000) << "no handler ran";
    ASSERT_TRUE(in_child(trace, true));
    EXPECT_EQ(trace_image::of_file(file).u16(4), 0);
}
} // namespace
