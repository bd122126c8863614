// Specifications that are gone from the configuration file and still govern traces.
#include <cstring>

#include <gtest/gtest.h>

#include "spooling/reconfigured.h"

namespace
{
using namespace qn::test;

using patterns = std::vector<std::string>;

class Kept : public Reconfigured
{
protected:
    // Traces /var/a.trc, /var/b.trc, ... bound to specifications with their own patterns.
    static std::vector<trace_anchor_t *> bound(const patterns &names)
    {
        std::vector<trace_anchor_t *> traces_bound;
        for (const std::string &name : names) traces_bound.push_back(anchor_for("/var/" + name));
        write_conf(traces(names));
        reconfigure();
        for (const trace_anchor_t *trace : traces_bound) EXPECT_NE(trace->spool, nullptr) << trace->fileName;
        return traces_bound;
    }
};

TEST_F(Kept, GovernTheirTracesWithoutCopies)
{
    run({}, [] {
        trace_anchor_t *trace = bound({"a.trc"})[0];
        const trace_spool_spec_t *spec = trace->spool;
        write_conf(traces({"other"}));
        reconfigure();
        EXPECT_EQ(trace->spool, spec);
        EXPECT_STREQ(spec->dest, "/dev/null");
        EXPECT_EQ(spec->onoff, 1);
        EXPECT_EQ(spec->pages, 8U);
    });
}

TEST_F(Kept, FollowTheFreshList)
{
    run({}, [] {
        trace_anchor_t *trace = bound({"a.trc"})[0];
        write_conf(traces({"x", "y"}));
        reconfigure();
        EXPECT_EQ(list(), (patterns{"x", "y", "a.trc"}));
        EXPECT_STREQ(anchors.pLastSpoolSpec->pattern, "y") << "which stays the last";
        EXPECT_EQ(trace->spool->pPrev, anchors.pLastSpoolSpec);
        EXPECT_EQ(trace->spool->pNext, nullptr);
    });
}

TEST_F(Kept, FollowInTheOrderInWhichTheirTracesAreBound)
{
    run({}, [] {
        // The newest trace is next to the default one.
        bound({"a.trc", "b.trc", "c.trc"});
        write_conf(traces({"x"}));
        reconfigure();
        EXPECT_EQ(list(), (patterns{"x", "c.trc", "b.trc", "a.trc"}));
    });
}

TEST_F(Kept, LeaveTheOthersToBeFreed)
{
    run({}, [] {
        const auto bound_traces = bound({"a.trc", "b.trc", "c.trc"});
        write_conf(traces({"a.trc", "c.trc"}));
        reconfigure();
        EXPECT_EQ(list(), (patterns{"a.trc", "c.trc", "b.trc"}));
        EXPECT_EQ(bound_traces[0]->spool, anchors.pFirstSpoolSpec);
        EXPECT_EQ(bound_traces[2]->spool, anchors.pLastSpoolSpec);
    });
}

TEST_F(Kept, AreTheWholeListWhenTheFreshOneIsEmpty)
{
    run({}, [] {
        bound({"a.trc", "b.trc"});
        write_conf("");
        reconfigure();
        EXPECT_EQ(list(), (patterns{"b.trc", "a.trc"}));
        ASSERT_NE(anchors.pLastSpoolSpec, nullptr);
        EXPECT_STREQ(anchors.pLastSpoolSpec->pattern, "a.trc");
        EXPECT_EQ(anchors.pFirstSpoolSpec->pPrev, nullptr);
        EXPECT_EQ(anchors.pLastSpoolSpec->pNext, nullptr);
    });
}

TEST_F(Kept, AreKeptOnceHoweverManyTracesTheyGovern)
{
    run({}, [] {
        trace_anchor_t *first = anchor_for("/var/a.trc");
        trace_anchor_t *second = anchor_for("/var/a.trc2");
        write_conf(traces({"a.trc"}));
        reconfigure();
        ASSERT_EQ(first->spool, second->spool);
        write_conf(traces({"x"}));
        reconfigure();
        EXPECT_EQ(list(), (patterns{"x", "a.trc"}));
        EXPECT_EQ(first->spool, second->spool);
        EXPECT_STREQ(first->spool->pattern, "a.trc");
    });
}

TEST_F(Kept, AreKeptAgain)
{
    run({}, [] {
        trace_anchor_t *trace = bound({"a.trc"})[0];
        const trace_spool_spec_t *spec = trace->spool;
        for (const char *pattern : {"x", "y", "z"}) {
            write_conf(traces({pattern}));
            reconfigure();
            EXPECT_EQ(list(), (patterns{pattern, "a.trc"}));
            EXPECT_EQ(trace->spool, spec);
        }
    });
}

TEST_F(Kept, AreKeptAgainWhenTheyAreTheWholeList)
{
    run({}, [] {
        trace_anchor_t *trace = bound({"a.trc"})[0];
        write_conf("");
        reconfigure();
        write_conf("# changed\n");
        reconfigure();
        EXPECT_EQ(list(), patterns{"a.trc"});
        EXPECT_EQ(trace->spool, anchors.pFirstSpoolSpec);
        EXPECT_EQ(trace->spool, anchors.pLastSpoolSpec);
    });
}

TEST_F(Kept, GiveWayOnceThePatternIsBack)
{
    run({}, [] {
        be_on_a_known_node();
        trace_anchor_t *trace = bound({"a.trc"})[0];
        write_conf(traces({"x"}));
        reconfigure();
        write_conf(section("a", {"pat = a.trc", "dest = /var/spool", "spooling = ON"}));
        reconfigure();
        EXPECT_EQ(list(), patterns{"a.trc"});
        EXPECT_EQ(trace->spool, anchors.pFirstSpoolSpec);
        EXPECT_EQ(trace->spool->dest, "/var/spool/" + node_path);
    });
}

TEST_F(Kept, MatchLaterTraces)
{
    run({}, [] {
        trace_anchor_t *first = bound({"a.trc"})[0];
        write_conf(traces({"x"}));
        reconfigure();
        trace_anchor_t *later = anchor_for("/var/later_a.trc");
        {
            const qn::tr::global_lock global;
            const qn::tr::anchor_set_lock set(later);
            EXPECT_EQ(process_spool_spec(later, anchors.pFirstSpoolSpec), nullptr);
        }
        EXPECT_EQ(later->spool, first->spool);
    });
}

TEST_F(Kept, DoNotStayForTheDefaultSpecification)
{
    run({}, [] {
        anchors.bMultipageEnabled = 1;
        trace_anchor_t *trace = anchor_for("/var/a.trc", 1048576);
        write_conf(traces({"x"}));
        reconfigure();
        ASSERT_NE(trace->spool, nullptr);
        ASSERT_EQ(trace->spool->isDefaultSpec, 1);
        write_conf(traces({"y"}));
        reconfigure();
        EXPECT_EQ(list(), patterns{"y"});
        EXPECT_EQ(trace->spool->isDefaultSpec, 1);
    });
}

// The directory of the kept one was another's buffer, which is freed.
TEST_F(Kept, DoNotKeepADirectoryOfWhatIsFreed)
{
    run({}, [] {
        trace_anchor_t *trace = anchor_for("/var/b.trc");
        write_conf(traces({"a.trc", "b.trc"}));
        reconfigure();
        trace_anchor_t *other = anchor_for("/var/a.trc");
        {
            const qn::tr::global_lock global;
            const qn::tr::anchor_set_lock set(other);
            process_spool_spec(other, anchors.pFirstSpoolSpec);
        }
        write_conf(traces({"a.trc"}));
        reconfigure();
        EXPECT_STREQ(trace->spool->dir, "/dev/null");
    });
}

TEST_F(Kept, KeepTheirTracesPages)
{
    run({}, [] {
        write_conf(section("a", {"pat = a.trc", "pages = 10", "size = 262144", "spooling = ON"}));
        reconfigure();
        trace_anchor_t *trace = anchor_for("/var/a.trc");
        ASSERT_EQ(start(trace), 0);
        write_conf(traces({"x"}));
        reconfigure();
        EXPECT_EQ(ring_of(trace).size(), 10U);
        write_ids(trace, 3);
        EXPECT_EQ(ids_in("/var/a.trc.1.sp"), (std::vector<uint32_t>{1, 2, 3}));
        stop(trace);
    });
}
} // namespace
