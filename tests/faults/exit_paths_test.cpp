// Every way for a program to end, while its threads go on tracing: nothing hangs or dies, what was written before is
// there, and so is what is written until the library's own exit handler runs; behind that, calls do nothing.
#include "faults/exit_paths.h"

#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <new>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "recording/numbered_records.h"
#include "support/scratch.h"

extern char **environ;

namespace
{
using namespace qn::test;

struct exit_path {
    const char *how;
    int status;         // as wait tells it
    bool runs_handlers; // and destructors
    bool ends_main;     // those of objects of the main thread too; the C library leaves them out of pthread_exit()
};

void PrintTo(const exit_path &path, std::ostream *out) { *out << path.how; }

class ExitPath : public testing::TestWithParam<exit_path>
{
protected:
    ExitPath()
    {
        write_file(story_file_, std::string(sizeof(exit_story), '\0'));
        const int fd = open(story_file_.c_str(), O_RDWR | O_CLOEXEC);
        void *memory = mmap(nullptr, sizeof(exit_story), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        close(fd);
        if (memory == MAP_FAILED) std::abort();
        story_ = static_cast<exit_story *>(memory);
    }
    ~ExitPath() override { munmap(story_, sizeof *story_); }

    int run_program() const
    {
        std::string arguments[] = {EXIT_PATHS_PROGRAM, GetParam().how, trace_file_, story_file_};
        char *texts[] = {arguments[0].data(), arguments[1].data(), arguments[2].data(), arguments[3].data(), nullptr};
        pid_t child = -1;
        EXPECT_EQ(posix_spawn(&child, EXIT_PATHS_PROGRAM, nullptr, nullptr, texts, environ), 0);
        int status = -1;
        EXPECT_EQ(waitpid(child, &status, 0), child);
        return status;
    }

    // All records of a writer are there up to the end, one behind the other.
    void expect_whole(const std::map<record_author, std::vector<uint32_t>> &numbers, uint32_t writer) const
    {
        SCOPED_TRACE("writer " + std::to_string(writer));
        const uint32_t returned = story_->returned_before_end[writer];
        const auto of_writer = numbers.find({exit_run, writer});
        ASSERT_NE(of_writer, numbers.end());
        const std::vector<uint32_t> &all = of_writer->second;
        for (size_t i = 1; i < all.size(); ++i) ASSERT_EQ(all[i], all[i - 1] + 1);
        EXPECT_GE(all.back() + 1, returned);
        EXPECT_LE(all.back(), story_->returned[writer]);
    }

    static size_t records_of(const std::map<record_author, std::vector<uint32_t>> &numbers, uint32_t writer)
    {
        const auto of_writer = numbers.find({exit_run, writer});
        return of_writer == numbers.end() ? 0 : of_writer->second.size();
    }

    void check() const
    {
        const exit_path &path = GetParam();
        EXPECT_EQ(story_->status, 0U);
        const auto numbers = numbers_in(trace_image::of_file(trace_file_).ring());
        for (uint32_t worker = 0; worker < exit_writer::workers; ++worker) expect_whole(numbers, worker);
        EXPECT_EQ(records_of(numbers, exit_writer::main), records_of_handler);

        const bool after_term = std::string_view(path.how) == "tr_term";
        const uint32_t from_handler = path.runs_handlers ? records_of_handler : 0;
        const uint32_t from_thread = path.ends_main ? records_of_handler : 0;
        EXPECT_EQ(story_->returned[exit_writer::static_object], from_handler);
        EXPECT_EQ(story_->returned[exit_writer::earlier_handler], from_handler);
        EXPECT_EQ(story_->returned[exit_writer::later_handler], from_handler);
        EXPECT_EQ(story_->returned[exit_writer::thread_object], from_thread);
        EXPECT_EQ(records_of(numbers, exit_writer::later_handler), after_term ? 0 : from_handler);
        EXPECT_EQ(records_of(numbers, exit_writer::thread_object), after_term ? 0 : from_thread);
        EXPECT_EQ(records_of(numbers, exit_writer::earlier_handler), 0U) << "runs when tracing has ended";
        EXPECT_EQ(records_of(numbers, exit_writer::static_object), 0U) << "runs when tracing has ended";
    }

    scratch folder_;
    std::string trace_file_ = folder_ / "app.trc";
    std::string story_file_ = folder_ / "story";
    exit_story *story_ = nullptr;
};

INSTANTIATE_TEST_SUITE_P(By, ExitPath,
                         testing::Values(exit_path{"return", 0, true, true}, exit_path{"exit", 0, true, true},
                                         exit_path{"exit_in_a_thread", 0, true, false},
                                         exit_path{"end_of_the_main_thread", 0, true, false},
                                         exit_path{"quick_exit", 0, false, false}, exit_path{"_exit", 0, false, false},
                                         exit_path{"abort", SIGABRT, false, false},
                                         exit_path{"tr_term", 0, true, true}),
                         [](const auto &info) { return std::string(info.param.how); });

TEST_P(ExitPath, LosesNothingAndEndsAsItShould)
{
    setenv("QN_TR_SIZE", "4194304", 1);
    const uint32_t programs = rounds(3, 100);
    for (uint32_t program = 0; program < programs && !HasFailure(); ++program) {
        new (story_) exit_story{};
        unlink(trace_file_.c_str());
        EXPECT_EQ(run_program(), GetParam().status);
        check();
    }
    count("Exit paths", "rounds", 1);
    count("Exit paths", "executions", programs);
}
} // namespace
