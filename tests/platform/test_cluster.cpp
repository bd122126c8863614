// Who this host is in its cluster: the text of cluster.conf, and the files themselves in a private /var.
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "platform/cu/cluster_conf.h"
#include "support/private_var.h"
#include "support/scratch.h"

namespace
{
using qn::cu::parse_cluster_conf;
using qn::test::in_private_var;

TEST(ClusterText, GivesEveryValue)
{
    const auto conf =
        parse_cluster_conf("cluster_name = production\ncluster_id = 7f3a\nnode_number = 3\nnode_id = c0ffee\n");
    EXPECT_STREQ(conf.info.cu_cluster_name, "production");
    EXPECT_STREQ(conf.info.cu_cluster_ID, "7f3a");
    EXPECT_EQ(conf.info.cu_node_number, 3);
    EXPECT_EQ(conf.node_id, 0xc0ffeeU);
}

TEST(ClusterText, IsEmptyWithoutLines)
{
    const auto conf = parse_cluster_conf("");
    EXPECT_STREQ(conf.info.cu_cluster_name, "");
    EXPECT_STREQ(conf.info.cu_cluster_ID, "");
    EXPECT_EQ(conf.info.cu_node_number, 0);
    EXPECT_FALSE(conf.node_id);
}

TEST(ClusterText, CommentsAndBlanksDoNotCount)
{
    const auto conf = parse_cluster_conf("# cluster_name = wrong\n\n \t cluster_name\t=  two words \t# remark\r\n#");
    EXPECT_STREQ(conf.info.cu_cluster_name, "two words");
}

TEST(ClusterText, TheLastLineNeedsNoNewline)
{
    EXPECT_EQ(parse_cluster_conf("node_number = 12").info.cu_node_number, 12);
}

TEST(ClusterText, OfTwoLinesTheLastOneHolds)
{
    EXPECT_STREQ(parse_cluster_conf("cluster_name=a\ncluster_name=b\n").info.cu_cluster_name, "b");
}

TEST(ClusterText, AValueMayHoldAnEqualsSign)
{
    EXPECT_STREQ(parse_cluster_conf("cluster_id = a=b\n").info.cu_cluster_ID, "a=b");
}

TEST(ClusterText, ALongValueIsCut)
{
    const std::string name(200, 'n');
    const auto conf = parse_cluster_conf("cluster_name = " + name + "\ncluster_id = 5\n");
    EXPECT_EQ(conf.info.cu_cluster_name, name.substr(0, 63));
    EXPECT_STREQ(conf.info.cu_cluster_ID, "5");
}

TEST(ClusterText, AShorterValueLeavesNothingOfALongerOne)
{
    const auto conf = parse_cluster_conf("cluster_id = longer\ncluster_id = x\n");
    EXPECT_EQ(std::string(conf.info.cu_cluster_ID, 64), "x" + std::string(63, '\0'));
}

TEST(ClusterText, MalformedLinesAreIgnored)
{
    const auto conf =
        parse_cluster_conf("cluster_name\n= x\nCLUSTER_NAME = y\ncluster name = z\nunknown = 1\n"
                           "node_number = 5\nnode_number = five\nnode_number = 99999999999\n"
                           "node_number = 6x\nnode_number =\nnode_id = xyz\nnode_id = 11112222333344445\n");
    EXPECT_STREQ(conf.info.cu_cluster_name, "");
    EXPECT_EQ(conf.info.cu_node_number, 5);
    EXPECT_FALSE(conf.node_id);
}

TEST(ClusterText, ANodeIdIsHexadecimalWithOrWithoutItsPrefix)
{
    EXPECT_EQ(parse_cluster_conf("node_id = 0x1F\n").node_id, 31U);
    EXPECT_EQ(parse_cluster_conf("node_id = ffffffffffffffff\n").node_id, ~qn_uint64_t{0});
    EXPECT_EQ(parse_cluster_conf("node_id = 10\n").node_id, 16U);
    EXPECT_FALSE(parse_cluster_conf("node_id = 0x\n").node_id);
}

TEST(ClusterText, BytesThatAreNoTextDoNoHarm)
{
    const std::string bytes("cluster_name = a\0b\ncluster_id\xff = \xfe\n=\n==\n\0\0", 43);
    EXPECT_STREQ(parse_cluster_conf(bytes).info.cu_cluster_name, "a");
}

void write_conf(const std::string &text)
{
    std::filesystem::create_directories("/var/qn/cfg");
    qn::test::write_file("/var/qn/cfg/cluster.conf", text);
}

TEST(Cluster, WithoutTheFileThereIsNoClusterInformation)
{
    EXPECT_TRUE(in_private_var([] {
        cu_cluster_info_t info;
        info.cu_node_number = 7;
        info.cu_cluster_name[0] = 'x';
        EXPECT_EQ(cu_get_cluster_info_1(&info), ENOENT);
        EXPECT_EQ(info.cu_node_number, 0);
        EXPECT_STREQ(info.cu_cluster_name, "");
        return true;
    }));
}

TEST(Cluster, TheFileGivesTheInformation)
{
    EXPECT_TRUE(in_private_var([] {
        write_conf("cluster_name = production\ncluster_id = 99\nnode_number = 2\n");
        cu_cluster_info_t info;
        EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
        EXPECT_STREQ(info.cu_cluster_name, "production");
        EXPECT_STREQ(info.cu_cluster_ID, "99");
        EXPECT_EQ(info.cu_node_number, 2);
        return true;
    }));
}

TEST(Cluster, AChangedFileIsReadAnew)
{
    EXPECT_TRUE(in_private_var([] {
        cu_cluster_info_t info;
        write_conf("node_number = 1\n");
        EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
        EXPECT_EQ(info.cu_node_number, 1);
        write_conf("node_number = 2\n");
        EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
        EXPECT_EQ(info.cu_node_number, 2);
        return true;
    }));
}

TEST(Cluster, AFolderInPlaceOfTheFileIsAnError)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories("/var/qn/cfg/cluster.conf");
        cu_cluster_info_t info;
        EXPECT_EQ(cu_get_cluster_info_1(&info), EISDIR);
        return true;
    }));
}

TEST(Cluster, APipeWithoutAWriterIsNotWaitedFor)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories("/var/qn/cfg");
        EXPECT_EQ(mkfifo("/var/qn/cfg/cluster.conf", 0600), 0);
        alarm(20); // ends the test that hangs
        cu_cluster_info_t info;
        EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
        EXPECT_STREQ(info.cu_cluster_name, "");
        return true;
    }));
}

constexpr size_t most_bytes = 64 << 10;
const std::string last_line = "node_number = 12345";

// What is known of a file whose last line ends with that byte, and what follows the line.
qn_int32_t node_number_ending_at(size_t byte, const std::string &behind)
{
    const std::string first_line = "cluster_name = big\n";
    write_conf(first_line + std::string(byte - first_line.size() - last_line.size() - 1, '#') + "\n" + last_line +
               behind);
    cu_cluster_info_t info;
    EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
    EXPECT_STREQ(info.cu_cluster_name, "big");
    return info.cu_node_number;
}

TEST(Cluster, ALineThatCrossesTheEndOfWhatIsReadDoesNotCount)
{
    EXPECT_TRUE(in_private_var([] {
        for (const size_t beyond : {1, 2, 5, 6, 18})
            EXPECT_EQ(node_number_ending_at(most_bytes + beyond, "\nnode_number = 7\n"), 0) << beyond;
        EXPECT_EQ(node_number_ending_at(most_bytes, "6"), 0);
        return true;
    }));
}

TEST(Cluster, ALineThatEndsWhereTheReadingEndsCounts)
{
    EXPECT_TRUE(in_private_var([] {
        EXPECT_EQ(node_number_ending_at(most_bytes, ""), 12345);
        EXPECT_EQ(node_number_ending_at(most_bytes, "\n"), 12345);
        EXPECT_EQ(node_number_ending_at(most_bytes, "\nnode_number = 7\n"), 12345);
        EXPECT_EQ(node_number_ending_at(most_bytes - 1, "\nnode_number = 7\n"), 12345);
        return true;
    }));
}

TEST(Cluster, AFileOfOneEndlessLineSaysNothing)
{
    EXPECT_TRUE(in_private_var([] {
        write_conf("cluster_name = " + std::string(most_bytes * 2, 'x'));
        cu_cluster_info_t info;
        EXPECT_EQ(cu_get_cluster_info_1(&info), 0);
        EXPECT_STREQ(info.cu_cluster_name, "");
        return true;
    }));
}

TEST(Cluster, TheFilesNodeIdIsPreferred)
{
    EXPECT_TRUE(in_private_var([] {
        write_conf("node_id = 00c0ffee00c0ffee\n");
        qn_uint64_t id = 0;
        EXPECT_EQ(cu_get_node_id_1(&id), 0);
        EXPECT_EQ(id, 0x00c0ffee00c0ffeeU);
        return true;
    }));
}

// The first 16 digits of /etc/machine-id, or nothing where there is none.
std::string machine_digits()
{
    std::ifstream file("/etc/machine-id");
    std::string digits;
    file >> digits;
    return digits.size() >= 16 ? digits.substr(0, 16) : "";
}

void expect_machine_id()
{
    qn_uint64_t id = 77;
    const int result = cu_get_node_id_1(&id);
    if (machine_digits().empty()) {
        EXPECT_NE(result, 0);
        EXPECT_EQ(id, 0U);
    } else {
        EXPECT_EQ(result, 0);
        EXPECT_EQ(id, std::stoull(machine_digits(), nullptr, 16));
    }
}

TEST(Cluster, WithoutTheFileTheNodeIdComesFromTheMachine)
{
    EXPECT_TRUE(in_private_var([] {
        expect_machine_id();
        return true;
    }));
}

TEST(Cluster, AFileWithoutANodeIdLeavesItToTheMachine)
{
    EXPECT_TRUE(in_private_var([] {
        write_conf("cluster_name = x\nnode_id = nonsense\n");
        expect_machine_id();
        return true;
    }));
}

// What cu_get_node_id_1 says where /etc/machine-id holds that text.
struct node_id_answer {
    int result;
    qn_uint64_t id;
    bool operator==(const node_id_answer &) const = default;
};

node_id_answer with_machine_id(const std::string &text)
{
    qn::test::use_machine_id(text);
    node_id_answer answer{.result = -1, .id = 77};
    answer.result = cu_get_node_id_1(&answer.id);
    return answer;
}

TEST(Cluster, TheMachinesNodeIdIsMadeOfTheFirst16Digits)
{
    EXPECT_TRUE(in_private_var([] {
        EXPECT_EQ(with_machine_id("0123456789abcdef0123456789abcdef\n"), (node_id_answer{0, 0x0123456789abcdefU}));
        EXPECT_EQ(with_machine_id("FEDCBA9876543210"), (node_id_answer{0, 0xfedcba9876543210U}));
        return true;
    }));
}

TEST(Cluster, AMachineIdThatDoesNotBeginWith16HexadecimalDigitsIsNone)
{
    EXPECT_TRUE(in_private_var([] {
        for (const char *text :
             {"0x123456789012345678901234567890", "0X12345678901234", "", "\n", "0123456789abcde", "0123456789abcde\n",
              " 0123456789abcdef", "-123456789abcdef", "+123456789abcdef", "0123456789abcdeg", "uninitialized\n"})
            EXPECT_EQ(with_machine_id(text), (node_id_answer{ENODATA, 0})) << text;
        return true;
    }));
}

TEST(Cluster, NullPointersAreRefused)
{
    EXPECT_EQ(cu_get_cluster_info_1(nullptr), EINVAL);
    EXPECT_EQ(cu_get_node_id_1(nullptr), EINVAL);
}
} // namespace
