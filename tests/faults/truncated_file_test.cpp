// A trace file that somebody truncates, removes or replaces while a program writes into its mapping. A store behind the end
// of a mapped file is the one fault that a program does not survive: the kernel answers it with SIGBUS, and the library
// installs no signal handlers in other people's programs. What can be relied on all the same is here.
#include <csignal>
#include <filesystem>
#include <functional>

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "support/scratch.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

class TruncatedFile : public testing::Test
{
protected:
    ~TruncatedFile() override
    {
        count("A file truncated, removed or replaced under its writer", "rounds", 1);
        count("A file truncated, removed or replaced under its writer", "faults", 1);
        count("A file truncated, removed or replaced under its writer", "executions", 1);
    }

    // Runs the body in a process that ends with exit(), its handlers included. The process's wait status.
    int in_process(const std::function<bool()> &body) const
    {
        const pid_t child = fork();
        if (child == 0) {
            alarm(60);
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
            signal(SIGBUS, SIG_DFL);
#endif
            running(folder_.folder());
            std::exit(body() ? 0 : 1);
        }
        int status = 0;
        waitpid(child, &status, 0);
        return status;
    }

    void expect_next_process_to_go_on() const
    {
        EXPECT_EQ(in_process([] { return write_ids(1, 5) == 0; }), 0);
        expect_last_id("app.trc", 5);
    }

    void expect_last_id(const std::string &file, uint32_t id) const
    {
        const auto records = trace_image::of_file(folder_ / file).records();
        ASSERT_FALSE(records.empty());
        EXPECT_EQ(records.back().u32(28), id);
    }

    const scratch folder_{memory_folder()};
};

TEST_F(TruncatedFile, EndsTheProgramThatRecordsIntoItWithSIGBUS)
{
    const int status = in_process([] {
        write_ids(1, 5);
        std::filesystem::resize_file(files().trace, 0);
        return write_ids(6, 5) == 0;
    });
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGBUS) << status;
    expect_next_process_to_go_on();
}

TEST_F(TruncatedFile, LeavesEveryOtherTraceOfTheProgramWhole)
{
    const int status = in_process([] {
        tr_file_token_t other = nullptr;
        if (tr_set_file_map_1(files().mapped.c_str(), "COMP:c1") != 0) return false;
        other = component().tokens[1];
        for (qn_uint32_t id = 1; id <= 5; ++id) tr_ms_record_id_1("COMP", id, other);
        std::filesystem::resize_file(files().trace, 0);
        return write_ids(6, 5) == 0;
    });
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGBUS) << status;
    expect_last_id("map.trc", 5);
}

TEST_F(TruncatedFile, IsLeftAloneByAProgramThatRecordsNothingMoreAndEnds)
{
    EXPECT_EQ(in_process([] {
                  write_ids(1, 5);
                  std::filesystem::resize_file(files().trace, 0);
                  return true;
              }),
              0);
    expect_next_process_to_go_on();
}

TEST_F(TruncatedFile, IsGivenUpWhenTheTraceGetsAnotherName)
{
    EXPECT_EQ(in_process([] {
                  std::filesystem::resize_file(files().trace, 0);
                  return tr_set_filename_1(files().mapped.c_str()) == 0 && write_ids(1, 5) == 0;
              }),
              0);
    expect_last_id("map.trc", 5);
}

// This is how a trace file is emptied under a running program.
TEST_F(TruncatedFile, RemovedInsteadIsNoFault)
{
    EXPECT_EQ(in_process([] {
                  write_ids(1, 5);
                  std::filesystem::remove(files().trace);
                  return write_ids(6, 500) == 0 && tr_flush_1() == 0;
              }),
              0);
    EXPECT_FALSE(std::filesystem::exists(folder_ / "app.trc"));
    expect_next_process_to_go_on();
}

TEST_F(TruncatedFile, RenamedInsteadGoesOnUnderItsOtherName)
{
    EXPECT_EQ(in_process([] {
                  std::filesystem::rename(files().trace, files().mapped);
                  return write_ids(1, 5) == 0;
              }),
              0);
    expect_last_id("map.trc", 5);
}
} // namespace
