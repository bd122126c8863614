// Counters that step, back and forth, between two records, and a clock of the wall that is set while a program records,
// copies and waits. Nothing is lost, nobody waits longer or not at all, and no reader reports what did not happen.
#include <algorithm>
#include <array>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <set>
#include <thread>

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "faults/campaign.h"
#include "faults/clock_stand_ins.h"
#include "faults/program.h"
#include "reader/program.h"
#include "recording/numbered_records.h"
#include "recording/one_trace.h"
#include "spooling/soak_trace.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr const char *item = "Counters and clocks that step";
constexpr uint32_t writers = 4;
constexpr uint64_t hour_of_ticks = uint64_t{3600} * 3'000'000'000;

std::atomic<uint64_t> calls_of_counter{0};

uint64_t back_and_forth(uint64_t value)
{
    const uint64_t call = ++calls_of_counter;
    return call % 3 == 0 ? value - hour_of_ticks : call % 3 == 1 ? value + hour_of_ticks : value;
}
uint64_t always_back(uint64_t) { return (uint64_t{1} << 50) - 1000 * ++calls_of_counter; }
uint64_t extremes(uint64_t value)
{
    const uint64_t call = ++calls_of_counter;
    return call % 3 == 0 ? 0 : call % 3 == 1 ? UINT64_MAX : value;
}
uint64_t stands_still(uint64_t) { return 1000 + 0 * ++calls_of_counter; }

// So that only records whose stamps grow from each to the next are sorted.
bool is_later(const record_image &one, const record_image &other) { return one.time_stamp() <= other.time_stamp(); }

class StepsOfCounter : public testing::TestWithParam<counter_change>
{
protected:
    StepsOfCounter() { alarm(120); }
    ~StepsOfCounter() override
    {
        changed_counter = nullptr;
        count(item, "rounds", 1);
        count(item, "faults", calls_of_counter);
    }

    static void expect_nothing_missing(const std::string &name)
    {
        for (const char *command : {"check", "stats", "merge"}) {
            const outcome told = run_qntrace({command, name});
            EXPECT_EQ(told.status, 0) << command << "\n" << told.err;
            EXPECT_EQ((told.out + told.err).find("missing"), std::string::npos) << told.err;
        }
    }
};

TEST_P(StepsOfCounter, LeaveTheRecordsOfAFileInTheirOrder)
{
    static constexpr uint32_t records_each = 150;
    const one_trace trace;
    changed_counter = GetParam();
    in_threads(writers, [](uint32_t thread) {
        for (uint32_t number = 0; number < records_each; ++number) ASSERT_EQ(write_numbered({1, thread}, number), 0);
    });
    const auto records = trace.written();
    EXPECT_FALSE(std::is_sorted(records.begin(), records.end(), is_later)) << "the counter did not step";
    for (const auto &[author, found] : numbers_in(trace.image().ring())) {
        ASSERT_EQ(found.size(), records_each);
        for (uint32_t number = 0; number < records_each; ++number) ASSERT_EQ(found[number], number);
    }
    expect_nothing_missing(trace.file());
}

TEST_P(StepsOfCounter, LoseNothingOfAPageSet)
{
    static constexpr uint32_t records_each = 1500;
    const soak_trace trace(4, 8192);
    changed_counter = GetParam();
    in_threads(writers, [](uint32_t thread) {
        for (uint32_t number = 0; number < records_each; ++number) {
            wait_for_queue(2);
            ASSERT_EQ(write_numbered({1, thread}, number), 0);
        }
    });
    wait_for_queue(0);
    std::map<record_author, std::set<uint32_t>> found;
    for (const auto &page : trace.pages())
        for (const auto &[author, numbers] : numbers_in(page.image().ring()))
            found[author].insert(numbers.begin(), numbers.end());
    ASSERT_EQ(found.size(), writers);
    for (const auto &[author, numbers] : found) EXPECT_EQ(numbers.size(), records_each);
    expect_nothing_missing(trace.spool_folder());
}

std::string name_of(const testing::TestParamInfo<counter_change> &info)
{
    static constexpr const char *names[] = {"BackAndForth", "AlwaysBack", "Extremes", "StandsStill"};
    return names[info.index];
}

INSTANTIATE_TEST_SUITE_P(Kinds, StepsOfCounter, testing::Values(back_and_forth, always_back, extremes, stands_still),
                         name_of);

// Sets the clock of the wall again and again, as long as it lives: by hours, and by years.
class clock_that_jumps
{
public:
    clock_that_jumps()
        : thread_([this] {
              static constexpr int64_t hour = 3600;
              static constexpr int64_t years = 30 * 365 * 24 * hour;
              for (size_t jump = 0; !enough_; ++jump) {
                  clock_is_off = std::array{-2 * hour, hour, -years, 5 * hour, years, int64_t{0}}[jump % 6];
                  ++jumps_;
                  std::this_thread::yield();
              }
          })
    {
        while (jumps_ < 10) std::this_thread::yield();
    }
    clock_that_jumps(const clock_that_jumps &) = delete;
    clock_that_jumps &operator=(const clock_that_jumps &) = delete;
    ~clock_that_jumps()
    {
        enough_ = true;
        thread_.join();
        clock_is_off = 0;
        count(item, "faults", jumps_);
    }

private:
    std::atomic<bool> enough_{false};
    std::atomic<uint64_t> jumps_{0};
    std::thread thread_;
};

class JumpsOfClock : public testing::Test
{
protected:
    JumpsOfClock() { alarm(120); }
    ~JumpsOfClock() override { count(item, "rounds", 1); }
};

TEST_F(JumpsOfClock, LoseNothingOfAPageSetThatIsCopied)
{
    const uint32_t records_each = rounds(1500, 100000);
    const soak_trace trace(4, 8192);
    {
        const clock_that_jumps jumps;
        in_threads(writers, [=](uint32_t thread) {
            for (uint32_t number = 0; number < records_each; ++number) {
                wait_for_queue(2);
                ASSERT_EQ(write_numbered({1, thread}, number), 0);
            }
        });
        wait_for_queue(0);
    }
    std::map<record_author, std::vector<uint32_t>> found = numbers_in_pages(trace.pages());
    ASSERT_EQ(found.size(), writers);
    for (const auto &[author, numbers] : found) {
        ASSERT_EQ(numbers.size(), records_each);
        for (uint32_t number = 0; number < records_each; ++number) ASSERT_EQ(numbers[number], number);
    }
}

// Nobody answers the request: it is waited for, then dropped.
TEST_F(JumpsOfClock, LeaveTheWaitForAReaderAsItIs)
{
    const one_trace trace(4096);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 0xFFFFFFFF);
    {
        const clock_that_jumps jumps;
        EXPECT_EQ(tr_record_id_1("TEST", 1), 0);
    }
    EXPECT_EQ(reader.u32(tail_reader::tail_request), 0U);
    EXPECT_EQ(trace.only_record().u32(28), 1U);
}

// The thread is in its wait, which may be an hour long, while the clock jumps: it is woken for each page all the same.
TEST_F(JumpsOfClock, LeaveTheSpoolThreadAwakeForEachPage)
{
    const soak_trace trace(4, 8192);
    for (uint32_t page = 0; page < 10; ++page) {
        clock_is_off = page % 2 == 0 ? -7200 : 7200;
        const size_t before = copies_in(trace.spool_folder()).size();
        for (uint32_t number = 1000 * page; copies_in(trace.spool_folder()).size() == before; ++number) {
            wait_for_queue(0);
            ASSERT_EQ(write_numbered({1, 0}, number), 0);
        }
    }
}

TEST_F(JumpsOfClock, LeaveEveryRestartItsRecords)
{
    const uint32_t restarts = rounds(20, 500);
    const one_trace trace;
    const clock_that_jumps jumps;
    for (uint32_t number = 0; number < restarts; ++number) {
        ASSERT_EQ(write_numbered({1, 0}, number), 0);
        ASSERT_EQ(tr_set_filename_1(""), 0);
        ASSERT_EQ(tr_set_filename_1(trace.file().c_str()), 0);
    }
    const auto found = numbers_in(trace.image().ring())[{1, 0}];
    ASSERT_FALSE(found.empty());
    EXPECT_EQ(found.back(), restarts - 1);
    for (size_t i = 1; i < found.size(); ++i) ASSERT_EQ(found[i], found[i - 1] + 1);
}
} // namespace
