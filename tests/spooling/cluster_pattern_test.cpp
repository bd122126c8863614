// A pattern that names this node's cluster is followed by one with the cluster's identifier.
#include <regex.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"
#include "trace/files/cluster.h"

namespace
{
using namespace qn::test;

using patterns = std::vector<std::string>;

class ClusterPattern : public testing::Test
{
protected:
    ClusterPattern() { be_in_cluster("c1", "id1"); }
    qn_int32_t add(const std::string &pattern, int dup = 1, qn_int32_t interval = 30)
    {
        return addSpoolCfgElement("/d", pattern.c_str(), 12, 1, interval, &list.first, &list.last, dup, 131072);
    }

    specifications list;
};

TEST_F(ClusterPattern, IsFollowedByOneWithTheIdentifier)
{
    ASSERT_EQ(add("/var/qn/c1/(.*)"), 0);
    EXPECT_EQ(list.patterns(), (patterns{"/var/qn/c1/(.*)", "/var/qn/id1/(.*)"}));
    EXPECT_EQ(list.patterns_backwards(), (patterns{"/var/qn/id1/(.*)", "/var/qn/c1/(.*)"}));
}

TEST_F(ClusterPattern, IsCopiedWithItsOtherFields)
{
    ASSERT_EQ(addSpoolCfgElement("/dest", "/var/qn/c1/x", 7, 0, 45, &list.first, &list.last, 1, 131072), 0);
    ASSERT_NE(list.last, list.first);
    EXPECT_STREQ(list.last->dest, "/dest");
    EXPECT_EQ(list.last->pages, 7U);
    EXPECT_EQ(list.last->onoff, 0);
    EXPECT_EQ(list.last->sync_interval, 45U);
    EXPECT_EQ(list.last->pg_size, 131072U);
    EXPECT_EQ(list.last->dir, nullptr);
    EXPECT_EQ(list.last->isDefaultSpec, 0);
}

TEST_F(ClusterPattern, PassesTheIntervalOnThatItGot)
{
    ASSERT_EQ(add("/var/qn/c1/x", 1, 0), 0);
    ASSERT_NE(list.last, list.first);
    EXPECT_EQ(list.last->sync_interval, 3600U);
}

TEST_F(ClusterPattern, OfAnotherClusterStaysAlone)
{
    be_in_cluster("c2", "id2");
    ASSERT_EQ(add("/var/qn/c1/(.*)"), 0);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1/(.*)"});
}

TEST_F(ClusterPattern, StaysAloneWhenNoTwinIsWanted)
{
    ASSERT_EQ(add("/var/qn/c1/(.*)", 0), 0);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1/(.*)"});
    EXPECT_EQ(cluster_questions(), 0);
}

struct pattern_pair {
    const char *given;
    const char *twin; // null: none
};

void PrintTo(const pattern_pair &pair, std::ostream *out) { *out << pair.given; }

class ClusterPatterns : public ClusterPattern, public testing::WithParamInterface<pattern_pair>
{
};

TEST_P(ClusterPatterns, AreFollowedByTheirTwins)
{
    patterns expected{GetParam().given};
    if (GetParam().twin != nullptr) expected.emplace_back(GetParam().twin);
    EXPECT_EQ(add(GetParam().given), 0);
    EXPECT_EQ(list.patterns(), expected);
}

// The name may be an expression itself; it must match the whole of the cluster's name. What stands before "/var/qn/" is
// lost, and so is what stands behind the end of the line. A name that is no expression has no twin.
INSTANTIATE_TEST_SUITE_P(
    Values, ClusterPatterns,
    testing::Values(
        pattern_pair{"/var/qn/c1", "/var/qn/id1"}, pattern_pair{"/var/qn/c1/", "/var/qn/id1/"},
        pattern_pair{"/var/qn/c[0-9]/log", "/var/qn/id1/log"}, pattern_pair{"/var/qn/(c1|c2)/log", "/var/qn/id1/log"},
        pattern_pair{"/var/qn/.*/log/.*", "/var/qn/id1/log/.*"}, pattern_pair{"/VAR/QN/C1/Log", "/var/qn/id1/Log"},
        pattern_pair{"^/var/qn/c1/log$", "/var/qn/id1/log$"}, pattern_pair{"/mnt/var/qn/c1/log", "/var/qn/id1/log"},
        pattern_pair{"/var/qn/c1/log\nmore", "/var/qn/id1/log"}, pattern_pair{"/var/qn/c/log", nullptr},
        pattern_pair{"/var/qn/1/log", nullptr}, pattern_pair{"/var/qn/c11/log", nullptr},
        pattern_pair{"/var/qn/c1(/log", nullptr}, pattern_pair{"/var/qn/", nullptr},
        pattern_pair{"/var/qn//log", nullptr}, pattern_pair{"/var/qnx/c1/log", nullptr}, pattern_pair{"c1", nullptr},
        pattern_pair{"", nullptr}));

TEST_F(ClusterPattern, IsNotLookedForInOtherPatterns)
{
    ASSERT_EQ(add("/tmp/c1/(.*)"), 0);
    EXPECT_EQ(cluster_questions(), 0);
}

TEST_F(ClusterPattern, HasATwinOnlyWhenItIsTheFirst)
{
    ASSERT_EQ(add("/var/qn/c1/one"), 0);
    ASSERT_EQ(add("/var/qn/c1/two"), 0);
    EXPECT_EQ(list.patterns(), (patterns{"/var/qn/c1/one", "/var/qn/id1/one", "/var/qn/c1/two"}));
    EXPECT_EQ(cluster_questions(), 1);
}

TEST_F(ClusterPattern, HasNoTwinBehindOneOfAnotherCluster)
{
    ASSERT_EQ(add("/var/qn/c2/one"), 0);
    ASSERT_EQ(add("/var/qn/c1/two"), 0);
    EXPECT_EQ(list.patterns(), (patterns{"/var/qn/c2/one", "/var/qn/c1/two"}));
}

TEST_F(ClusterPattern, HasNoTwinInASecondListEither)
{
    ASSERT_EQ(add("/var/qn/c1/one"), 0);
    specifications second;
    ASSERT_EQ(addSpoolCfgElement("/d", "/var/qn/c1/one", 8, 1, 60, &second.first, &second.last, 1, 262144), 0);
    EXPECT_EQ(second.patterns(), patterns{"/var/qn/c1/one"});
}

TEST_F(ClusterPattern, HasATwinBehindPatternsThatNameNoCluster)
{
    ASSERT_EQ(add("/tmp/one"), 0);
    ASSERT_EQ(add("/var/qn/c1/two"), 0);
    EXPECT_EQ(list.patterns(), (patterns{"/tmp/one", "/var/qn/c1/two", "/var/qn/id1/two"}));
}

TEST_F(ClusterPattern, StaysAloneWithoutAClusterAndIsAskedAboutAgain)
{
    be_in_no_cluster();
    EXPECT_EQ(add("/var/qn/c1/one"), 0);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1/one"});
    EXPECT_EQ(cluster_questions(), 1);
    EXPECT_NE(clusterInfoRC, 0);

    be_in_cluster("c1", "id1");
    EXPECT_EQ(add("/var/qn/c1/two"), 0);
    EXPECT_EQ(list.patterns(), (patterns{"/var/qn/c1/one", "/var/qn/c1/two", "/var/qn/id1/two"}));
    EXPECT_EQ(clusterInfoRC, 0);
}

TEST_F(ClusterPattern, KeepsWhatItFoundOut)
{
    ASSERT_EQ(add("/var/qn/c1/one"), 0);
    EXPECT_STREQ(clusterInfo.cu_cluster_name, "c1");
    EXPECT_STREQ(clusterInfo.cu_cluster_ID, "id1");
    EXPECT_EQ(clusterInfo.cu_node_number, 3);
    EXPECT_EQ(clusterInfoRC, 0);
}

TEST_F(ClusterPattern, HasTheLongestTwinThatFits)
{
    const std::string rest = "/" + std::string(1011, 'r'); // with "/var/qn/" and "id1" one less than the field
    ASSERT_EQ(add("/var/qn/c1" + rest), 0);
    ASSERT_NE(list.last, list.first);
    EXPECT_EQ(list.last->pattern, "/var/qn/id1" + rest);
}

TEST_F(ClusterPattern, HasNoTwinThatDoesNotFit)
{
    const std::string rest = "/" + std::string(1012, 'r');
    EXPECT_EQ(add("/var/qn/c1" + rest), 0);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1" + rest});
}

TEST_F(ClusterPattern, ReportsThatThereIsNoMemoryForItsTwin)
{
    int made = 0;
    calls().calloc = [&](size_t count, size_t size) -> void * {
        if (count * size == sizeof(trace_spool_spec_t) && ++made == 2) return nullptr;
        return __real_calloc(count, size);
    };
    EXPECT_EQ(add("/var/qn/c1/one"), 39);
    calls().calloc = nullptr;
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1/one"});
}

TEST_F(ClusterPattern, StaysAloneWhenItCannotBeLookedFor)
{
    spool_calls().regcomp = [](const char *) { return REG_ESPACE; };
    EXPECT_EQ(add("/var/qn/c1/one"), 0);
    EXPECT_EQ(list.patterns(), patterns{"/var/qn/c1/one"});
}

TEST_F(ClusterPattern, TellsHowItsTwinIsMade)
{
    debug_on();
    ASSERT_EQ(add("/var/qn/c1/(.*)"), 0);
    EXPECT_EQ(debug_lines(), (patterns{"Spooling spec '/var/qn/c1/(.*):1:12:/d', sync_interval=30'\n",
                                       "addSpoolCfgElement: Cluster name pattern detected\n",
                                       "base_cl_pat(8..10): 'c1'\n", "rest_of_pat(10..15): '/(.*)'\n",
                                       "cluster name/pattern match: creating new spec from cluster id'\n",
                                       "Creating new element with pattern: /var/qn/id1/(.*).\n",
                                       "Spooling spec '/var/qn/id1/(.*):1:12:/d', sync_interval=30'\n"}));
}

TEST_F(ClusterPattern, TellsThatTheClusterIsAnother)
{
    be_in_cluster("c2", "id2");
    debug_on();
    ASSERT_EQ(add("/var/qn/c1"), 0);
    EXPECT_EQ(debug_lines(),
              (patterns{"Spooling spec '/var/qn/c1:1:12:/d', sync_interval=30'\n",
                        "addSpoolCfgElement: Cluster name pattern detected\n", "base_cl_pat(8..10): 'c1'\n",
                        "rest_of_pat(10..10): ''\n", "This cluster name (c2) NOT matched on ^c1$.\n"}));
}

TEST_F(ClusterPattern, TellsNothingMoreOnceTheClusterIsKnown)
{
    ASSERT_EQ(add("/var/qn/c1/one"), 0);
    debug_on();
    ASSERT_EQ(add("/var/qn/c1/two"), 0);
    EXPECT_EQ(debug_lines(), (patterns{"Spooling spec '/var/qn/c1/two:1:12:/d', sync_interval=30'\n",
                                       "addSpoolCfgElement: Cluster name pattern detected\n"}));
}
} // namespace
