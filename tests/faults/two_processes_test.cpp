// Two processes that trace to the same file, or page set, at the same time. Their locks are their own, so they
// overwrite each other's records; neither is harmed by that, nor is anything else that they trace, and who comes next
// goes on.
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <thread>

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "reader/program.h"
#include "recording/numbered_records.h"
#include "recording/one_trace.h"
#include "support/scratch.h"
#include "support/trace_image.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr const char *item = "Two processes on one trace";
constexpr uint32_t processes = 2;
constexpr uint32_t writers = 4;
constexpr uint32_t own_file_bytes = 1 << 20;
constexpr unsigned longest_seconds = 120;

class TwoProcesses : public testing::Test
{
protected:
    using start = std::function<void(const std::string &)>;

    // Runs the bodies at the same time, each in a process that ends with exit(). All must end by themselves, and well.
    static void in_processes(const std::vector<std::function<void()>> &bodies)
    {
        std::vector<pid_t> children;
        for (const auto &body : bodies) {
            const pid_t child = fork();
            if (child == 0) {
                alarm(longest_seconds);
                if (freopen("/dev/null", "w", stderr) == nullptr) _exit(1); // damaged rings are reported there
                body();
                std::exit(HasFailure() ? 1 : 0);
            }
            children.push_back(child);
        }
        for (const pid_t child : children) {
            int status = -1;
            EXPECT_EQ(waitpid(child, &status, 0), child);
            EXPECT_EQ(status, 0);
        }
    }

    std::string own_file(uint32_t process) const { return folder / ("own." + std::to_string(process) + ".trc"); }

    // Each thread writes so many records to the shared trace, and the same to a file of the process's own.
    void record(uint32_t process, uint32_t records) const
    {
        const tr_file_token_t own = start_another(own_file(process), own_file_bytes);
        std::vector<std::thread> threads;
        for (uint32_t thread = 0; thread < writers; ++thread)
            threads.emplace_back([=] {
                for (uint32_t number = 0; number < records; ++number) {
                    EXPECT_EQ(write_numbered({process, thread}, number), 0);
                    EXPECT_EQ(write_numbered({process, thread}, number, own), 0);
                }
            });
        for (std::thread &thread : threads) thread.join();
    }

    void expect_own_file_whole(uint32_t process, uint32_t records) const
    {
        const auto numbers = numbers_in(trace_image::of_file(own_file(process)).ring());
        EXPECT_EQ(numbers.size(), writers);
        for (const auto &[author, found] : numbers) {
            ASSERT_EQ(found.size(), records);
            for (uint32_t number = 0; number < records; ++number) ASSERT_EQ(found[number], number);
        }
    }

    void record_at_the_same_time(const start &begin)
    {
        constexpr uint32_t records = 1500;
        const uint32_t repetitions = rounds(4, 200);
        for (uint32_t round = 0; round < repetitions && !HasFailure(); ++round) {
            std::vector<std::function<void()>> bodies;
            for (uint32_t process = 0; process < processes; ++process)
                bodies.emplace_back([=, this] {
                    begin(folder.folder());
                    record(process, records);
                });
            in_processes(bodies);
            for (uint32_t process = 0; process < processes; ++process) {
                expect_own_file_whole(process, records);
                std::filesystem::remove(own_file(process));
            }
            expect_next_to_go_on(begin);
        }
        count(item, "rounds", repetitions);
        count(item, "executions", uint64_t{repetitions} * processes * writers * records);
    }

    // A process that is alone again: the file, or page, that it writes is sound behind one lap, to the last record.
    void expect_next_to_go_on(const start &begin) const
    {
        in_processes({[=, this] {
            begin(folder.folder());
            const uint32_t lap = program_file_bytes / 32;
            EXPECT_EQ(write_ids(1, 2 * lap), 0);
            wait_for_queue();
            const trace_anchor_t *page = anchors.pActivePg != nullptr ? anchors.pActivePg : &anchors;
            const trace_image image = trace_image::of_file(page->fileName);
            EXPECT_EQ(image.records().back().u32(28), 2 * lap);
            const outcome told = run_qntrace({"check", page->fileName});
            EXPECT_EQ(told.status, 0) << told.out << told.err;
        }});
    }

    const scratch folder{memory_folder()};
};

TEST_F(TwoProcesses, ThatRecordIntoOneFileSpoilNothingElse) { record_at_the_same_time(running); }

#ifndef __SANITIZE_THREAD__ // one process says in the file that a page may be copied while the other still writes it
TEST_F(TwoProcesses, ThatRecordIntoOnePageSetSpoilNothingElse)
{
    record_at_the_same_time([](const std::string &where) {
        with_page_set(where);
        EXPECT_EQ(name_it(where), 0);
    });
}
#endif

// What a reader finds of both is reported: it ends by itself, whatever there is.
TEST_F(TwoProcesses, LeaveAFileThatIsReadToItsEnd)
{
    const uint32_t repetitions = rounds(4, 200);
    for (uint32_t round = 0; round < repetitions && !HasFailure(); ++round) {
        std::vector<std::function<void()>> bodies;
        for (uint32_t process = 0; process < processes; ++process)
            bodies.emplace_back([=, this] {
                running(folder.folder());
                record(process, 300);
                std::filesystem::remove(own_file(process));
            });
        in_processes(bodies);
        for (const char *command : {"check", "dump", "stats"}) {
            const outcome told = run_qntrace({command, folder / "app.trc"});
            EXPECT_EQ(told.signal, 0) << command;
            EXPECT_TRUE(told.status == 0 || told.status == 1) << command << "\n" << told.err;
        }
    }
}

// A child that the process has forked has its mapping, and outlives it. It is no second writer.
TEST_F(TwoProcesses, OfWhichOneIsTheChildOfADeadProcessAreNoTwoWriters)
{
    int go_on[2];
    int ended[2];
    ASSERT_EQ(pipe(go_on), 0);
    ASSERT_EQ(pipe(ended), 0);
    const pid_t process = fork();
    if (process == 0) {
        running(folder.folder());
        write_ids(1, 5);
        if (fork() == 0) {
            alarm(longest_seconds);
            close(go_on[1]);
            close(ended[0]);
            char nothing = 0;
            const bool next_is_done = read(go_on[0], &nothing, 1) == 0;
            const int status = write_ids(100, 1000) | tr_flush_1();
            tr_term();
            const char well = next_is_done && status == 0 ? '+' : '-';
            _exit(write(ended[1], &well, 1) == 1 ? 0 : 1);
        }
        raise(SIGKILL);
    }
    int status = 0;
    ASSERT_EQ(waitpid(process, &status, 0), process);
    close(go_on[0]);
    close(ended[1]);

    in_processes({[this] {
        running(folder.folder());
        EXPECT_EQ(write_ids(6, 5), 0);
    }});
    const std::string before = file_bytes(folder / "app.trc");
    close(go_on[1]);
    char well = 0;
    EXPECT_EQ(read(ended[0], &well, 1), 1);
    EXPECT_EQ(well, '+');
    EXPECT_EQ(file_bytes(folder / "app.trc"), before);
    std::vector<uint32_t> ids;
    for (const record_image &record : trace_image(before).records_of(1)) ids.push_back(record.u32(28));
    EXPECT_EQ(ids, (std::vector<uint32_t>{1, 2, 3, 4, 5, 6, 7, 8, 9, 10}));
}
} // namespace
