// All exported calls from eight threads at random. None waits for good, ThreadSanitizer and the check of the lock order
// have nothing to say, every lock is free in the end, and all files are sound.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <deque>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <mutex>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "faults/aftermath.h"
#include "faults/campaign.h"
#include "faults/program.h"
#include "faults/storm_calls.h"
#include "support/scratch.h"
#include "tools/qntrace/check/file_check.h"
#include "trace/trace.h"

#ifdef __SANITIZE_THREAD__
extern "C" const char *__tsan_default_options() { return "detect_deadlocks=1:second_deadlock_stack=1"; }
#endif

namespace
{
using namespace qn::test;

constexpr unsigned most_threads = 8;
constexpr std::chrono::seconds longest_call{120};

// Of each thread: a minute's in the campaign, and in the build that sees races and learns the order of locks too.
uint32_t calls_to_make()
{
#ifdef __SANITIZE_THREAD__
    return rounds_of_every_build(600, 20000);
#else
    return rounds(2000, 250000);
#endif
}

// The library as the storm finds it: no configuration file, small files, and a page set that is copied.
void prepare_for(const storm_files &files)
{
    setenv("QN_TR_SPOOL", "none", 1);
    ASSERT_EQ(tr_set_size_1(program_file_bytes), 0);
    const qn::tr::global_lock global;
    ASSERT_EQ(addSpoolCfgElement(files.copies.c_str(), "/pages\\.trc", 4, 1, 60, &anchors.pFirstSpoolSpec,
                                 &anchors.pLastSpoolSpec, 0, program_file_bytes),
              0);
}

// Threads that call at random, and somebody who sees whether they get on.
class storm
{
public:
    storm(const storm_files &files, uint64_t seed, uint32_t calls) : calls_(calls)
    {
        for (unsigned number = 0; number < most_threads; ++number) {
            storm_thread &made = makers_.emplace_back(files, number, seed); // its levels are written until all ends
            threads_.emplace_back([this, &made, number] { run(made, number); });
        }
    }
    ~storm()
    {
        for (std::thread &thread : threads_) thread.join();
    }
    storm(const storm &) = delete;
    storm &operator=(const storm &) = delete;

    // Until all calls are made. A call that does not return ends the program.
    void wait()
    {
        std::unique_lock<std::mutex> guard(mutex_);
        for (uint64_t before = made(); running_ != 0; before = made())
            if (ended_.wait_for(guard, longest_call) == std::cv_status::timeout && made() == before) {
                for (const one_thread &thread : seen_) std::cerr << "waits in " << thread.call << "\n";
                std::abort();
            }
    }

    uint64_t made() const
    {
        uint64_t sum = 0;
        for (const one_thread &thread : seen_) sum += thread.made;
        return sum;
    }

private:
    struct one_thread {
        std::atomic<const char *> call = "";
        std::atomic<uint64_t> made{0};
    };

    // The first thread has fewer calls to make, and ends tracing behind them, beside the others.
    void run(storm_thread &thread, unsigned number)
    {
        const uint32_t calls = number == 0 ? calls_ - calls_ / 16 : calls_;
        for (uint32_t i = 0; i < calls; ++i) make_any_call(thread, seen_[number]);
        if (number == 0) {
            seen_[number].call = "tr_term";
            end_tracing();
        }
        const std::lock_guard<std::mutex> guard(mutex_);
        --running_;
        ended_.notify_one();
    }

    static void make_any_call(storm_thread &thread, one_thread &seen)
    {
        const storm_call &call = storm_calls()[thread.any(static_cast<unsigned>(storm_calls().size()))];
        seen.call = call.names.front().c_str();
        const qn_int32_t status = call.make(thread);
        ++seen.made;
        const bool expected = status == 0 || std::ranges::find(call.codes, status) != call.codes.end();
        EXPECT_TRUE(expected) << call.names.front() << " returned " << status << ": " << last_error().text;
    }

    uint32_t calls_;
    one_thread seen_[most_threads];
    std::mutex mutex_;
    std::condition_variable ended_;
    unsigned running_ = most_threads;
    std::deque<storm_thread> makers_;
    std::vector<std::thread> threads_;
};

uint64_t expect_sound_traces(const std::string &folder)
{
    uint64_t records = 0;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(folder)) {
        if (!entry.is_regular_file() || entry.path().string().find(".trc") == std::string::npos) continue;
        qn::reader::file_source source(entry.path());
        const qn::dump::file_check seen = qn::dump::check_file(source);
        EXPECT_TRUE(seen.readable && seen.sound())
            << entry.path() << ": " << (seen.findings.empty() ? "" : seen.findings.front().what.text);
        records += seen.records;
    }
    return records;
}

TEST(CallStorm, OfEightThreadsEndsWithEveryLockFreeAndEveryFileSound)
{
    const uint64_t seed = std::random_device()();
    std::cout << "seed " << seed << "\n";
    const scratch folder(memory_folder());
    const storm_files files(folder.folder());
    prepare_for(files);
    uint64_t made = 0;
    {
        storm all(files, seed, calls_to_make());
        all.wait();
        made = all.made();
    }
    EXPECT_STREQ(held_lock(), "");
    EXPECT_GT(expect_sound_traces(folder.folder()), 0U);
    count("All calls from eight threads at random", "rounds", 1);
    count("All calls from eight threads at random", "executions", made);
}

TEST(CallStorm, IsOfEveryExportedCall)
{
    std::set<std::string> made{"tr_term"};
    for (const storm_call &call : storm_calls()) made.insert(call.names.begin(), call.names.end());
    std::set<std::string> exported;
    std::ifstream map(EXPORTS_MAP);
    for (std::string word; map >> word;)
        if (word.starts_with("tr_")) exported.insert(word.substr(0, word.find(';')));
    EXPECT_EQ(made, exported);
}
} // namespace
