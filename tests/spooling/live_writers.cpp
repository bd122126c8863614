#include "spooling/live_writers.h"

#include <algorithm>
#include <numeric>

#include <gtest/gtest.h>
#include <sched.h>

#include "spooling/soak_trace.h"

namespace
{
using namespace qn::test;

constexpr uint32_t batch = 20000; // records of each thread: some pages of the largest size

uint64_t sum(const std::array<std::atomic<uint32_t>, live_writers::count> &numbers)
{
    return std::accumulate(numbers.begin(), numbers.end(), uint64_t{0});
}
} // namespace

namespace qn::test
{
live_writers::live_writers(std::optional<int> longest_queue) : longest_queue_(longest_queue)
{
    for (uint32_t i = 0; i < count; ++i) threads_.emplace_back([this, i] { write(i); });
}

live_writers::~live_writers() { end(); }

void live_writers::let_write(uint64_t records) { most_ = sum(written_) + records; }

void live_writers::wait_for(uint64_t records) const
{
    const uint64_t enough = std::min(sum(written_) + records, most_.load());
    while (sum(written_) < enough) sched_yield();
}

std::array<uint32_t, live_writers::count> live_writers::end()
{
    ended_ = true;
    for (std::thread &thread : threads_) thread.join();
    threads_.clear();
    std::array<uint32_t, count> written{};
    std::copy(written_.begin(), written_.end(), written.begin());
    return written;
}

void live_writers::write(uint32_t thread)
{
    while (!ended_) {
        if (sum(written_) >= most_) {
            sched_yield();
            continue;
        }
        if (longest_queue_) wait_for_queue(*longest_queue_);
        EXPECT_EQ(write_numbered({0, thread}, written_[thread]), 0);
        ++written_[thread];
    }
}

void expect_sound(const std::vector<page_file> &pages)
{
    for (const auto &[author, numbers] : numbers_in_pages(pages))
        for (size_t i = 1; i < numbers.size(); ++i) ASSERT_GT(numbers[i], numbers[i - 1]) << "thread " << author.thread;
}

void expect_all(const std::vector<page_file> &pages, const std::array<uint32_t, live_writers::count> &written)
{
    const auto found = numbers_in_pages(pages);
    for (uint32_t thread = 0; thread < live_writers::count; ++thread) {
        if (written[thread] == 0) continue;
        const auto numbers = found.find({0, thread});
        ASSERT_NE(numbers, found.end()) << "thread " << thread;
        for (uint32_t i = 0; i < std::min<size_t>(written[thread], numbers->second.size()); ++i)
            ASSERT_EQ(numbers->second[i], i) << "thread " << thread;
        ASSERT_EQ(numbers->second.size(), written[thread]) << "thread " << thread;
    }
}

void expect_next_batch(std::array<uint32_t, live_writers::count> written, int longest_queue,
                       const std::string &live_folder, const std::string &spool_folder)
{
    in_threads(live_writers::count, [&](uint32_t thread) {
        for (uint32_t i = 0; i < batch; ++i) {
            wait_for_queue(longest_queue);
            ASSERT_EQ(write_numbered({0, thread}, written[thread] + i), 0);
        }
    });
    wait_for_queue(0);
    const auto found = numbers_in_pages(pages_written(live_folder, spool_folder));
    for (uint32_t thread = 0; thread < live_writers::count; ++thread) {
        const auto numbers = found.find({0, thread});
        ASSERT_NE(numbers, found.end()) << "thread " << thread;
        ASSERT_GE(numbers->second.size(), batch);
        const auto first = numbers->second.end() - batch;
        for (uint32_t i = 0; i < batch; ++i) ASSERT_EQ(first[i], written[thread] + i) << "thread " << thread;
    }
}
} // namespace qn::test
