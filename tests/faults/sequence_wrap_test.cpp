// Sequence numbers are words of 32 bits. A trace that has written two thousand million records goes on at 0: nothing is
// lost by that, nothing is out of order, and nobody reports what did not happen.
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
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr uint32_t writers = 4;
constexpr uint32_t records_each = 60; // fit into the ring, all together
constexpr uint32_t filler = 4095;
constexpr uint32_t records_to_the_end = 1015; // of 32 bytes, in the first lap

class SequenceWrap : public testing::Test
{
protected:
    ~SequenceWrap() override { count("Sequence numbers across 2^32", "rounds", 1); }

    // Runs the body in a process of its own that continues the trace, as the same program does.
    void in_process(const std::function<void()> &body) const
    {
        const pid_t child = fork();
        if (child == 0) {
            alarm(60);
            setenv("QN_TR_SIZE", "32768", 1);
            body();
            std::exit(HasFailure() ? 1 : 0);
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_EQ(status, 0);
    }

    void start() const
    {
        small_files(folder.folder());
        setenv("QN_TR_SIZE", "32768", 1);
        ASSERT_EQ(component().register_now(), 0);
        ASSERT_EQ(name_it({}), 0);
    }

    // As if so many records had been written that the start record, the only one in this page, has this number.
    static void go_on_behind(uint32_t sequence)
    {
        trace_anchor_t *page = anchors.pActivePg != nullptr ? anchors.pActivePg : &anchors;
        page->seqNumber = sequence;
        qn::tr::record_at(page, 200)->seqNumber = sequence;
    }

    // Every author's next `records` numbers, from `first` on.
    static void write_from_all_threads(uint32_t first, uint32_t records)
    {
        std::vector<std::thread> threads;
        for (uint32_t thread = 0; thread < writers; ++thread)
            threads.emplace_back([=] {
                for (uint32_t number = first; number < first + records; ++number)
                    EXPECT_EQ(write_numbered({1, thread}, number), 0);
            });
        for (std::thread &thread : threads) thread.join();
    }

    std::string file() const { return folder / "app.trc"; }

    // Each number follows the one before it, around the whole ring.
    static void expect_consecutive(const trace_image &image)
    {
        std::optional<uint32_t> last;
        for (const record_image &record : image.ring()) {
            if (record.sequence() == filler) continue;
            if (last) {
                ASSERT_EQ(record.sequence(), *last + 2) << "at " << record.offset;
            }
            last = record.sequence();
        }
    }
    void expect_numbers(uint32_t upto) const
    {
        const auto numbers = numbers_in(trace_image::of_file(file()).ring());
        EXPECT_FALSE(numbers.empty());
        for (const auto &[author, found] : numbers) {
            EXPECT_EQ(found.back(), upto - 1);
            for (size_t i = 1; i < found.size(); ++i) ASSERT_EQ(found[i], found[i - 1] + 1);
        }
    }
    static void expect_nothing_reported(const std::string &name)
    {
        for (const char *command : {"check", "stats", "merge"}) {
            const outcome told = run_qntrace({command, name});
            EXPECT_EQ(told.status, 0) << command << "\n" << told.out << told.err;
            EXPECT_EQ((told.out + told.err).find("missing"), std::string::npos) << told.out << told.err;
        }
    }

    const scratch folder{memory_folder()};
};

class SequenceWrapAt : public SequenceWrap, public testing::WithParamInterface<uint32_t>
{
};

// The parameter is the last number before the threads begin.
TEST_P(SequenceWrapAt, OfSeveralThreadsLosesNothingAndReportsNothing)
{
    in_process([this] {
        start();
        go_on_behind(GetParam());
        write_from_all_threads(0, records_each);
    });
    expect_consecutive(trace_image::of_file(file()));
    expect_numbers(records_each);
    EXPECT_EQ(trace_image::of_file(file()).records().size(), writers * records_each + 1) << "and a start record";
    expect_nothing_reported(file());

    // The next process, and one lap later the one behind that.
    in_process([this] {
        start();
        write_from_all_threads(records_each, 10 * records_each);
    });
    expect_consecutive(trace_image::of_file(file()));
    expect_numbers(11 * records_each);
    expect_nothing_reported(file());
}

INSTANTIATE_TEST_SUITE_P(LastNumbers, SequenceWrapAt,
                         testing::Values(0xFFFFFFFE - 2 * writers * records_each, 0xFFFFFFFE - 100, 0xFFFFFFFC,
                                         0xFFFFFFFE));

// The number 0 goes to the filler that closes the end of the file, or to a record beside it.
TEST_F(SequenceWrap, AtTheEndOfTheFileReportsNothing)
{
    bool went_to_the_filler = false;
    for (uint32_t more = 0; more < 5; ++more) {
        in_process([=, this] {
            start();
            go_on_behind(0xFFFFFFFE - 2 * (records_to_the_end - 3 + more));
            ASSERT_EQ(write_ids(1, records_to_the_end + 10), 0);
        });
        const trace_image image = trace_image::of_file(file());
        expect_consecutive(image);
        for (const record_image &record : image.ring())
            went_to_the_filler |= record.function() == 0 && record.sequence() == 0;
        expect_nothing_reported(file());
        std::filesystem::remove(file());
    }
    EXPECT_TRUE(went_to_the_filler);
}

// The follower makes the writer wait, so it misses nothing; the filler that it passes may be the one with the number 0.
TEST_F(SequenceWrap, UnderAFollowerReportsNothing)
{
    for (uint32_t more = 0; more < 4; ++more) {
        int prepared[2];
        ASSERT_EQ(pipe(prepared), 0);
        const pid_t child = fork();
        if (child == 0) {
            alarm(60);
            start();
            go_on_behind(0xFFFFFFFE - 2 * (records_to_the_end - 3 + more));
            close(prepared[1]);
            while (qn::tr::load_relaxed(qn::tr::header_of(&anchors)->uSeqLock) == 1) sched_yield();
            _exit(write_ids(1, 2 * records_to_the_end));
        }
        close(prepared[1]);
        char nothing = 0;
        ASSERT_EQ(read(prepared[0], &nothing, 1), 0);
        close(prepared[0]);
        const outcome told = run_qntrace({"follow", "--coordinate", "--until-exit", "--comp", "COMP", file()});
        waitpid(child, nullptr, 0);
        EXPECT_EQ(told.status, 0) << told.err;
        EXPECT_EQ((told.out + told.err).find("lost"), std::string::npos) << told.err;
        EXPECT_NE(told.out.find("id=" + std::to_string(2 * records_to_the_end) + "\n"), std::string::npos);
        std::filesystem::remove(file());
    }
}

// A start finds the last number, which is 0 or stands just before it.
TEST_F(SequenceWrap, BetweenTwoProcessesIsNone)
{
    for (const uint32_t last : {0xFFFFFFFAU, 0xFFFFFFFCU, 0xFFFFFFFEU}) {
        in_process([=, this] {
            start();
            go_on_behind(last - 2);
            ASSERT_EQ(write_numbered({1, 0}, 1), 0);
        });
        in_process([this] {
            start();
            ASSERT_EQ(write_numbered({1, 0}, 2), 0);
        });
        const auto records = trace_image::of_file(file()).records();
        ASSERT_GE(records.size(), 3U);
        EXPECT_EQ(records.back().sequence(), last + 4) << "its start record comes between";
    }
}

// The pages count on their own. A page that is copied in the middle of it is as good as any other.
TEST_F(SequenceWrap, InAPageAndItsCopyReportsNothing)
{
    const auto copies = folder / "spool";
    in_process([this] {
        with_page_set(folder.folder());
        ASSERT_EQ(name_it({}), 0);
        for (uint32_t round = 0; round < 6; ++round) {
            const trace_anchor_t *page = anchors.pActivePg;
            if (round == 0) go_on_behind(0xFFFFFFFE - 20);
            for (uint32_t number = round * 1000; anchors.pActivePg == page; ++number)
                ASSERT_EQ(write_numbered({1, 0}, number), 0);
            wait_for_queue();
        }
    });
    expect_nothing_reported(copies);
    expect_nothing_reported(folder / "app.trc");
}

// A writer waits for the record that has the number 0, held by a reader, as for any other.
TEST_F(SequenceWrap, LeavesNoRecordThatCannotBeHeld)
{
    start();
    go_on_behind(0xFFFFFFFE);
    ASSERT_EQ(write_numbered({1, 0}, 0), 0);
    const auto records = trace_image::of_file(file()).records();
    EXPECT_EQ(records.back().sequence(), 0U);
    EXPECT_EQ(trace_image::of_file(file()).seq_lock(), 1U) << "1 is no record's number";
}
} // namespace
