// qntrace merge: one order by time, whatever the files are like.
#include <algorithm>
#include <filesystem>
#include <numeric>
#include <sstream>

#include <gtest/gtest.h>
#include <sys/stat.h>

#include "reader/every_kind.h"
#include "reader/spool_directory.h"
#include "reader/trace_set_files.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;
using ids = std::vector<std::uint32_t>;

strings lines_of(const std::string &text)
{
    strings lines;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

TEST(Merge, InterleavesFilesByTime)
{
    const scratch_folder folder;
    const auto one = folder.file("one.trc", ids_from(1, {1, 2}).bytes()); // at 1 and 2 ms
    const auto two = folder.file("two.trc", ids_from(10, {10, 11}).bytes());
    const auto long_one =
        folder.file("long.trc", ids_from(0, {100, 101, 102, 103, 104, 105, 106, 107, 108, 109, 110, 111}).bytes());
    EXPECT_EQ(merged_ids({two, long_one, one}),
              (ids{100, 101, 1, 102, 2, 103, 104, 105, 106, 107, 108, 109, 10, 110, 11, 111}));
}

TEST(Merge, KeepsTheOrderOfTheArgumentsForEqualTimes)
{
    const scratch_folder folder;
    const auto a = folder.file("a.trc", ids_from(1, {1, 2}).bytes());
    const auto b = folder.file("b.trc", ids_from(1, {11, 12}).bytes());
    EXPECT_EQ(merged_ids({a, b}), (ids{1, 11, 2, 12}));
    EXPECT_EQ(merged_ids({b, a}), (ids{11, 1, 12, 2}));
}

TEST(Merge, ReadsARingFromItsOldestRecord)
{
    const scratch_folder folder;
    trace_builder ring(200 + 4 * 32);
    ring.seq = 8;
    ring.counter = 3'000'000;
    ring.add_id(3);
    ring.add_id(4);
    ring.seq = 4;
    ring.counter = 1'000'000;
    ring.set_oldest(ring.add_id(1));
    ring.add_id(2);
    EXPECT_EQ(merged_ids({folder.file("ring.trc", ring.bytes())}), (ids{1, 2, 3, 4}));
}

// The first node is at 10 ms, the second one at 11 ms, unless its clock is put right.
struct two_nodes : spool_directory {
    two_nodes()
    {
        put("early/0000000000000001/app", "app.trc.1.sp.2026_11_21_05_13_00.123456", ids_from(10, {1}, 1));
        put("late/0000000000000002/app", "app.trc.1.sp.2026_11_21_05_13_00.123456", ids_from(11, {2}, 2));
    }
};

class Offset : public testing::TestWithParam<const char *>
{
};

TEST_P(Offset, MovesTheRecordsOfItsNode)
{
    const two_nodes nodes;
    const auto found = sound_objects("merge", {"--offset", GetParam(), nodes.root});
    ASSERT_EQ(found.size(), 2U);
    EXPECT_EQ(found[0]["node"], "late");
    EXPECT_EQ(found[0]["time"], "2026-11-21T05:12:00.009500000Z");
    EXPECT_EQ(found[1]["time"], "2026-11-21T05:12:00.010000000Z");
}

INSTANTIATE_TEST_SUITE_P(Units, Offset,
                         testing::Values("late=-1.5ms", "late=-1500us", "late=-1500000ns", "late=-0.0015s",
                                         "0000000000000002=-1.5ms"));

TEST(Merge, TakesAnOffsetForEachNode)
{
    const two_nodes nodes;
    const auto found = sound_objects("merge", {"--offset", "late=+1h", "--offset", "early=2s", nodes.root});
    EXPECT_EQ(texts_of(found, "time"), (strings{"2026-11-21T05:12:02.010000000Z", "2026-11-21T06:12:00.011000000Z"}));
}

class BadOffset : public testing::TestWithParam<const char *>
{
};

TEST_P(BadOffset, IsWrongUsage)
{
    const two_nodes nodes;
    const auto shown = run_qntrace({"merge", "--offset", GetParam(), nodes.root});
    EXPECT_EQ(shown.status, 2);
    EXPECT_EQ(shown.out, "");
    EXPECT_EQ(shown.err, "qntrace: --offset takes NODE=DURATION, like host3=+1.5ms\n");
}

INSTANTIATE_TEST_SUITE_P(Texts, BadOffset,
                         testing::Values("late", "late=", "=1s", "late=1", "late=1.s", "late=.5s", "late=1.5ns",
                                         "late=1..5s", "late=--1s", "late=1 s", "late=1m", "late=1e3s",
                                         "late=9999999999s"));

TEST(Merge, AnOffsetForANodeThatNoFileIsOfIsWrongUsage)
{
    const two_nodes nodes;
    const auto shown = run_qntrace({"merge", "--offset", "other=1s", nodes.root});
    EXPECT_EQ(shown.status, 2);
    EXPECT_EQ(shown.err, "qntrace: no file is of the node other\n");
}

TEST(Merge, SelectsByTheTimeThatTheOffsetHasMadeRight)
{
    const two_nodes nodes;
    EXPECT_EQ(merged_ids({"--offset", "late=+1s", "--since", "2026-11-21T05:12:01Z", nodes.root}), ids{2});
}

TEST(Merge, SelectsRecords)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", ids_from(1, {1, 2, 3, 4}).bytes());
    EXPECT_EQ(merged_ids({"--where", "id >= 2 && id != 3", path}), (ids{2, 4}));
}

TEST(Merge, AnErrorNamesItsTraceFileBesideTheSourceFileThatItIsAbout)
{
    const scratch_folder folder;
    const auto path = folder.file("every.trc", every_kind().bytes());
    for (const auto &object : rows(run_qntrace({"merge", "--json", path}))) {
        EXPECT_EQ(object.at("path"), path);
        if (object.at("kind") == "error") {
            EXPECT_NE(object.at("file"), path);
        } else {
            EXPECT_FALSE(object.contains("file"));
        }
    }
}

TEST(Merge, KeepsTheOrderOfTheRingWhereItsClockStepsBackAndSaysSo)
{
    const scratch_folder folder;
    auto stepping = ids_from(1000, {1, 2});
    stepping.put_u64(200 + 32 + 20, 400'000'000); // 0.6 s before the first record
    const auto back = folder.file("back.trc", stepping.bytes());
    const auto other = folder.file("other.trc", ids_from(900, {11, 12}).bytes());
    const auto shown = run_qntrace({"merge", "--json", back, other});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(ids_in(shown), (ids{11, 12, 1, 2}));
    EXPECT_EQ(shown.err, "qntrace: " + back + ": the clock steps back by 600ms\n");
}

TEST(Merge, TellsOfManyStepsBackOnce)
{
    const scratch_folder folder;
    auto stepping = ids_from(1000, {1, 2, 3, 4, 5});
    stepping.put_u64(200 + 1 * 32 + 20, 900'000'000);
    stepping.put_u64(200 + 3 * 32 + 20, 1'000'000);
    const auto back = folder.file("back.trc", stepping.bytes());
    const auto shown = run_qntrace({"merge", "--json", back});
    EXPECT_EQ(ids_in(shown), (ids{1, 2, 3, 4, 5}));
    EXPECT_EQ(shown.err, "qntrace: " + back + ": the clock steps back 2 times, by up to 1001ms\n");
}

TEST(Merge, TextHasNoSourceColumnForOneTrace)
{
    const scratch_folder folder;
    folder.file("app.trc.1.sp", ids_from(1, {1}).bytes());
    folder.file("app.trc.2.sp", ids_from(2, {2}).bytes());
    const auto shown = run_qntrace({"merge", "--utc", folder.path("app.trc")});
    EXPECT_EQ(shown.status, 0) << shown.err;
    EXPECT_EQ(lines_of(shown.out),
              (strings{"TIME                                 SEQ  THREAD      COMP  KIND         BODY",
                       "2026-11-21T05:12:00.001000000Z         2  0x00007f01  TEST  id           id=1",
                       "2026-11-21T05:12:00.002000000Z         2  0x00007f01  TEST  id           id=2"}));
}

TEST(Merge, TextNamesNodeProgramAndTraceWhenThereAreSeveral)
{
    const scratch_folder folder;
    const auto a = folder.file("a.trc", ids_from(1, {1}, 0x1).bytes());
    const auto b = folder.file("longer.trc", ids_from(2, {2}, 0x2).bytes());
    const auto shown = run_qntrace({"merge", "--utc", a, b});
    EXPECT_EQ(lines_of(shown.out),
              (strings{"SOURCE                           TIME                                 SEQ  THREAD      COMP  "
                       "KIND         BODY",
                       "0000000000000001/app/a.trc       2026-11-21T05:12:00.001000000Z         2  0x00007f01  TEST  "
                       "id           id=1",
                       "0000000000000002/app/longer.trc  2026-11-21T05:12:00.002000000Z         2  0x00007f01  TEST  "
                       "id           id=2"}));
}

TEST(Merge, EscapesTheNamesOfSources)
{
    const scratch_folder folder;
    const auto a = folder.file("a\x1b[2J.trc", ids_from(1, {1}).bytes());
    const auto b = folder.file("b.trc", ids_from(2, {2}).bytes());
    const auto shown = run_qntrace({"merge", a, b});
    EXPECT_EQ(shown.out.find('\x1b'), std::string::npos);
    EXPECT_NE(shown.out.find("a\\x1b[2J.trc"), std::string::npos);
}

TEST(Merge, JsonKeepsEveryByteOfANameThatIsNoUtf8)
{
    const scratch_folder folder;
    const auto path = folder.file("a\xff.trc", ids_from(1, {1}).bytes());
    const auto found = sound_objects("merge", {path});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["encoding"], "latin-1");
    EXPECT_EQ(found[0]["trace"], "a\u00ff.trc");
}

TEST(Merge, ADamagedFileIsShownAsFarAsItIsSoundAndDoesNotEndTheMerge)
{
    const scratch_folder folder;
    auto damaged = ids_from(1, {1, 2, 3});
    damaged.put_u32(200 + 32, 0); // the length of the second record
    const auto bad = folder.file("bad.trc", damaged.bytes());
    const auto rubbish = folder.file("rubbish.trc", byte_string().zeros(5000).bytes());
    const auto good = folder.file("good.trc", ids_from(5, {11, 12}).bytes());
    const auto shown = run_qntrace({"merge", "--json", bad, rubbish, good});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(ids_in(shown), (ids{1, 11, 12}));
    EXPECT_NE(shown.err.find("bad.trc: offset 232: record length 0"), std::string::npos) << shown.err;
    EXPECT_NE(shown.err.find("rubbish.trc: offset 0: not a trace file"), std::string::npos) << shown.err;
}

TEST(Merge, AFileThatMayNotBeReadIsStatus3AndTheOthersAreShown)
{
    const scratch_folder folder;
    const auto closed = folder.file("closed.trc", ids_from(1, {1}).bytes());
    const auto open = folder.file("open.trc", ids_from(2, {2}).bytes());
    ASSERT_EQ(chmod(closed.c_str(), 0), 0);
    surroundings around;
    around.as_nobody = true;
    const auto shown = run_qntrace({"merge", "--json", closed, open}, around);
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(ids_in(shown), ids{2});
    EXPECT_EQ(shown.err, "qntrace: " + closed + ": cannot be opened: Permission denied\n");
}

TEST(Merge, TellsWhatIsMissingInEachSource)
{
    const scratch_folder folder;
    trace_builder page;
    page.put_u32(188, 1'795'237'900); // when the page was taken over unspooled
    page.component = "____";
    page.seq = 0xFFFFFFFE; // so that the note's is 0
    page.add(2, page.body().text("SPOOL: /tmp/app.trc.1.sp not spooled 3 consecutive times"));
    page.component = "TEST";
    page.add_id(1);
    page.seq += 4;
    page.add_id(2);
    page.add(65535, page.body().u32(3));
    page.close();
    const auto path = folder.file("app.trc.1.sp", page.bytes());
    const auto shown = run_qntrace({"merge", "--utc", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_NE(shown.err.find(path + ": lost: 1 record unfinished, 2 records missing, 3 pages overwritten before they "
                                    "were copied, the last at 2026-11-21T05:11:40.000000000Z\n"),
              std::string::npos)
        << shown.err;
}

TEST(Merge, SaysNothingOfASoundFile)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", ids_from(1, {1, 2, 3}).bytes());
    EXPECT_EQ(run_qntrace({"merge", path}).err, "");
}

TEST(Merge, AnEmptyFolderIsStatus0)
{
    const scratch_folder folder;
    fs::create_directory(folder.path("empty"));
    const auto shown = run_qntrace({"merge", folder.path("empty")});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.out, "");
    EXPECT_EQ(shown.err, "qntrace: there are no trace files\n");
}

TEST(Merge, AFileWithoutRecordsIsStatus0)
{
    const scratch_folder folder;
    const auto empty = folder.file("empty.trc", ids_from(1, {}).bytes());
    const auto full = folder.file("full.trc", ids_from(1, {1}).bytes());
    EXPECT_EQ(merged_ids({empty, full}), ids{1});
}

// Reads files with fewer descriptors than there are files.
outcome merge_with_few_descriptors(const std::string &folder)
{
    return run_program("/bin/sh", {"-c", "ulimit -n 24; exec \"$0\" merge --json \"$1\"", QNTRACE_PROGRAM, folder});
}

TEST(Merge, ReadsManyMoreFilesThatOverlapThanThereAreDescriptors)
{
    constexpr std::uint32_t files = 320;
    const spool_directory spool;
    ids expected;
    for (std::uint32_t file = 0; file < files; ++file) {
        // Larger than a window's share, so that each is read more than once, in turn with all others.
        trace_builder page(262'144);
        page.counter = 1'000'000 + file;
        page.add_id(file);
        page.add(3, page.body().u32(file).u32(0).zeros(100'000));
        page.counter = 2'000'000 + file;
        page.add_id(files + file);
        page.close();
        spool.put("app.trc." + std::to_string(file + 1) + ".sp.2026_11_21_05_13_00.123456", page);
    }
    const auto shown = merge_with_few_descriptors(spool.root);
    ASSERT_EQ(shown.status, 0) << shown.err;
    const auto found = ids_in(shown);
    ASSERT_EQ(found.size(), 3 * files);
    for (std::uint32_t file = 0; file < files; ++file) {
        EXPECT_EQ(found[file], file);
        EXPECT_EQ(found[2 * files + file], files + file);
    }
}

TEST(Merge, TheTracesOfTwoProgramsAreInOrderAndComplete)
{
    constexpr std::uint64_t count = 1'000; // neither file is full
    const scratch_folder folder;
    {
        const writing_program one(folder.path("one.trc"), "", 0, count);
        const writing_program two(folder.path("two.trc"), "", count, count);
    }
    const auto found = sound_objects("merge", {folder.path("one.trc"), folder.path("two.trc")});
    const auto times = texts_of(found, "time");
    EXPECT_TRUE(std::is_sorted(times.begin(), times.end()));
    auto values = written_values(found);
    std::sort(values.begin(), values.end());
    std::vector<std::uint64_t> expected(2 * count);
    std::iota(expected.begin(), expected.end(), 0U);
    EXPECT_EQ(values, expected);
}

} // namespace
} // namespace qn::test
