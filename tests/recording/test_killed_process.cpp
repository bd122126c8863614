// Processes with four writing threads, killed at any moment, one after the other on the same file: what a call had
// written when it returned is there, and the next process goes on with the file.
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <new>
#include <random>
#include <sched.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "recording/numbered_records.h"
#include "support/last_error.h"
#include "support/scratch.h"

using namespace qn::test;

namespace
{
constexpr uint32_t threads = 4;
constexpr uint32_t told_apart = 676; // runs: a ring holds the records of few of them
constexpr uint32_t file_bytes = 65536;
constexpr uint32_t ring_bytes = file_bytes - 200;
constexpr uint32_t longest_record = 220; // none of the numbered ones is longer

// What a process leaves behind, in memory that survives it.
struct survivor {
    std::atomic<uint32_t> started{0}; // the trace runs, and the following three are set
    uint32_t start_offset = 0;        // of its start record
    uint32_t start_sequence = 0;
    uint32_t status = 0;               // or-ed together of all calls
    std::atomic<uint64_t> returned{0}; // calls of all threads
    struct {
        std::atomic<uint32_t> returned{0}; // calls: the records 0 to returned - 1 are written
        std::atomic<uint64_t> before{0};   // the last one or an earlier one: `returned` of all threads
    } thread[threads];
};

// Writes until it is killed.
[[noreturn]] void be_killed(survivor &left, const std::string &file, uint32_t run)
{
    setenv("QN_TR_SIZE", std::to_string(file_bytes).c_str(), 1);
    client component("KILL");
    left.status |= static_cast<uint32_t>(tr_set_filename_1(file.c_str()));
    left.status |= static_cast<uint32_t>(component.register_now());
    const auto records = trace_image::of_file(file).records();
    left.start_offset = static_cast<uint32_t>(records.back().offset);
    left.start_sequence = records.back().sequence();
    left.started = 1;

    const auto write = [&](uint32_t thread) {
        for (uint32_t number = 0;; ++number) {
            const uint64_t before = left.returned;
            if (write_numbered({run, thread}, number) != 0) _exit(1);
            left.thread[thread].returned = number + 1;
            left.thread[thread].before = before;
            ++left.returned;
        }
    };
    for (uint32_t thread = 1; thread < threads; ++thread) std::thread(write, thread).detach();
    write(0);
    _exit(1);
}

class KilledProcess : public testing::Test
{
protected:
    KilledProcess()
    {
        void *memory = mmap(nullptr, sizeof(survivor), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        if (memory == MAP_FAILED) std::abort();
        left_ = static_cast<survivor *>(memory);
    }
    ~KilledProcess() override { munmap(left_, sizeof *left_); }

    // Runs a process until its threads have made so many calls; 0: kills it while it starts.
    void run_and_kill(uint32_t run, uint64_t calls)
    {
        new (left_) survivor;
        const pid_t child = fork();
        if (child == 0) be_killed(*left_, file_, run);
        int status = 0;
        bool gone = false;
        while (calls > 0 && left_->returned < calls && !gone) {
            gone = waitpid(child, &status, WNOHANG) == child;
            sched_yield();
        }
        ASSERT_FALSE(gone) << "the process ended by itself, status " << status;
        for (uint32_t spins = std::uniform_int_distribution<uint32_t>(0, 100000)(random_); spins > 0; --spins)
            std::atomic_signal_fence(std::memory_order_seq_cst);
        kill(child, SIGKILL);
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL) << status;
    }

    // The file that a started process left.
    void check(uint32_t run)
    {
        ASSERT_EQ(left_->status, 0U);
        const auto ring = trace_image::of_file(file_).ring();
        check_sequence(ring);
        const auto numbers = numbers_in(ring);
        for (const auto &[author, of_author] : numbers) {
            EXPECT_TRUE(author.run == run || last_number_.contains(author)) << "run " << author.run;
            for (size_t i = 1; i < of_author.size(); ++i) ASSERT_EQ(of_author[i], of_author[i - 1] + 1);
            EXPECT_TRUE(author.run == run || of_author.back() == last_number_.at(author)) << "run " << author.run;
        }
        for (uint32_t thread = 0; thread < threads; ++thread) {
            const auto of_thread = numbers.find({run, thread});
            check_thread(run, thread, of_thread == numbers.end() ? nullptr : &of_thread->second);
        }
    }

    // How the process that was killed had found the file.
    void check_start()
    {
        if (last_sequence_ == 0) return; // nobody knows what was there
        const bool continued = left_->start_sequence == last_sequence_ + 2 ||
                               left_->start_sequence == last_sequence_ + 4; // a filler, then the start record
        const bool afresh = left_->start_sequence == 2 && left_->start_offset == 200;
        EXPECT_TRUE(continued || afresh) << left_->start_sequence << " behind " << last_sequence_;
        continued_ += continued;
    }

    const scratch folder_;
    const std::string file_ = folder_ / "app.trc";
    std::mt19937 random_{4};
    survivor *left_ = nullptr;
    uint32_t last_sequence_ = 0; // in the file; 0: not known
    uint32_t continued_ = 0;     // starts

private:
    // Every record of the ring follows the one before it. Only at the free pointer may stand one that was just begun, in
    // whose header everything may be new or old.
    void check_sequence(const std::vector<record_image> &ring)
    {
        uint32_t last = 0;
        for (size_t i = 0; i < ring.size(); ++i) {
            const uint32_t sequence = ring[i].sequence();
            if (sequence == 4095 || sequence == 0 || (i == 0 && !ring[i].is_data())) continue;
            ASSERT_TRUE(last == 0 || sequence == last + 2)
                << sequence << " behind " << last << " at " << ring[i].offset;
            last = sequence;
        }
        last_sequence_ = last;
    }

    void check_thread(uint32_t run, uint32_t thread, const std::vector<uint32_t> *numbers)
    {
        const uint32_t returned = left_->thread[thread].returned;
        if (numbers != nullptr) {
            // One call may have written its record and not come back.
            EXPECT_GE(numbers->back() + 1, returned) << "thread " << thread;
            EXPECT_LE(numbers->back(), returned) << "thread " << thread;
            last_number_[{run, thread}] = numbers->back();
        } else if (returned > 0) {
            const uint64_t calls_since = left_->returned - left_->thread[thread].before + threads;
            EXPECT_GT(calls_since * longest_record, ring_bytes - 2 * longest_record)
                << "the records of thread " << thread << " are lost";
        }
    }

    std::map<record_author, uint32_t> last_number_;
};
} // namespace

TEST_F(KilledProcess, LeavesEveryRecordWhoseCallReturnedAndAFileThatGoesOn)
{
    const uint32_t runs = rounds(100, 2000);
    uint32_t started = 0;
    for (uint32_t round = 0; round < runs; ++round) {
        SCOPED_TRACE("round " + std::to_string(round));
        const uint32_t run = round % told_apart;
        const bool at_start = round % 10 == 9;
        const uint64_t calls = at_start ? 0 : std::uniform_int_distribution<uint64_t>(1, 3000)(random_);
        run_and_kill(run, calls);
        if (HasFatalFailure()) return;
        if (left_->started != 0) {
            ++started;
            check_start();
            check(run);
        } else {
            last_sequence_ = 0;
        }
        if (HasFatalFailure() || HasNonfatalFailure()) return;
    }
    EXPECT_GE(started, runs - runs / 10);
    EXPECT_GT(continued_, runs / 2);
    count("Killed at random", "rounds", runs);
    count("Killed at random", "faults", runs);
    count("Killed at random", "executions", runs);
}
