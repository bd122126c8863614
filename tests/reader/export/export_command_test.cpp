// qntrace export: what it refuses, what it leaves behind, and that it writes nowhere else.
#include <algorithm>
#include <filesystem>
#include <fstream>

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "export/samples.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;

const strings all_formats = {"jsonl", "ctf", "chrome", "sqlite"};

class EveryFormat : public testing::TestWithParam<std::string>
{
protected:
    std::string trace() const { return folder.file("in.trc", ids_from(1, {1, 2, 3}).bytes()); }
    std::string out() const { return folder.path("out"); }
    // What an output is the same as.
    std::string contents() const
    {
        if (!fs::is_directory(out())) return contents_of(out());
        std::string all;
        for (const auto &path : tree_of(out()))
            all += path + "\n" + (fs::is_regular_file(out() + "/" + path) ? contents_of(out() + "/" + path) : "");
        return all;
    }
    strings names() const
    {
        strings found;
        for (const auto &entry : fs::directory_iterator(folder.path("."))) found.push_back(entry.path().filename());
        std::sort(found.begin(), found.end());
        return found;
    }

    scratch_folder folder;
};

INSTANTIATE_TEST_SUITE_P(Export, EveryFormat, testing::ValuesIn(all_formats),
                         [](const auto &info) { return info.param; });

TEST_P(EveryFormat, LeavesNothingButItsOutput)
{
    exported(GetParam(), out(), {trace()});
    EXPECT_EQ(names(), (strings{"in.trc", "out"}));
}

TEST_P(EveryFormat, DoesNotReplaceWhatIsThere)
{
    exported(GetParam(), out(), {trace()});
    const auto before = contents();
    const auto again = export_to(GetParam(), out(), {trace(), "--id", "1"});
    EXPECT_EQ(again.status, 2);
    EXPECT_EQ(again.err, "qntrace: " + out() + ": is there already; --force replaces it\n");
    EXPECT_EQ(contents(), before);
    EXPECT_EQ(names(), (strings{"in.trc", "out"}));
}

TEST_P(EveryFormat, ReplacesAnExportThatItIsTold)
{
    exported(GetParam(), out(), {trace(), "--id", "1"});
    const auto before = contents();
    exported(GetParam(), out(), {trace(), "--force"});
    EXPECT_NE(contents(), before);
    EXPECT_EQ(names(), (strings{"in.trc", "out"}));
}

TEST_P(EveryFormat, NeverReplacesAFolderOfSomebodyElse)
{
    fs::create_directory(out());
    std::ofstream(out() + "/letter") << "dear";
    const auto made = export_to(GetParam(), out(), {trace(), "--force"});
    EXPECT_EQ(made.status, 2);
    EXPECT_EQ(contents_of(out() + "/letter"), "dear");
    EXPECT_EQ(names(), (strings{"in.trc", "out"}));
}

TEST_P(EveryFormat, NeverReplacesWhatItReads)
{
    const auto file = trace();
    const auto before = contents_of(file);
    const auto made = export_to(GetParam(), file, {file, "--force"});
    EXPECT_EQ(made.status, 2);
    EXPECT_EQ(made.err, "qntrace: " + file + " is one of the traces\n");
    EXPECT_EQ(contents_of(file), before);
}

TEST_P(EveryFormat, ExportsWhatIsSoundOfADamagedFile)
{
    EXPECT_EQ(export_to(GetParam(), out(), samples().at(9).make(folder)).status, 1);
    EXPECT_TRUE(fs::exists(out()));
}

TEST_P(EveryFormat, MakesAnOutputWithoutRecordsWhenThereAreNoTraces)
{
    fs::create_directory(folder.path("empty"));
    const auto made = export_to(GetParam(), out(), {folder.path("empty")});
    EXPECT_EQ(made.status, 0);
    EXPECT_EQ(made.err, "qntrace: there are no trace files\n");
    EXPECT_EQ(names(), (strings{"empty", "out"}));
}

TEST_P(EveryFormat, MakesNothingOfAFileThatIsNotThere)
{
    const auto made = export_to(GetParam(), out(), {folder.path("nothing.trc")});
    EXPECT_EQ(made.status, 3);
    EXPECT_EQ(made.err, "qntrace: " + folder.path("nothing.trc") + ": cannot be opened: No such file or directory\n");
    EXPECT_EQ(names(), (strings{}));
}

TEST_P(EveryFormat, ExportsTheOtherFilesWhenOneCannotBeRead)
{
    EXPECT_EQ(export_to(GetParam(), out(), {trace(), folder.path("nothing.trc")}).status, 3);
    EXPECT_TRUE(fs::exists(out()));
}

TEST_P(EveryFormat, SaysWhenThereIsNoRoomAndLeavesNothing)
{
    const auto file = folder.path("big.trc");
    {
        const writing_program writes(file, "", 0, 20'000);
    }
    // A limit of 8 blocks of 512 bytes for any file, of which the program is told by an error.
    surroundings around;
    const auto made = run_program("/bin/sh",
                                  {"-c", "trap '' XFSZ; ulimit -f 8; exec \"$@\"", "sh", QNTRACE_PROGRAM, "export",
                                   "--to", GetParam(), "-o", out(), file},
                                  around);
    EXPECT_EQ(made.status, 3);
    EXPECT_NE(made.err.find("cannot be written: "), std::string::npos) << made.err;
    EXPECT_EQ(names(), (strings{"big.trc"}));
}

TEST_P(EveryFormat, SaysWhenTheFolderMayNotBeWrittenTo)
{
    const auto file = trace();
    chmod(file.c_str(), 0644);
    fs::create_directory(folder.path("closed"));
    chmod(folder.path("closed").c_str(), 0555);
    surroundings nobody;
    nobody.as_nobody = true;
    const auto made = export_to(GetParam(), folder.path("closed/out"), {file}, nobody);
    EXPECT_EQ(made.status, 3);
    EXPECT_EQ(made.err, "qntrace: " + folder.path("closed/out") + ": cannot be made: Permission denied\n");
}

TEST_P(EveryFormat, GivesItsOutputTheUsualRights)
{
    const auto file = trace();
    const auto umask_before = umask(027);
    exported(GetParam(), out(), {file});
    umask(umask_before);
    struct stat status = {};
    ASSERT_EQ(stat(out().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, S_ISDIR(status.st_mode) ? 0750U : 0640U);
}

TEST_P(EveryFormat, WritesNothingOutsideItsOutputWhateverTheNames)
{
    const auto with_names = [&](const std::string &below, const std::string &program) {
        auto file = ids_from(1, {1}, 0);
        file.put_u64(180, 0);
        file.put_text(132, program);
        fs::create_directories(folder.path("in/" + below));
        folder.file("in/" + below + "/_%2e. *?\n.trc.1.sp.2026_11_21_05_12_01.000001", file.bytes());
    };
    with_names("c/1/.../0000000000000000/p", "../../../../escaped");
    with_names("..c/2/$(h)/0000000000000000/p", "/etc/passwd");
    with_names("-c/3/h h/0000000000000000/p", "..");
    with_names("_c/4/\xff/0000000000000000/p", std::string(47, '/'));
    exported(GetParam(), out(), {folder.path("in")});
    EXPECT_EQ(names(), (strings{"in", "out"}));
    if (!fs::is_directory(out())) return;
    for (const auto &path : tree_of(out())) {
        EXPECT_EQ(path.find_first_of(" *?\n$\xff"), std::string::npos) << path;
        for (const auto &part : fs::path(path))
            EXPECT_TRUE(part == ".qntrace-export" || part.string().find_first_of("._") != 0) << path;
    }
}

TEST(ExportCommand, SaysWhenADeviceHasNoRoom)
{
    const scratch_folder folder;
    const auto file = folder.file("in.trc", ids_from(1, {1, 2, 3}).bytes());
    const auto made = export_to("chrome", "/dev/full", {file});
    EXPECT_EQ(made.status, 3);
    EXPECT_EQ(made.err, "qntrace: /dev/full: cannot be written: No space left on device\n");
    for (const char *format : {"jsonl", "ctf", "sqlite"}) {
        const auto refused = export_to(format, "/dev/full", {file, "--force"});
        EXPECT_EQ(refused.status, 2);
        EXPECT_EQ(refused.err, "qntrace: /dev/full: is neither a file nor a folder\n");
    }
}

TEST(ExportCommand, PacksJsonLinesOnly)
{
    const scratch_folder folder;
    const auto file = folder.file("in.trc", ids_from(1, {1}).bytes());
    const auto made = export_to("ctf", folder.path("out"), {"--compress", "gzip", file});
    EXPECT_EQ(made.status, 2);
    EXPECT_EQ(made.err, "qntrace: --compress goes with --to jsonl only\n");
    EXPECT_FALSE(fs::exists(folder.path("out")));
}

TEST(ExportCommand, RefusesFormatsThatItDoesNotKnow)
{
    const scratch_folder folder;
    const auto file = folder.file("in.trc", ids_from(1, {1}).bytes());
    const auto made = export_to("csv", folder.path("out"), {file});
    EXPECT_EQ(made.status, 2);
    EXPECT_NE(made.err.find("csv not in {jsonl,ctf,chrome,sqlite}"), std::string::npos) << made.err;
}

TEST(ExportCommand, RefusesAnOffsetForANodeThatNoFileIsOf)
{
    const scratch_folder folder;
    const auto file = folder.file("in.trc", ids_from(1, {1}).bytes());
    const auto made = export_to("ctf", folder.path("out"), {"--offset", "elsewhere=1s", file});
    EXPECT_EQ(made.status, 2);
    EXPECT_EQ(made.err, "qntrace: no file is of the node elsewhere\n");
}

// Pages that the library could not copy, in part because they were overwritten: every format tells as much as stats.
TEST(ExportCommand, KeepsTheLossesOfAPageSetThatTheLibraryWrote)
{
    const scratch_folder folder;
    const auto file = folder.path("app.trc");
    {
        const writing_program writes(file, "/dev/null/nowhere", 0, 100'000);
    }
    const auto expected = losses_by_stats({file});
    exported("sqlite", folder.path("out.db"), {file});
    std::uint64_t most = 0;
    for (const auto &[what, count] : expected) {
        most = std::max(most, count);
        EXPECT_EQ(shell("sqlite3 '" + folder.path("out.db") + "' 'SELECT sum(" + what + ") FROM losses'"),
                  std::to_string(count) + "\n");
    }
    EXPECT_GT(most, 0U);
}

} // namespace
} // namespace qn::test
