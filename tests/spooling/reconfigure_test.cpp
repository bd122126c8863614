// The configuration file is read again, and every trace is bound to what it says now.
#include <cstring>
#include <filesystem>

#include <gtest/gtest.h>

#include "spooling/reconfigured.h"

namespace
{
using namespace qn::test;

using patterns = std::vector<std::string>;

TEST_F(Reconfigured, InstallsTheFreshList)
{
    run({"old"}, [] {
        write_conf(traces({"a", "b"}));
        reconfigure();
        EXPECT_EQ(list(), (patterns{"a", "b"}));
        EXPECT_STREQ(anchors.pLastSpoolSpec->pattern, "b");
        EXPECT_EQ(anchors.pFirstSpoolSpec->pPrev, nullptr);
    });
}

TEST_F(Reconfigured, MayEmptyTheList)
{
    run({"old"}, [] {
        write_conf("");
        reconfigure();
        EXPECT_EQ(anchors.pFirstSpoolSpec, nullptr);
        EXPECT_EQ(anchors.pLastSpoolSpec, nullptr);
    });
}

TEST_F(Reconfigured, ChangesNothingWithoutAFile)
{
    run({"old"}, [] {
        const trace_spool_spec_t *first = anchors.pFirstSpoolSpec;
        trace_anchor_t *trace = anchor_for("/var/old.trc");
        trace->bSpoolProcessed = 1;
        reconfigure();
        EXPECT_EQ(anchors.pFirstSpoolSpec, first);
        EXPECT_EQ(list(), patterns{"old"});
        EXPECT_EQ(trace->spool, nullptr) << "it was not looked for";
    });
}

TEST_F(Reconfigured, ChangesNothingWhenMemoryRunsOut)
{
    run({"old"}, [] {
        write_conf(traces({"a", "b"}));
        int made = 0;
        calls().calloc = [&](size_t count, size_t size) -> void * {
            if (count * size == sizeof(trace_spool_spec_t) && ++made == 2) return nullptr;
            return __real_calloc(count, size);
        };
        reconfigure();
        calls() = {};
        EXPECT_EQ(list(), patterns{"old"});
    });
}

TEST_F(Reconfigured, ChangesNothingWithoutItsLock)
{
    run({"old"}, [] {
        write_conf(traces({"a"}));
        {
            const exhausted_mutex unlockable(anchors.anchorMutex);
            reconfigure();
        }
        EXPECT_EQ(list(), patterns{"old"});
    });
}

TEST_F(Reconfigured, ChangesNothingOnceTracingIsStopped)
{
    run({"old"}, [] {
        write_conf(traces({"a"}));
        global_stop_trace();
        reconfigure();
        EXPECT_EQ(list(), patterns{"old"});
    });
}

TEST_F(Reconfigured, MayBeBeforeTheFileIsReadForTheFirstTime)
{
    expect_in_private_var([] {
        pthread_once(&trace_global_data_once, initialize_trace_global_data);
        write_conf(traces({"a", "b"}));
        reconfigure();
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        EXPECT_EQ(list(), (patterns{"a", "b"})) << "not read into the list once more";
    });
}

TEST_F(Reconfigured, SwitchesEveryPatternThatIsOffOnWithoutCopies)
{
    run({}, [] {
        write_conf(section("a", {"pat = a", "dest = /var/spool/a", "spooling = OFF"}) +
                   section("b", {"pat = b", "dest = /var/spool/b", "spooling = ON"}));
        reconfigure();
        ASSERT_EQ(list(), (patterns{"a", "b"}));
        EXPECT_EQ(anchors.pFirstSpoolSpec->onoff, 1);
        EXPECT_STREQ(anchors.pFirstSpoolSpec->dest, "/dev/null");
        EXPECT_STREQ(anchors.pLastSpoolSpec->dest, "/var/spool/b");
    });
}

TEST_F(Reconfigured, BindsEveryTraceAnew)
{
    run({}, [] {
        trace_anchor_t *first = anchor_for("/var/a.trc");
        trace_anchor_t *second = anchor_for("/var/b.trc");
        qn::tr::set_file_name(&anchors, "/var/default.trc");
        for (trace_anchor_t *trace : {&anchors, first, second}) trace->bSpoolProcessed = 1;
        write_conf(traces({"/a.trc", "/b.trc", "/default.trc"}));
        reconfigure();
        for (trace_anchor_t *trace : {&anchors, first, second}) {
            EXPECT_EQ(trace->bSpoolProcessed, 1);
            ASSERT_NE(trace->spool, nullptr);
            EXPECT_NE(std::string(trace->fileName).find(trace->spool->pattern), std::string::npos);
        }
    });
}

TEST_F(Reconfigured, BindsTheDefaultTraceFirst)
{
    run({}, [] {
        anchor_for("/var/a.trc");
        qn::tr::set_file_name(&anchors, "/var/default.trc");
        write_conf(traces({"nothing"}));
        debug_on();
        reconfigure();
        const auto lines = debug_lines();
        const auto place = [&](const std::string &file) {
            return std::find(lines.begin(), lines.end(),
                             "match_spool_file_name: checking '" + file + "' on 'nothing'\n");
        };
        EXPECT_NE(place("/var/default.trc"), lines.end());
        EXPECT_LT(place("/var/default.trc"), place("/var/a.trc"));
    });
}

TEST_F(Reconfigured, CopiesToTheDestinationThatTheFileNamesNow)
{
    run({}, [] {
        be_on_a_known_node();
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        write_conf(section("a", {"pat = a", "dest = /var/one", "spooling = ON"}));
        reconfigure();
        write_conf(section("a", {"pat = a", "dest = /var/two", "spooling = ON"}));
        reconfigure();
        ASSERT_NE(trace->spool, nullptr);
        EXPECT_EQ(trace->spool->dest, "/var/two/" + node_path);
        EXPECT_EQ(trace->spool, anchors.pFirstSpoolSpec) << "the first is gone";
    });
}

TEST_F(Reconfigured, GrowsAndShrinksARingThatIsInUse)
{
    run({}, [] {
        const auto conf = [](const char *pages) {
            return section("a", {"pat = a.trc", std::string("pages = ") + pages, "size = 262144", "spooling = ON"});
        };
        write_conf(conf("10"));
        reconfigure();
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        ASSERT_EQ(start(trace), 0);
        EXPECT_EQ(ring_of(trace).size(), 10U);
        EXPECT_FALSE(exists("/var/a.trc.11.sp"));

        write_conf(conf("12"));
        reconfigure();
        EXPECT_EQ(ring_of(trace).size(), 12U);
        EXPECT_EQ(ring_of(trace).back(), "/var/a.trc.12.sp");
        EXPECT_TRUE(exists("/var/a.trc.11.sp"));
        EXPECT_TRUE(exists("/var/a.trc.12.sp"));

        trace_anchor_t *eleventh = trace;
        for (int number = 1; number < 11; ++number) eleventh = eleventh->nextPage;
        eleventh->pMap[192] = 2;
        spool_enqueue(nullptr, nullptr, eleventh, &spq, 0);
        write_conf(conf("10"));
        reconfigure();
        EXPECT_EQ(ring_of(trace).size(), 10U);
        EXPECT_EQ(trace->p_obsolete_pages, eleventh);
        EXPECT_NE(eleventh->pMap, nullptr);
        EXPECT_EQ(eleventh->next, nullptr) << "the twelfth page was free to go";

        spool_dequeue_last_and_spool_inside_spq(&spq);
        reconfigure();
        EXPECT_EQ(trace->p_obsolete_pages, nullptr);
    });
}

TEST_F(Reconfigured, LeavesARunningSingleFileASingleFile)
{
    run({}, [] {
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        ASSERT_EQ(start(trace), 0);
        write_conf(traces({"a.trc"}));
        reconfigure();
        ASSERT_NE(trace->spool, nullptr);
        write_conf(section("a", {"pat = a.trc", "pages = 20", "size = 262144", "spooling = ON"}));
        reconfigure();
        EXPECT_EQ(trace->nextPage, nullptr);
        EXPECT_FALSE(exists("/var/a.trc.1.sp"));
        write_ids(trace, 3);
        EXPECT_EQ(ids_in("/var/a.trc"), (std::vector<uint32_t>{1, 2, 3}));
        stop(trace);
    });
}

TEST_F(Reconfigured, LeavesNoLockHeld)
{
    run({"old"}, [] {
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        write_conf(traces({"a.trc"}));
        reconfigure();
        EXPECT_TRUE(is_free(anchors.anchorMutex));
        EXPECT_TRUE(is_free(trace->anchorMutex));
        EXPECT_TRUE(is_free(spq.mutex));
    });
}

TEST_F(Reconfigured, LeavesNoLockHeldWhenItIsCancelled)
{
    run({"old"}, [] {
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        write_conf(traces({"a.trc"}));
        debug_on();
        cancelled_thread thread;
        spool_calls().log_line = [&](const std::string &text) {
            if (text == "match_spool_file_name: checking '/var/a.trc' on 'a.trc'\n") thread.block();
        };
        EXPECT_TRUE(thread.run([] { reconfigure(); }));
        spool_calls().log_line = nullptr;
        EXPECT_TRUE(is_free(anchors.anchorMutex));
        EXPECT_TRUE(is_free(trace->anchorMutex));
    });
}
} // namespace
