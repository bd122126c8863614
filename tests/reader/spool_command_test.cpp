// qntrace spool: the table of what spool directories hold, and its exit statuses.
#include <filesystem>
#include <fstream>
#include <functional>

#include <sys/stat.h>

#include <gtest/gtest.h>

#include "reader/spool_directory.h"
#include "support/private_var.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;

TEST(SpoolCommand, GathersTheCopiesOfATraceInOneRow)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    spool.put("app.trc.2.sp.2026_11_21_05_13_01.123456");
    spool.put("app.trc.12.sp.2026_11_21_05_13_02.12");
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["type"], "spool");
    EXPECT_EQ(found[0]["cluster"], "c1");
    EXPECT_EQ(found[0]["cluster_id"], "id1");
    EXPECT_EQ(found[0]["host"], "h1");
    EXPECT_EQ(found[0]["node_id"], "000000000000002a");
    EXPECT_EQ(found[0]["program"], "mydaemon");
    EXPECT_EQ(found[0]["trace"], "app.trc");
    EXPECT_EQ(found[0]["page_copies"], 3);
    EXPECT_EQ(found[0]["file_copies"], 0);
    EXPECT_EQ(found[0]["damaged"], 0);
    EXPECT_EQ(found[0]["unreadable"], 0);
}

TEST(SpoolCommand, KeepsNodesProgramsAndTracesApart)
{
    const spool_directory spool;
    const std::string name = "app.trc.1.sp.2026_11_21_05_13_00.123456";
    spool.put("c1/id1/h1/000000000000002a/a", name, two_records());
    spool.put("c1/id1/h1/000000000000002a/b", name, two_records());
    spool.put("c1/id1/h2/000000000000002b/a", name, two_records());
    spool.put("c1/id1/h2/000000000000002b/a", "other.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 4U);
    EXPECT_EQ(found[0]["program"], "a");
    EXPECT_EQ(found[1]["program"], "b");
    EXPECT_EQ(found[2]["host"], "h2");
    EXPECT_EQ(found[3]["trace"], "other.trc");
}

TEST(SpoolCommand, OnANodeOfNoClusterNamesHostNodeAndProgram)
{
    const spool_directory spool;
    spool.put("h1/000000000000002a/mydaemon", "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_FALSE(found[0].contains("cluster"));
    EXPECT_FALSE(found[0].contains("cluster_id"));
    EXPECT_EQ(found[0]["host"], "h1");
    EXPECT_EQ(found[0]["node_id"], "000000000000002a");
    EXPECT_EQ(found[0]["program"], "mydaemon");
}

TEST(SpoolCommand, OfAFolderThatHoldsSpoolDirectoriesNamesNoCluster)
{
    const spool_directory spool;
    spool.put("var/spool/trace/h1/000000000000002a/a", "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    spool.put("var/spool/trace/c1/id1/h1/000000000000002a/b", "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 2U);
    for (const auto &row : found) {
        EXPECT_FALSE(row.contains("cluster")) << row;
        EXPECT_FALSE(row.contains("cluster_id")) << row;
        EXPECT_EQ(row["host"], "h1");
        EXPECT_EQ(row["node_id"], "000000000000002a");
    }
}

TEST(SpoolCommand, OfAFolderInsideAClustersNamesNoCluster)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    const auto found = sound_rows({spool.root + "/c1"});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_FALSE(found[0].contains("cluster_id"));
    EXPECT_EQ(found[0]["host"], "h1");
}

TEST(SpoolCommand, CountsCopiesOfWholeFilesByThemselves)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    spool.put("app.trc.2026_11_21_05_13_01.123456");
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["page_copies"], 1);
    EXPECT_EQ(found[0]["file_copies"], 1);
}

TEST(SpoolCommand, AddsUpTheBytesOfTheCopies)
{
    const spool_directory spool;
    spool.put(usual_folder, "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records(1, 4096));
    spool.put(usual_folder, "app.trc.2.sp.2026_11_21_05_13_01.123456", two_records(1, 8192));
    EXPECT_EQ(sound_rows({spool.root}).at(0)["bytes"], 12288);
}

TEST(SpoolCommand, TakesTheTimeRangeFromTheRecordsAndNotFromTheNames)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_09_00_00.123456", two_records(10));
    spool.put("app.trc.2.sp.2026_11_21_08_00_00.123456", two_records(3));
    spool.put("app.trc.3.sp.2026_11_21_07_00_00.123456", two_records(7));
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["first"]["time"], "2026-11-21T05:12:03.000000000Z");
    EXPECT_EQ(found[0]["first"]["time_ns"], std::to_string(trace_builder::epoch_ns + 3'000'000'000));
    EXPECT_EQ(found[0]["last"]["time"], "2026-11-21T05:12:10.000001000Z");
}

TEST(SpoolCommand, HasNoTimesWhereThereAreNoRecords)
{
    const spool_directory spool;
    trace_builder empty;
    empty.add_free(3896, 0);
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456", empty);
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_FALSE(found[0].contains("first"));
    EXPECT_FALSE(found[0].contains("last"));
}

TEST(SpoolCommand, SaysItAsATable)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456", two_records(1));
    spool.put("app.trc.2.sp.2026_11_21_05_13_00.123456", two_records(2));
    spool.put("h1/0000000000000001/x", "a.2026_11_21_05_13_01. 5", two_records(3));
    const auto shown = run_qntrace({"spool", "--utc", spool.root});
    EXPECT_EQ(shown.status, 0) << shown.err;
    EXPECT_EQ(shown.out,
              "NODE                        PROGRAM   TRACE    FIRST RECORD                    LAST RECORD    "
              "                 PAGES  FILES  BAD  BYTES\n"
              "c1/id1/h1/000000000000002a  mydaemon  app.trc  2026-11-21T05:12:01.000000000Z  "
              "2026-11-21T05:12:02.000001000Z      2      0    0   8192\n"
              "h1/0000000000000001         x         a        2026-11-21T05:12:03.000000000Z  "
              "2026-11-21T05:12:03.000001000Z      0      1    0   4096\n");
}

struct named_copy {
    const char *name;
    const char *trace;
};

void PrintTo(const named_copy &copy, std::ostream *out) { *out << copy.name; }

class CopyName : public testing::TestWithParam<named_copy>
{
};

TEST_P(CopyName, TellsTheTrace)
{
    const spool_directory spool;
    spool.put(GetParam().name);
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["trace"], GetParam().trace);
}

INSTANTIATE_TEST_SUITE_P(Made, CopyName,
                         testing::Values(named_copy{"app.trc.3.sp.2024_05_01_13_45_07.123456", "app.trc"},
                                         named_copy{"app.trc.3.sp.2024_05_01_13_45_07. 5", "app.trc"},
                                         named_copy{"app.trc.3.sp.2024_05_01_13_45_07.42", "app.trc"},
                                         named_copy{"app.trc.x.sp.2024_05_01_13_45_07.123456", "app.trc.x.sp"},
                                         named_copy{"app.trc.sp.2024_05_01_13_45_07.123456", "app.trc.sp"},
                                         named_copy{"a b.1.sp.2024_05_01_13_45_07.123", "a b"},
                                         named_copy{"a.2024_05_01_13_45_07.1.1.sp.2024_05_01_13_45_07.123",
                                                    "a.2024_05_01_13_45_07.1"}));

class OtherName : public testing::TestWithParam<const char *>
{
};

TEST_P(OtherName, IsPassedOver)
{
    const spool_directory spool;
    spool.put(GetParam());
    const auto shown = run_qntrace({"spool", spool.root});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, "");
    EXPECT_EQ(shown.err, "qntrace: there are no copies\n");
}

INSTANTIATE_TEST_SUITE_P(NotMade, OtherName,
                         testing::Values("app.trc.3.sp", "app.trc", ".2024_05_01_13_45_07.123456",
                                         "app.trc.3.sp.2024_05_01_13_45_07", "app.trc.3.sp.2024_05_01_13_45_07.5",
                                         "app.trc.3.sp.2024_05_01_13_45_07.1234567",
                                         "app.trc.3.sp.2024_05_01_13_45.123456",
                                         "app.trc.3.sp.2024_05_01_13_45_07.123456.gz"));

TEST(SpoolCommand, CountsADamagedCopyWithStatus1AndShowsItsSoundPart)
{
    const spool_directory spool;
    trace_builder torn = two_records();
    torn.put_u32(232, 0); // the length of the second record
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456", torn);
    spool.put("app.trc.2.sp.2026_11_21_05_13_00.123456");
    const auto shown = run_qntrace({"spool", "--json", "--utc", spool.root});
    EXPECT_EQ(shown.status, 1);
    const auto found = rows(shown);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["page_copies"], 2);
    EXPECT_EQ(found[0]["damaged"], 1);
    EXPECT_EQ(found[0]["first"]["time"], "2026-11-21T05:12:01.000000000Z");
    EXPECT_NE(shown.err.find("app.trc.1.sp.2026_11_21_05_13_00.123456: offset 232"), std::string::npos) << shown.err;
}

TEST(SpoolCommand, CountsAnUnreadableCopyWithStatus3AndGoesOn)
{
    const spool_directory spool;
    const auto closed = spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    spool.put("app.trc.2.sp.2026_11_21_05_13_00.123456");
    ASSERT_EQ(chmod(closed.c_str(), 0), 0);
    surroundings around;
    around.as_nobody = true;
    const auto shown = run_qntrace({"spool", "--json", spool.root}, around);
    EXPECT_EQ(shown.status, 3);
    const auto found = rows(shown);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["page_copies"], 2);
    EXPECT_EQ(found[0]["unreadable"], 1);
    EXPECT_EQ(found[0]["damaged"], 0);
    EXPECT_NE(shown.err.find(closed + ": cannot be opened: Permission denied"), std::string::npos) << shown.err;
}

TEST(SpoolCommand, TellsOfAFolderThatItMayNotReadWithStatus3AndGoesOn)
{
    const spool_directory spool;
    spool.put("h1/0000000000000001/a", "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    spool.put("h1/0000000000000001/b", "app.trc.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto closed = spool.root + "/h1/0000000000000001/a";
    ASSERT_EQ(chmod(closed.c_str(), 0), 0);
    surroundings around;
    around.as_nobody = true;
    const auto shown = run_qntrace({"spool", "--json", spool.root}, around);
    ASSERT_EQ(chmod(closed.c_str(), 0700), 0);
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(rows(shown).size(), 1U);
    EXPECT_NE(shown.err.find(closed + ": cannot be read: Permission denied"), std::string::npos) << shown.err;
}

TEST(SpoolCommand, AMissingDirectoryIsStatus3AndTheOthersAreStillShown)
{
    const spool_directory spool;
    spool.put("app.trc.1.sp.2026_11_21_05_13_00.123456");
    const auto shown = run_qntrace({"spool", "--json", spool.root + "/missing", spool.root});
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(rows(shown).size(), 1U);
    EXPECT_NE(shown.err.find("missing: cannot be read: No such file or directory"), std::string::npos) << shown.err;
}

TEST(SpoolCommand, EscapesTheNamesOfFoldersAndTraces)
{
    const spool_directory spool;
    spool.put("h\x1b[2J/0000000000000001/p\n", "t\x07.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto shown = run_qntrace({"spool", spool.root});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
    EXPECT_NE(shown.out.find("\nh\\x1b[2J/0000000000000001  p\\n      t\\x07 "), std::string::npos) << shown.out;
}

TEST(SpoolCommand, WritesJsonInAscii)
{
    const spool_directory spool;
    spool.put("b\xc3\xbcro/0000000000000001/app", "a.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto shown = run_qntrace({"spool", "--json", spool.root});
    EXPECT_TRUE(is_ascii(shown.out)) << shown.out;
    EXPECT_EQ(rows(shown).at(0)["host"], "b\xc3\xbcro");
}

TEST(SpoolCommand, KeepsEveryByteOfNamesThatAreNoUtf8InJson)
{
    const spool_directory spool;
    spool.put("b\xfcro/0000000000000001/app", "a.1.sp.2026_11_21_05_13_00.123456", two_records());
    const auto found = sound_rows({spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0].at("encoding"), "latin-1");
    EXPECT_EQ(found[0]["host"], "b\xc3\xbcro");
}

// The body is run with an empty /var that the test may fill.
void in_empty_var(const std::function<void()> &body)
{
    EXPECT_TRUE(in_private_var([&] {
        fs::create_directories("/var/qn/cfg");
        body();
        return !testing::Test::HasFailure();
    }));
}

void put_below_var(const std::string &directory)
{
    fs::create_directories(directory);
    std::ofstream copy(directory + "/app.trc.1.sp.2026_11_21_05_13_00.123456", std::ios::binary);
    const trace_builder file = two_records();
    copy.write(reinterpret_cast<const char *>(file.bytes().data()), static_cast<std::streamsize>(file.bytes().size()));
}

TEST(SpoolCommand, TakesTheDirectoriesOfTheConfigurationFile)
{
    in_empty_var([] {
        put_below_var("/var/spool/a/" + usual_folder);
        put_below_var("/var/spool/b/h9/0000000000000001/other");
        put_below_var("/var/spool/c/h9/0000000000000002/not_configured");
        std::ofstream("/var/qn/cfg/trace.conf") << "first:\n  pat = .*a.trc\n  spooling = ON\n  dest = /var/spool/a\n"
                                                   "again:\n  pat = .*b.trc\n  dest = /var/spool/a\n"
                                                   "off:\n  pat = .*c.trc\n  spooling = OFF\n  dest = /var/spool/b\n"
                                                   "null:\n  pat = .*d.trc\n  dest = /dev/null\n"
                                                   "none:\n  pat = .*e.trc\n  dest = /var/spool/not/made\n";
        const auto found = sound_rows({});
        ASSERT_EQ(found.size(), 2U);
        EXPECT_EQ(found[0]["program"], "mydaemon");
        EXPECT_EQ(found[0]["page_copies"], 1);
        EXPECT_EQ(found[1]["program"], "other");
    });
}

TEST(SpoolCommand, WithoutConfigurationFileAndDirectoriesIsStatus3)
{
    in_empty_var([] {
        const auto shown = run_qntrace({"spool"});
        EXPECT_EQ(shown.status, 3);
        EXPECT_EQ(shown.out, "");
        EXPECT_EQ(shown.err, "qntrace: /var/qn/cfg/trace.conf cannot be read; name the spool directories\n");
    });
}

} // namespace
} // namespace qn::test
