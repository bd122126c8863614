// qntrace salvage: the new file, what becomes of one that is there already, and what is said.
#include <filesystem>

#include <gtest/gtest.h>
#include <sys/stat.h>

#include "reader/every_kind.h"
#include "reader/program.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;

struct damaged_file {
    scratch_folder folder;
    std::string path;
    std::string out = folder.path("out.trc");

    damaged_file()
    {
        trace_builder file;
        file.add_id(1);
        const auto second = file.add_id(2);
        file.add_id(3);
        file.close();
        file.set_oldest(200);
        file.put_u32(second + 4, 5); // of no kind
        path = folder.file("app.trc", file.bytes());
    }
};

std::size_t files_in(const scratch_folder &folder)
{
    return static_cast<std::size_t>(std::distance(fs::directory_iterator(folder.path(".")), fs::directory_iterator()));
}

TEST(SalvageCommand, WritesASoundFileAndTellsWhatWasSavedAndWhatWasNot)
{
    const damaged_file of;
    const auto run = run_qntrace({"salvage", of.path, "-o", of.out});
    EXPECT_EQ(run.status, 1);
    EXPECT_EQ(run.out, "");
    EXPECT_NE(run.err.find(of.path + ": 2 records saved; lost: 1 damaged record left out\n"), std::string::npos)
        << run.err;
    const auto checked = run_qntrace({"check", of.out});
    EXPECT_EQ(checked.status, 0) << checked.out;
    EXPECT_EQ(files_in(of.folder), 2U);
}

TEST(SalvageCommand, ReplacesAFileOnlyWhenItIsForcedTo)
{
    const damaged_file of;
    of.folder.file("out.trc", std::as_bytes(std::span("precious")));
    const auto refused = run_qntrace({"salvage", of.path, "-o", of.out});
    EXPECT_EQ(refused.status, 2);
    EXPECT_NE(refused.err.find("out.trc: is there already; --force replaces it"), std::string::npos) << refused.err;
    EXPECT_EQ(contents_of(of.out), std::string("precious", 9));
    EXPECT_EQ(run_qntrace({"salvage", of.path, "-o", of.out, "--force"}).status, 1);
    EXPECT_EQ(run_qntrace({"check", "-q", of.out}).status, 0);
    EXPECT_EQ(files_in(of.folder), 2U);
}

TEST(SalvageCommand, NeverWritesToTheDamagedFileItself)
{
    const damaged_file of;
    const auto before = contents_of(of.path);
    const auto link = of.folder.path("link.trc");
    fs::create_hard_link(of.path, link);
    EXPECT_EQ(run_qntrace({"salvage", of.path, "-o", link, "--force"}).status, 2);
    EXPECT_EQ(contents_of(of.path), before);
}

TEST(SalvageCommand, ReplacesNothingButRegularFiles)
{
    const damaged_file of;
    ASSERT_EQ(mkfifo(of.folder.path("fifo").c_str(), 0600), 0);
    EXPECT_EQ(run_qntrace({"salvage", of.path, "-o", of.folder.path("fifo"), "--force"}).status, 2);
    EXPECT_TRUE(fs::is_fifo(of.folder.path("fifo")));
}

TEST(SalvageCommand, WritesJsonLinesToStandardOutputOrAFile)
{
    const damaged_file of;
    const auto shown = run_qntrace({"salvage", "--json", "--utc", of.path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(std::count(shown.out.begin(), shown.out.end(), '\n'), 3); // the header and two records
    EXPECT_EQ(run_qntrace({"salvage", "--json", "--utc", of.path, "-o", of.out}).status, 1);
    EXPECT_EQ(contents_of(of.out), shown.out);
}

TEST(SalvageCommand, NeedsAnOutputForATraceFile) { EXPECT_EQ(run_qntrace({"salvage", damaged_file().path}).status, 2); }

TEST(SalvageCommand, LeavesNothingBehindWhenTheOutputCannotBeWritten)
{
    const damaged_file of;
    const auto run = run_qntrace({"salvage", of.path, "-o", of.folder.path("no/out.trc")});
    EXPECT_EQ(run.status, 3);
    EXPECT_NE(run.err.find("no/out.trc: cannot be made: No such file or directory"), std::string::npos) << run.err;
    EXPECT_EQ(files_in(of.folder), 1U);
}

TEST(SalvageCommand, LeavesNothingBehindWhenTheDiskIsFull)
{
    const damaged_file of;
    const auto run = run_program("/bin/sh", {"-c", "ulimit -f 1; trap '' XFSZ; exec \"$0\" salvage \"$1\" -o \"$2\"",
                                             QNTRACE_PROGRAM, of.path, of.out});
    EXPECT_EQ(run.status, 3) << run.err;
    EXPECT_NE(run.err.find("out.trc: cannot be written: "), std::string::npos) << run.err;
    EXPECT_EQ(files_in(of.folder), 1U);
}

TEST(SalvageCommand, AFileThatIsNoTraceFileLeavesNoOutput)
{
    const scratch_folder folder;
    const auto path = folder.file("notes.txt", std::as_bytes(std::span("no trace")));
    const auto run = run_qntrace({"salvage", path, "-o", folder.path("out.trc")});
    EXPECT_EQ(run.status, 1);
    EXPECT_FALSE(fs::exists(folder.path("out.trc")));
}

TEST(SalvageCommand, GivesTheNewFileThePermissionsOfTheOldOne)
{
    const damaged_file of;
    ASSERT_EQ(chmod(of.path.c_str(), 0640), 0);
    run_qntrace({"salvage", of.path, "-o", of.out});
    EXPECT_EQ(fs::status(of.out).permissions(), fs::perms(0640));
}

TEST(SalvageCommand, ASoundFileIsSavedWhole)
{
    const scratch_folder folder;
    trace_builder file;
    file.add_id(1);
    file.close();
    const auto path = folder.file("app.trc", file.bytes());
    const auto run = run_qntrace({"salvage", path, "-o", folder.path("out.trc")});
    EXPECT_EQ(run.status, 0);
    EXPECT_EQ(run.err, "qntrace: " + path + ": 1 record saved\n");
}

} // namespace
} // namespace qn::test
