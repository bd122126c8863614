// Many threads: on one file and on several, while others register, unregister and rename.
#include <atomic>
#include <cstdlib>
#include <sched.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "recording/numbered_records.h"
#include "recording/one_trace.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint32_t writers = 4;
#if defined(__SANITIZE_THREAD__)
constexpr uint32_t records_each = 3000;
#else
constexpr uint32_t records_each = 20000;
#endif
constexpr uint32_t roomy_file = 16 * 1024 * 1024; // holds every record of every writer

// Runs body(0) to body(count - 1) in threads of their own and waits for them.
template <class Body>
void in_threads(uint32_t count, Body body)
{
    std::vector<std::thread> running;
    for (uint32_t i = 0; i < count; ++i) running.emplace_back(body, i);
    for (std::thread &thread : running) thread.join();
}

void write_all(uint32_t thread, tr_file_token_t token = nullptr)
{
    for (uint32_t number = 0; number < records_each; ++number) EXPECT_EQ(write_numbered({0, thread}, number, token), 0);
}

void expect_all_of(uint32_t thread, const std::map<record_author, std::vector<uint32_t>> &numbers)
{
    const auto found = numbers.find({0, thread});
    ASSERT_NE(found, numbers.end()) << "thread " << thread;
    ASSERT_EQ(found->second.size(), records_each);
    for (uint32_t number = 0; number < records_each; ++number) ASSERT_EQ(found->second[number], number);
}

// The record of a thread that came last, and none missing before it as far back as the ring goes.
void expect_the_last_of(const std::vector<uint32_t> &numbers)
{
    EXPECT_EQ(numbers.back(), records_each - 1);
    for (size_t i = 1; i < numbers.size(); ++i) ASSERT_EQ(numbers[i], numbers[i - 1] + 1);
}

// Does `work` again and again in a thread until it is destroyed.
class meanwhile
{
public:
    template <class Work>
    explicit meanwhile(Work work)
        : thread_([this, work] {
              do {
                  work();
                  ++turns_;
              } while (!ended_);
          })
    {
    }
    meanwhile(const meanwhile &) = delete;
    meanwhile &operator=(const meanwhile &) = delete;
    ~meanwhile()
    {
        ended_ = true;
        thread_.join();
    }
    void wait_for_turns(int count) const
    {
        while (turns_ < count) sched_yield();
    }

private:
    std::atomic<bool> ended_{false};
    std::atomic<int> turns_{0};
    std::thread thread_;
};

void register_and_unregister(const char *id)
{
    client component(id, 3);
    EXPECT_EQ(component.register_now(), 0);
    EXPECT_EQ(tr_unregister_component_1(id), 0);
}
} // namespace

TEST(WritersOfOneFile, LoseNothing)
{
    const one_trace trace(roomy_file);
    in_threads(writers, [](uint32_t thread) { write_all(thread); });
    const auto numbers = numbers_in(trace.image().ring());
    for (uint32_t thread = 0; thread < writers; ++thread) expect_all_of(thread, numbers);
}

TEST(WritersOfOneFile, AreNumberedAndStampedInTheOrderOfTheRing)
{
    const one_trace trace(roomy_file);
    in_threads(writers, [](uint32_t thread) { write_all(thread); });
    uint32_t sequence = 0;
    uint64_t stamp = 0;
    for (const record_image &record : trace.image().records()) {
        ASSERT_EQ(record.sequence(), sequence += 2);
        ASSERT_GE(record.time_stamp(), stamp);
        stamp = record.time_stamp();
    }
    EXPECT_EQ(sequence, 2 * (writers * records_each + 1));
}

TEST(WritersOfOneFile, KeepTheNewestRecordsWhenTheRingGoesRound)
{
    const one_trace trace(65536);
    in_threads(writers, [](uint32_t thread) { write_all(thread); });
    const auto numbers = numbers_in(trace.image().ring());
    ASSERT_FALSE(numbers.empty());
    for (const auto &[author, of_author] : numbers) expect_the_last_of(of_author);
}

TEST(WritersOfOneFile, KeepTheSmallestRingSound)
{
    const one_trace trace(4096);
    in_threads(writers, [](uint32_t thread) { write_all(thread); });
    const auto numbers = numbers_in(trace.image().ring());
    ASSERT_FALSE(numbers.empty());
    for (const auto &[author, of_author] : numbers) expect_the_last_of(of_author);
}

#ifndef __SANITIZE_THREAD__ // no lock is biased there
TEST(WritersOfOneFile, LoseNothingWhileTheLocksBiasChangesHands)
{
    const one_trace trace(roomy_file);
    uint32_t revoked = 0;
    {
        const meanwhile revoking([&] {
            usleep(10);
            revoked += qn::tr::load_relaxed(anchors.anchorBias.towards) != nullptr ? 1 : 0;
            const qn::tr::anchor_set_lock set(&anchors);
            anchors.anchorBias.enough = 4; // soon biased anew, towards another
        });
        in_threads(writers, [](uint32_t thread) { write_all(thread); });
        revoking.wait_for_turns(20);
    }
    const auto numbers = numbers_in(trace.image().ring());
    for (uint32_t thread = 0; thread < writers; ++thread) expect_all_of(thread, numbers);
    EXPECT_GT(revoked, 0U) << "there was nothing to lose by";
}
#endif

TEST(WritersOfSeveralFiles, LoseNothingWhileOthersRegisterAndRename)
{
    const one_trace trace;
    tr_file_token_t tokens[writers];
    const auto file = [&](uint32_t i) { return trace.folder() / ("file" + std::to_string(i) + ".trc"); };
    for (uint32_t i = 0; i < writers; ++i) tokens[i] = start_another(file(i), roomy_file / writers);

    const meanwhile first([] { register_and_unregister("CHN1"); });
    const meanwhile second([] { register_and_unregister("CHN2"); });
    const meanwhile renaming([&] {
        EXPECT_EQ(tr_set_filename_1((trace.folder() / "renamed.trc").c_str()), 0);
        EXPECT_EQ(tr_record_id_1("DFLT", 1), 0);
        EXPECT_EQ(tr_set_filename_1(trace.file().c_str()), 0);
    });
    in_threads(writers, [&](uint32_t thread) { write_all(thread, tokens[thread]); });
    first.wait_for_turns(20);
    second.wait_for_turns(20);
    renaming.wait_for_turns(20);

    for (uint32_t thread = 0; thread < writers; ++thread) {
        const auto numbers = numbers_in(trace_image::of_file(file(thread)).ring());
        EXPECT_EQ(numbers.size(), 1U);
        expect_all_of(thread, numbers);
    }
}

TEST(WritersOfSeveralFiles, ShareThemWithoutMixingThemUp)
{
    const one_trace trace(roomy_file);
    const tr_file_token_t other = start_another(trace.folder() / "other.trc", roomy_file);
    in_threads(writers, [=](uint32_t thread) {
        for (uint32_t number = 0; number < records_each; ++number)
            EXPECT_EQ(write_numbered({0, thread}, number, number % 2 == 0 ? nullptr : other), 0);
    });
    const auto even = numbers_in(trace.image().ring());
    const auto odd = numbers_in(trace_image::of_file(trace.folder() / "other.trc").ring());
    for (uint32_t thread = 0; thread < writers; ++thread) {
        const auto &even_ones = even.at({0, thread});
        const auto &odd_ones = odd.at({0, thread});
        ASSERT_EQ(even_ones.size(), records_each / 2);
        ASSERT_EQ(odd_ones.size(), records_each / 2);
        for (uint32_t i = 0; i < records_each / 2; ++i) {
            ASSERT_EQ(even_ones[i], 2 * i);
            ASSERT_EQ(odd_ones[i], 2 * i + 1);
        }
    }
}

// Everything that stops and starts files, beside writers that do not care.
TEST(WritersOfStoppedFiles, NeverTearARecord)
{
    const one_trace trace;
    tr_file_token_t tokens[writers] = {};
    const auto file = [&](uint32_t i) {
        return i == 0 ? trace.file() : trace.folder() / ("file" + std::to_string(i) + ".trc");
    };
    for (uint32_t i = 1; i < writers; ++i) tokens[i] = start_another(file(i));

    {
        const meanwhile stopping([] { EXPECT_EQ(tr_set_filename_1(nullptr), 0); });
        const meanwhile starting([] { register_and_unregister("CHN1"); });
        const meanwhile levelling([] {
            EXPECT_EQ(tr_unregister_component_1("TEST"), 0); // with it, the last reason to trace may go
            static client component("TEST");
            EXPECT_EQ(component.register_now(), 0);
        });
        in_threads(writers, [&](uint32_t thread) { write_all(thread, tokens[thread]); });
        stopping.wait_for_turns(20);
        starting.wait_for_turns(20);
        levelling.wait_for_turns(20);
    }

    for (uint32_t i = 0; i < writers; ++i) {
        SCOPED_TRACE(file(i));
        for (const auto &[author, numbers] : numbers_in(trace_image::of_file(file(i)).ring())) {
            EXPECT_EQ(author.thread, i);
            for (size_t at = 1; at < numbers.size(); ++at) ASSERT_GT(numbers[at], numbers[at - 1]);
        }
    }
}

TEST(WritersOfOneFile, AreWaitedForByTheEndOfTracing)
{
    const one_trace trace;
    std::atomic<bool> ended{false};
    std::atomic<uint32_t> begun{0};
    std::thread ending([&] {
        while (begun < writers) sched_yield();
        tr_term();
        ended = true;
    });
    in_threads(writers, [&](uint32_t thread) {
        for (uint32_t number = 0; !ended; ++number) {
            EXPECT_EQ(write_numbered({0, thread}, number), 0);
            if (number == 100) ++begun;
        }
    });
    ending.join();
    EXPECT_EQ(anchors.pMap, nullptr);
    for (const auto &[author, numbers] : numbers_in(trace.image().ring()))
        for (size_t at = 1; at < numbers.size(); ++at) ASSERT_EQ(numbers[at], numbers[at - 1] + 1);
}
