// What the arguments of `qntrace merge` and `qntrace stats` stand for, and that nothing is read twice.
#include <algorithm>
#include <filesystem>
#include <numeric>

#include <gtest/gtest.h>
#include <sys/stat.h>

#include "reader/spool_directory.h"
#include "reader/trace_set_files.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;
using ids = std::vector<std::uint32_t>;

constexpr std::size_t offset_of_pid = 48;
constexpr std::size_t offset_of_page_state = 192;

std::string copy_of(const std::string &page) { return page + ".2026_11_21_05_13_00.123456"; }

// A live page of the state "ready", with three records.
trace_builder ready_page()
{
    auto page = ids_from(1, {1, 2, 3});
    page.put_u8(offset_of_page_state, 4);
    return page;
}

TEST(TraceSet, TheNameOfATraceStandsForItsPages)
{
    const scratch_folder folder;
    folder.file("app.trc.2.sp", ids_from(20, {2}).bytes());
    folder.file("app.trc.10.sp", ids_from(10, {1}).bytes());
    folder.file("app.trc.x.sp", ids_from(30, {3}).bytes());
    folder.file("app.trc.0.sp", ids_from(40, {4}).bytes());
    folder.file("app.trc2.1.sp", ids_from(50, {5}).bytes());
    EXPECT_EQ(merged_ids({folder.path("app.trc")}), (ids{1, 2}));
}

TEST(TraceSet, TheNameOfATraceStandsForItsSingleFileTooWhenThereIsOne)
{
    const scratch_folder folder;
    folder.file("app.trc", ids_from(10, {1}).bytes());
    folder.file("app.trc.1.sp", ids_from(20, {2}).bytes());
    EXPECT_EQ(merged_ids({folder.path("app.trc")}), (ids{1, 2}));
}

TEST(TraceSet, APageStandsForItself)
{
    const scratch_folder folder;
    folder.file("app.trc.1.sp", ids_from(10, {1}).bytes());
    folder.file("app.trc.2.sp", ids_from(20, {2}).bytes());
    EXPECT_EQ(merged_ids({folder.path("app.trc.2.sp")}), ids{2});
}

TEST(TraceSet, AFolderStandsForTheCopiesBelowItAndTheTraceFilesInIt)
{
    const spool_directory spool;
    spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}));
    spool.put("", "app.trc.2.sp", ids_from(20, {2}));
    spool.put("", "other.trc", ids_from(30, {3}));
    spool.put("deeper", "no_copy.trc", ids_from(40, {4}));
    spool.folder.file("spool/notes.txt", byte_string().text("not a trace").bytes());
    EXPECT_EQ(merged_ids({spool.root}), (ids{1, 2, 3}));
}

TEST(TraceSet, NamesNodeProgramTraceAndFileOfEveryRecord)
{
    const spool_directory spool;
    const auto path = spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    const auto found = sound_objects("merge", {spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["cluster"], "c1");
    EXPECT_EQ(found[0]["node"], "h1");
    EXPECT_EQ(found[0]["node_id"], "000000000000002a");
    EXPECT_EQ(found[0]["program"], "app"); // its header's base name; the folder's may be that of a link
    EXPECT_EQ(found[0]["trace"], "app.trc");
    EXPECT_EQ(found[0]["path"], path);
}

TEST(TraceSet, ACopyNamedByItselfIsKnownByItsFolders)
{
    const spool_directory spool;
    const auto path = spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    EXPECT_EQ(texts_of(sound_objects("merge", {path}), "node"), strings{"h1"});
}

TEST(TraceSet, AFolderInsideASpoolDirectoryIsOfTheSameNode)
{
    const spool_directory spool;
    spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    for (const auto *folder : {"/c1/id1", "/c1/id1/h1", "/c1/id1/h1/000000000000002a/mydaemon"}) {
        const auto found = sound_objects("merge", {spool.root + folder});
        EXPECT_EQ(texts_of(found, "node"), strings{"h1"}) << folder;
        EXPECT_FALSE(found.at(0).contains("cluster")) << folder;
    }
}

TEST(TraceSet, ANodeOfNoClusterHasNone)
{
    const spool_directory spool;
    spool.put("h1/000000000000002a/app", copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    const auto found = sound_objects("merge", {spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["node"], "h1");
    EXPECT_FALSE(found[0].contains("cluster"));
}

TEST(TraceSet, AFolderThatHoldsSpoolDirectoriesTellsNoCluster)
{
    const spool_directory spool;
    spool.put("var/spool/trace/h1/000000000000002a/app", copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    const auto found = sound_objects("merge", {spool.root});
    ASSERT_EQ(found.size(), 1U);
    EXPECT_EQ(found[0]["node"], "h1");
    EXPECT_FALSE(found[0].contains("cluster"));
}

TEST(TraceSet, AFileOfANewerFormatInAFolderIsToldWithStatus1AndTheRestIsRead)
{
    const scratch_folder folder;
    fs::create_directory(folder.path("in"));
    folder.file("in/a.trc", ids_from(10, {1}).bytes());
    auto newer = ids_from(20, {2});
    newer.put_u16(2, 7);
    folder.file("in/b.trc", newer.bytes());
    const auto shown = run_qntrace({"merge", "--json", folder.path("in")});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(ids_in(shown), ids{1});
    EXPECT_NE(shown.err.find("b.trc: offset 2: format version 7 is newer"), std::string::npos) << shown.err;
}

TEST(TraceSet, TheOtherFilesOfAFolderAreCounted)
{
    const scratch_folder folder;
    fs::create_directory(folder.path("in"));
    folder.file("in/a.trc", ids_from(10, {1}).bytes());
    folder.file("in/empty", {});
    folder.file("in/notes.txt", byte_string().text("not a trace").bytes());
    const auto shown = run_qntrace({"merge", "--json", folder.path("in")});
    EXPECT_EQ(shown.status, 0);
    EXPECT_EQ(shown.err, "qntrace: " + folder.path("in") + ": 2 other files were passed over\n");
}

TEST(TraceSet, APageAndItsCopyOfANodeWithoutIdAreReadOnce)
{
    const spool_directory spool;
    const auto page = ids_from(10, {1}, 0);
    spool.put("h1/0000000000000000/app", copy_of("app.trc.1.sp"), page);
    const auto live = spool.folder.file("app.trc.1.sp", page.bytes());
    EXPECT_EQ(merged_ids({live, spool.root}), ids{1});
}

TEST(TraceSet, ALiveFileTakesTheHostFromACopyOfTheSameNode)
{
    const spool_directory spool;
    spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}, 0x2a));
    const auto same = spool.folder.file("app.trc", ids_from(20, {2}, 0x2a).bytes());
    const auto other = spool.folder.file("other.trc", ids_from(30, {3}, 0x2b).bytes());
    EXPECT_EQ(texts_of(sound_objects("merge", {spool.root, same, other}), "node"),
              (strings{"h1", "h1", "000000000000002b"}));
}

TEST(TraceSet, AFileWithoutNodeIdIsOfItsNodeNumber)
{
    const scratch_folder folder;
    auto file = ids_from(10, {1}, 0);
    file.put_u16(6, 7);
    EXPECT_EQ(texts_of(sound_objects("merge", {folder.file("app.trc", file.bytes())}), "node"), strings{"node7"});
}

class PageState : public testing::TestWithParam<int>
{
};

TEST_P(PageState, DoesNotMatterForAPageThatHasACopy)
{
    const spool_directory spool;
    auto page = ready_page();
    page.put_u8(offset_of_page_state, 8);
    const auto copy = spool.put(copy_of("app.trc.1.sp"), page);
    page.put_u8(offset_of_page_state, static_cast<std::uint8_t>(GetParam()));
    const auto live = spool.folder.file("app.trc.1.sp", page.bytes());
    const auto found = sound_objects("merge", {live, spool.root});
    EXPECT_EQ(texts_of(found, "path"), (strings{copy, copy, copy}));
}

TEST_P(PageState, DoesNotMatterForAPageThatHasNone)
{
    const scratch_folder folder;
    auto page = ready_page();
    page.put_u8(offset_of_page_state, static_cast<std::uint8_t>(GetParam()));
    EXPECT_EQ(merged_ids({folder.file("app.trc.1.sp", page.bytes())}), (ids{1, 2, 3}));
}

INSTANTIATE_TEST_SUITE_P(States, PageState, testing::Values(1, 2, 4, 8));

TEST(TraceSet, APageOfAnotherLifeIsReadBesideItsCopy)
{
    const spool_directory spool;
    spool.put(copy_of("app.trc.1.sp"), ids_from(10, {1}));
    const auto live = spool.folder.file("app.trc.1.sp", ids_from(20, {2}).bytes());
    EXPECT_EQ(merged_ids({live, spool.root}), (ids{1, 2}));
}

TEST(TraceSet, ACopyInTheMakingGivesWayToItsPage)
{
    const spool_directory spool;
    auto page = ready_page();
    const auto live = spool.folder.file("app.trc.1.sp", page.bytes());
    page.put_u32(200 + 2 * 32, 0); // nothing of the third record is there yet
    spool.put(copy_of("app.trc.1.sp"), page);
    EXPECT_EQ(texts_of(sound_objects("merge", {spool.root, live}), "path"), (strings{live, live, live}));
}

TEST(TraceSet, AFileWithMoreFinishedRecordsIsTheBetterOne)
{
    const spool_directory spool;
    auto page = ready_page();
    const auto live = spool.folder.file("app.trc.1.sp", page.bytes());
    page.put_u16(200 + 32 + 4, 65535); // the second record was unfinished when the copy was made
    spool.put(copy_of("app.trc.1.sp"), page);
    EXPECT_EQ(merged_ids({spool.root, live}), (ids{1, 2, 3}));
}

TEST(TraceSet, ThePidOfALaterStartDoesNotMakeAPageAnotherOne)
{
    const spool_directory spool;
    auto page = ready_page();
    spool.put(copy_of("app.trc.1.sp"), page);
    page.put_u32(offset_of_pid, 4712);
    const auto live = spool.folder.file("app.trc.1.sp", page.bytes());
    EXPECT_EQ(merged_ids({live, spool.root}), (ids{1, 2, 3}));
}

TEST(TraceSet, PagesOfTwoNodesThatAreAlikeAreBothRead)
{
    const spool_directory spool;
    spool.put("h1/0000000000000001/app", copy_of("app.trc.1.sp"), ids_from(10, {1}, 1));
    spool.put("h2/0000000000000002/app", copy_of("app.trc.1.sp"), ids_from(10, {1}, 2));
    EXPECT_EQ(texts_of(sound_objects("merge", {spool.root}), "node"), (strings{"h1", "h2"}));
}

TEST(TraceSet, TwoPagesThatAreAlikeAreBothRead)
{
    const scratch_folder folder;
    folder.file("app.trc.1.sp", ids_from(10, {1}).bytes());
    folder.file("app.trc.2.sp", ids_from(10, {1}).bytes());
    EXPECT_EQ(merged_ids({folder.path("app.trc")}), (ids{1, 1}));
}

TEST(TraceSet, AFileNamedTwiceIsReadOnce)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", ids_from(10, {1, 2}).bytes());
    EXPECT_EQ(merged_ids({path, path}), (ids{1, 2}));
}

TEST(TraceSet, WhatIsMissingIsToldWithStatus3AndTheRestIsRead)
{
    const scratch_folder folder;
    const auto path = folder.file("app.trc", ids_from(10, {1}).bytes());
    const auto shown = run_qntrace({"merge", "--json", folder.path("none.trc"), path});
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(ids_in(shown), ids{1});
    EXPECT_NE(shown.err.find("none.trc: cannot be opened: No such file or directory"), std::string::npos) << shown.err;
}

TEST(TraceSet, WhatCannotBeReadInAFolderIsToldWithStatus3AndTheRestIsRead)
{
    const scratch_folder folder;
    fs::create_directory(folder.path("in"));
    folder.file("in/a.trc", ids_from(10, {1}).bytes());
    const auto closed = folder.file("in/b.trc", ids_from(20, {2}).bytes());
    ASSERT_EQ(chmod(closed.c_str(), 0), 0);
    surroundings around;
    around.as_nobody = true;
    const auto shown = run_qntrace({"merge", "--json", folder.path("in")}, around);
    EXPECT_EQ(shown.status, 3);
    EXPECT_EQ(ids_in(shown), ids{1});
    EXPECT_NE(shown.err.find("b.trc: cannot be opened: Permission denied"), std::string::npos) << shown.err;
}

TEST(TraceSet, APageSetAndItsCopiesHoldEveryRecordOnceAndInOrder)
{
    constexpr std::uint64_t count = 40'000; // six pages and something: none is overwritten
    const scratch_folder folder;
    const auto spool = folder.path("spool");
    const auto file = folder.path("app.trc");
    {
        const writing_program writes(file, spool, 0, count);
    }
    const auto values = written_values(sound_objects("merge", {file, spool}));
    std::vector<std::uint64_t> expected(count);
    std::iota(expected.begin(), expected.end(), 0U);
    EXPECT_EQ(values, expected);
}

TEST(TraceSet, APageSetOfAProgramThatWasStartedAgainHoldsEveryRecordOnce)
{
    constexpr std::uint64_t count = 20'000;
    const scratch_folder folder;
    const auto spool = folder.path("spool");
    const auto file = folder.path("app.trc");
    {
        const writing_program writes(file, spool, 0, count);
    }
    {
        const writing_program writes(file, spool, count, count);
    }
    auto values = written_values(sound_objects("merge", {spool, file}));
    std::vector<std::uint64_t> expected(2 * count);
    std::iota(expected.begin(), expected.end(), 0U);
    EXPECT_EQ(values, expected);
}

} // namespace
} // namespace qn::test
