// What the command does when standard output or standard error cannot be written, or is not there at all.
#include <gtest/gtest.h>

#include "reader/program.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

const surroundings full_error_stream = {.err_file = "/dev/full"};
const surroundings no_error_stream = {.closed = {2}};

trace_builder sound()
{
    trace_builder file;
    file.add_id(1);
    file.add_id(2);
    file.close();
    return file;
}

trace_builder damaged()
{
    trace_builder file = sound();
    file.put_u32(232, 0); // the length of the second record
    return file;
}

class NoErrorStream : public testing::TestWithParam<const surroundings *>
{
protected:
    outcome run(const std::vector<std::string> &arguments) const { return run_qntrace(arguments, *GetParam()); }
    scratch_folder folder;
};

TEST_P(NoErrorStream, LeavesTheStatusOfAMissingFile)
{
    EXPECT_EQ(run({"dump", folder.path("missing")}).status, 3);
    EXPECT_EQ(run({"merge", folder.path("missing")}).status, 3);
}

TEST_P(NoErrorStream, LeavesTheStatusAndTheDataOfADamagedFile)
{
    const auto path = folder.file("a.trc", damaged().bytes());
    const auto shown = run({"dump", path});
    EXPECT_EQ(shown.status, 1);
    EXPECT_EQ(shown.out, run_qntrace({"dump", path}).out);
}

TEST_P(NoErrorStream, LeavesTheStatusOfWrongUsage)
{
    EXPECT_EQ(run({"dump"}).status, 2);
    EXPECT_EQ(run({"merge", "--offset", "late", folder.file("a.trc", sound().bytes())}).status, 2);
}

TEST_P(NoErrorStream, LeavesTheStatusOfASalvage)
{
    EXPECT_EQ(run({"salvage", "-o", folder.path("out"), folder.file("a.trc", sound().bytes())}).status, 0);
}

TEST_P(NoErrorStream, LeavesTheStatusOfOutputThatCannotBeWritten)
{
    auto around = *GetParam();
    around.out_file = "/dev/full";
    EXPECT_EQ(run_qntrace({"dump", folder.file("a.trc", sound().bytes())}, around).status, 3);
}

INSTANTIATE_TEST_SUITE_P(Full, NoErrorStream, testing::Values(&full_error_stream));
INSTANTIATE_TEST_SUITE_P(Closed, NoErrorStream, testing::Values(&no_error_stream));

TEST(ClosedStreams, LetNoMessageIntoAFileThatIsWritten)
{
    const scratch_folder folder;
    const auto path = folder.file("a.trc", damaged().bytes());
    run_qntrace({"salvage", "--json", "-o", folder.path("expected"), path});
    // The trace would be opened as standard input, and the new file as standard error.
    EXPECT_EQ(run_qntrace({"salvage", "--json", "-o", folder.path("out"), path}, {.closed = {0, 2}}).status, 1);
    EXPECT_EQ(contents_of(folder.path("out")), contents_of(folder.path("expected")));
}

TEST(ClosedStreams, AClosedOutputCannotBeWritten)
{
    const scratch_folder folder;
    const auto run = run_qntrace({"dump", folder.file("a.trc", sound().bytes())}, {.closed = {1}});
    EXPECT_EQ(run.status, 3);
    EXPECT_EQ(run.err, "qntrace: standard output cannot be written: Bad file descriptor\n");
}

class AskedFor : public testing::TestWithParam<const char *>
{
};

TEST_P(AskedFor, GoesToStandardOutputWithStatus0)
{
    const auto run = run_qntrace({GetParam()});
    EXPECT_EQ(run.status, 0);
    EXPECT_NE(run.out, "");
    EXPECT_EQ(run.err, "");
}

TEST_P(AskedFor, IsStatus3WhenItCannotBeWritten)
{
    const auto run = run_qntrace({GetParam()}, {.out_file = "/dev/full"});
    EXPECT_EQ(run.status, 3);
    EXPECT_EQ(run.err, "qntrace: standard output cannot be written: No space left on device\n");
}

INSTANTIATE_TEST_SUITE_P(Help, AskedFor, testing::Values("--help", "-h"));
INSTANTIATE_TEST_SUITE_P(Version, AskedFor, testing::Values("--version"));

} // namespace
} // namespace qn::test
