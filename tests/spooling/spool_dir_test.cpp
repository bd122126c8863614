// The spool directory of a node and program: its components, where each comes from, and that they are made.
#include <cerrno>
#include <cstring>
#include <filesystem>

#include <sys/stat.h>
#include <sys/syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"
#include "trace/files/cluster.h"

namespace
{
using namespace qn::test;

class SpoolDir : public testing::Test
{
protected:
    SpoolDir() { be_on_a_known_node(); }

    // The directory that is made for the destination; "(none)" when it is not.
    std::string make(const std::string &dest, const std::string &file = "/tmp/a.trc")
    {
        spec = {};
        std::strcpy(spec.dest, dest.c_str());
        const char *made = mkspooldir(&spec, file.c_str());
        EXPECT_TRUE(made == nullptr || made == spec.dest);
        return made != nullptr ? made : "(none)";
    }

    scratch folder;
    std::string x = folder / "x";
    trace_spool_spec_t spec{};
};

TEST_F(SpoolDir, NamesClusterHostNodeAndProgram)
{
    EXPECT_EQ(make(x), x + "/c1/id1/h1/000000000000002a/mydaemon");
    EXPECT_TRUE(std::filesystem::is_directory(x + "/c1/id1/h1/000000000000002a/mydaemon"));
}

TEST_F(SpoolDir, IsTheOwnersAlone)
{
    umask(0);
    std::string path = folder.folder();
    ASSERT_EQ(make(x + "/y"), x + "/y/" + node_path);
    for (const char *name : {"x", "y", "c1", "id1", "h1", "000000000000002a", "mydaemon"}) {
        path += std::string("/") + name;
        struct stat status {
        };
        ASSERT_EQ(stat(path.c_str(), &status), 0) << path;
        EXPECT_EQ(status.st_mode & 07777, 0700U) << path;
    }
}

TEST_F(SpoolDir, MayExistAlready)
{
    ASSERT_EQ(make(x), x + "/" + node_path);
    write_file(x + "/" + node_path + "/copy", "kept");
    EXPECT_EQ(make(x), x + "/" + node_path);
    EXPECT_EQ(file_bytes(x + "/" + node_path + "/copy"), "kept");
}

TEST_F(SpoolDir, NeedsNoSecondSlash) { EXPECT_EQ(make(x + "/"), x + "/" + node_path); }

TEST_F(SpoolDir, OfDevNullIsItself)
{
    EXPECT_EQ(make("/dev/null"), "/dev/null");
    EXPECT_EQ(cluster_questions(), 0);
}

TEST_F(SpoolDir, HasEmptyPartsWithoutACluster)
{
    be_in_no_cluster();
    EXPECT_EQ(make(x), x + "///h1/000000000000002a/mydaemon");
    EXPECT_EQ(make(x + "/"), x + "///h1/000000000000002a/mydaemon");
    EXPECT_TRUE(std::filesystem::is_directory(x + "/h1/000000000000002a/mydaemon"));
}

TEST_F(SpoolDir, UsesNothingOfAFailedAnswerAboutTheCluster)
{
    calls().cluster_info = [](cu_cluster_info_t *info) {
        std::strcpy(info->cu_cluster_name, "half");
        std::strcpy(info->cu_cluster_ID, "way");
        info->cu_node_number = 9;
        return EIO;
    };
    EXPECT_EQ(make(x), x + "///h1/000000000000002a/mydaemon");
    EXPECT_STREQ(clusterInfo.cu_cluster_name, "");
    EXPECT_STREQ(clusterInfo.cu_cluster_ID, "");
    EXPECT_EQ(clusterInfo.cu_node_number, 0);
}

TEST_F(SpoolDir, AsksForTheClusterAgainAfterAFailure)
{
    be_in_no_cluster();
    ASSERT_EQ(make(folder / "without"), folder / "without///h1/000000000000002a/mydaemon");
    be_in_cluster("c1", "id1");
    EXPECT_EQ(make(x), x + "/" + node_path);
}

TEST_F(SpoolDir, AsksForTheClusterOnce)
{
    ASSERT_EQ(make(folder / "one"), folder / "one/" + node_path);
    be_in_cluster("c2", "id2");
    EXPECT_EQ(make(folder / "two"), folder / "two/" + node_path);
    EXPECT_EQ(cluster_questions(), 0);
}

TEST_F(SpoolDir, HasAHostWithoutADomainAsItIs)
{
    spool_calls().host_name = [](char *name, size_t) {
        std::strcpy(name, "h2");
        return 0;
    };
    EXPECT_EQ(make(x), x + "/c1/id1/h2/000000000000002a/mydaemon");
}

TEST_F(SpoolDir, AsksForAllOfTheHostNameOnce)
{
    std::vector<size_t> asked;
    spool_calls().host_name = [&](char *name, size_t size) {
        asked.push_back(size);
        std::strcpy(name, "h1.a.b");
        return 0;
    };
    ASSERT_EQ(make(folder / "one"), folder / "one/" + node_path);
    ASSERT_EQ(make(folder / "two"), folder / "two/" + node_path);
    EXPECT_EQ(asked, std::vector<size_t>{4096});
}

TEST_F(SpoolDir, NamesAnUnknownHost)
{
    spool_calls().host_name = [](char *, size_t) { return fail_with(ENAMETOOLONG); };
    EXPECT_EQ(make(x), x + "/c1/id1/unknown/000000000000002a/mydaemon");
}

TEST_F(SpoolDir, HasTheNodeAsSixteenDigits)
{
    calls().node_id = [](qn_uint64_t *node) {
        *node = 0xFEDCBA9876543210;
        return 0;
    };
    EXPECT_EQ(make(x), x + "/c1/id1/h1/fedcba9876543210/mydaemon");
}

TEST_F(SpoolDir, HasZeroForAnUnknownNode)
{
    calls().node_id = [](qn_uint64_t *node) {
        *node = 7;
        return ENOENT;
    };
    EXPECT_EQ(make(x), x + "/c1/id1/h1/0000000000000000/mydaemon");
}

struct command {
    const char *given; // null: not to be had
    const char *program;
};

void PrintTo(const command &given, std::ostream *out) { *out << (given.given != nullptr ? given.given : "none"); }

class ProgramName : public SpoolDir, public testing::WithParamInterface<command>
{
};

TEST_P(ProgramName, IsWhatFollowsTheLastSlash)
{
    calls().proc_args = [](pid_t process, char *buffer, size_t size) {
        EXPECT_EQ(process, getpid());
        EXPECT_EQ(size, 4096U);
        if (GetParam().given == nullptr) return ENOENT;
        std::strcpy(buffer, GetParam().given);
        return 0;
    };
    EXPECT_EQ(make(x), x + "/c1/id1/h1/000000000000002a/" + GetParam().program);
}

INSTANTIATE_TEST_SUITE_P(Values, ProgramName,
                         testing::Values(command{"/opt/bin/other", "other"}, command{"./d", "d"},
                                         command{"plain", "plain"}, command{"/opt/bin/", ""}, command{"", ""},
                                         command{nullptr, "unknown"}));

TEST_F(SpoolDir, NamesThisProgram)
{
    calls().proc_args = nullptr;
    EXPECT_EQ(make(x), x + "/c1/id1/h1/000000000000002a/" + base_name_in_header());
}

TEST_F(SpoolDir, TellsWhatItBeginsWithAndTheProgram)
{
    debug_on();
    make(x);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "entering mkspooldir: '" + x + "'\n"));
    EXPECT_TRUE(system_log_has(LOG_ERR, "mkspooldir: baseName: 'mydaemon' argsbuffer: /opt/bin/mydaemon\n"));
}

TEST_F(SpoolDir, TellsThatItIsNotToBeMadeBelowDevNull)
{
    debug_on();
    make("/dev/null");
    EXPECT_EQ(debug_lines(), std::vector<std::string>{"entering mkspooldir: '/dev/null'\n"});
}

TEST_F(SpoolDir, IsSilentBelowLevelEight)
{
    global_debug_level = 7;
    make(x);
    EXPECT_TRUE(system_log().empty());
}

// ---- Traces under /var/qn/IW: the domain stands for the cluster.

struct domain_link {
    std::string target; // empty: there is no link
    std::string domain;
};

void PrintTo(const domain_link &link, std::ostream *out) { *out << link.target; }

class DomainSpoolDir : public SpoolDir, public testing::WithParamInterface<domain_link>
{
};

TEST_P(DomainSpoolDir, NamesTheDomainThatTheLinkLeadsTo)
{
    expect_in_private_var([this] {
        std::filesystem::create_directories("/var/qn");
        if (!GetParam().target.empty()) {
            ASSERT_EQ(symlink(GetParam().target.c_str(), "/var/qn/IW"), 0);
        }
        const std::string expected = "/var/x/IW/" + GetParam().domain + "/h1/000000000000002a/mydaemon";
        EXPECT_EQ(make("/var/x", "/var/qn/IW/log/a.trc"), expected);
        EXPECT_TRUE(std::filesystem::is_directory(expected));
    });
}

// At most 64 bytes of the link are read.
INSTANTIATE_TEST_SUITE_P(Values, DomainSpoolDir,
                         testing::Values(domain_link{"", "unknown"}, domain_link{"/var/qn/dom1", "dom1"},
                                         domain_link{"dom2", "dom2"}, domain_link{"../qn/dom3", "dom3"},
                                         domain_link{"/" + std::string(63, 'd'), std::string(63, 'd')},
                                         domain_link{"/" + std::string(80, 'd'), std::string(63, 'd')}));

TEST_F(SpoolDir, IsADomainsWhereverTheNameIsInThePath)
{
    expect_in_private_var([this] {
        std::filesystem::create_directories("/var/qn");
        ASSERT_EQ(symlink("/var/qn/dom1", "/var/qn/IW"), 0);
        EXPECT_EQ(make("/var/x", "/mnt/var/qn/IWx/a.trc"), "/var/x/IW/dom1/h1/000000000000002a/mydaemon");
    });
}

TEST_F(SpoolDir, IsAClustersForOtherPathsWithThoseLetters)
{
    EXPECT_EQ(make(x, "/qn/IW/a.trc"), x + "/" + node_path);
    EXPECT_EQ(make(x, "/var/qn/iw/a.trc"), x + "/" + node_path);
}

TEST_F(SpoolDir, IsWhatTheClusterFileSays)
{
    calls() = {};
    expect_in_private_var([this] {
        std::filesystem::create_directories(conf_folder);
        write_file("/var/qn/cfg/cluster.conf", "cluster_name = k9\ncluster_id = id77\nnode_id = 0xabc\n");
        EXPECT_EQ(make("/var/x"), "/var/x/k9/id77/h1/0000000000000abc/" + base_name_in_header());
    });
}
} // namespace
