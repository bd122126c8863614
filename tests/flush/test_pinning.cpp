// Pinning: pages are touched, a word every 512 bytes. What is touched is seen in two ways: by the accumulator of the
// words read, which the log shows, and by the faults of a mapping that forbids access until each page was touched.
#include <csignal>

#include <gtest/gtest.h>
#include <sys/mman.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "components/page_set.h"
#include "support/scratch.h"
#include "support/system_log.h"

namespace
{
using namespace qn::test;

constexpr size_t memory_page = 4096;

volatile sig_atomic_t faults = 0;
volatile sig_atomic_t stop_at_fault = 0; // 0: never

void allow_access(int, siginfo_t *info, void *)
{
    faults = faults + 1;
    if (faults == stop_at_fault) global_stop_trace();
    const auto place = reinterpret_cast<uintptr_t>(info->si_addr) & ~(memory_page - 1);
    if (mprotect(reinterpret_cast<void *>(place), memory_page, PROT_READ) != 0) _Exit(99);
}

// Memory in place of a mapped trace file, with an anchor of its own.
class stand_in
{
public:
    stand_in(const char *name, size_t bytes)
        : bytes_(bytes), memory_(static_cast<unsigned char *>(mmap(nullptr, mapped_bytes(), PROT_READ | PROT_WRITE,
                                                                   MAP_PRIVATE | MAP_ANONYMOUS, -1, 0))),
          anchor_(findOrCreateAnchorForFile(name, 1))
    {
        anchor_->pMap = memory_;
        anchor_->pMapEnd = memory_ + bytes_;
        anchor_->uActualFileSize = static_cast<qn_uint32_t>(bytes_);
    }
    stand_in(const stand_in &) = delete;
    stand_in &operator=(const stand_in &) = delete;
    ~stand_in()
    {
        anchor_->pMap = nullptr;
        anchor_->pMapEnd = nullptr;
        anchor_->uActualFileSize = 0;
        munmap(memory_, mapped_bytes());
    }

    void store(size_t offset, qn_uint32_t word) { std::memcpy(memory_ + offset, &word, sizeof word); }

    // From now on the first access to each memory page is counted in `faults`.
    void watch()
    {
        struct sigaction action {
        };
        action.sa_sigaction = allow_access;
        action.sa_flags = SA_SIGINFO;
        sigaction(SIGSEGV, &action, nullptr);
        faults = 0;
        ASSERT_EQ(mprotect(memory_, mapped_bytes(), PROT_NONE), 0);
    }

private:
    size_t mapped_bytes() const { return (bytes_ + memory_page - 1) / memory_page * memory_page; }

    size_t bytes_;
    unsigned char *memory_;
    trace_anchor_t *anchor_;
};

class Pinning : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_EQ(tr_set_size_1(65536), 0); } // the library is initialised
};

// A word with a bit of its own at every 512th byte, and others where nothing is to be read.
TEST_F(Pinning, TouchesAWordEvery512Bytes)
{
    stand_in trace("/tmp/never.trc", 4096);
    for (qn_uint32_t i = 0; i < 8; ++i) {
        trace.store(i * 512, 1U << i);
        for (const size_t between : {4U, 128U, 256U, 508U}) trace.store(i * 512 + between, 0xFFFFFF00U);
    }
    global_debug_level = 8;
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_TRUE(system_log_has("\ttrace: memvar_to_visit=0xff\n"));
}

TEST_F(Pinning, EndsFourBytesBeforeTheEndOfTheMapping)
{
    stand_in trace("/tmp/never.trc", 1024 + 4);
    for (qn_uint32_t i = 0; i < 3; ++i) trace.store(i * 512, 1U << i);
    global_debug_level = 8;
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_TRUE(system_log_has("\ttrace: memvar_to_visit=0x3\n"));
}

TEST_F(Pinning, TouchesTheWordThatBeginsBeforeThat)
{
    stand_in trace("/tmp/never.trc", 1024 + 5);
    for (qn_uint32_t i = 0; i < 3; ++i) trace.store(i * 512, 1U << i);
    global_debug_level = 8;
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_TRUE(system_log_has("\ttrace: memvar_to_visit=0x7\n"));
}

TEST_F(Pinning, TouchesEveryMemoryPageOnceAndOnceMoreAtEachFlush)
{
    stand_in trace("/tmp/never.trc", 8 * memory_page);
    trace.watch();
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_EQ(faults, 8);
    for (int flush = 0; flush < 3; ++flush) {
        trace.watch();
        EXPECT_EQ(tr_flush_1(), 0);
        EXPECT_EQ(faults, 8);
    }
}

TEST_F(Pinning, TouchesNothingOnceItIsTakenBack)
{
    stand_in trace("/tmp/never.trc", 8 * memory_page);
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    trace.watch();
    EXPECT_EQ(tr_pin_pages_1(0), 0);
    EXPECT_EQ(tr_flush_1(), 0);
    EXPECT_EQ(faults, 0);
    EXPECT_EQ(memory_is_pinned, 0);
}

TEST_F(Pinning, TouchesNothingAtAFlushUnlessItIsOn)
{
    stand_in trace("/tmp/never.trc", 8 * memory_page);
    trace.watch();
    EXPECT_EQ(tr_flush_1(), 0);
    EXPECT_EQ(faults, 0);
}

TEST_F(Pinning, IsOnForEveryValueButZero)
{
    stand_in trace("/tmp/never.trc", memory_page);
    trace.watch();
    EXPECT_EQ(tr_pin_pages_1(-5), 0);
    EXPECT_EQ(faults, 1);
    EXPECT_NE(memory_is_pinned, 0);
}

TEST_F(Pinning, TouchesNothingOnceTracingIsStopped)
{
    stand_in trace("/tmp/never.trc", 8 * memory_page);
    global_stop_trace();
    trace.watch();
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_EQ(tr_flush_1(), 0);
    EXPECT_EQ(faults, 0);
    EXPECT_NE(memory_is_pinned, 0);
}

TEST_F(Pinning, EndsBetweenTracesWhenTracingIsStopped)
{
    stand_in older("/tmp/never1.trc", 2 * memory_page);
    stand_in newer("/tmp/never2.trc", 2 * memory_page);
    older.watch();
    newer.watch();
    stop_at_fault = 1;
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_EQ(faults, 2) << "the trace under way is touched to its end";
}

TEST_F(Pinning, ClearsTheErrorRecord)
{
    leave_marker();
    EXPECT_EQ(after(tr_pin_pages_1(1)), success());
}

TEST_F(Pinning, FailsWhenTheGlobalMutexCannotBeTaken)
{
    global_debug_level = 8;
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(tr_pin_pages_1(1));
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_TRUE(system_log_has("load_trace_pages_to_memory Leaving with rc=9\n"));
    EXPECT_TRUE(system_log_has("tr_pin_pages(1) Leaving rc=9\n"));
}

TEST_F(Pinning, SaysInTheLogWhatItDoes)
{
    stand_in trace("/tmp/never.trc", memory_page);
    global_debug_level = 8;
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    const auto lines = system_log();
    ASSERT_EQ(lines.size(), 6U);
    EXPECT_EQ(lines[0].text, "tr_pin_pages(1) Entered\n");
    EXPECT_EQ(lines[1].text, "load_trace_pages_to_memory Entered\n");
    EXPECT_EQ(lines[2].text, "\ttrace: Load all part of the pages to bring into memory (/tmp/never.trc)\n");
    EXPECT_EQ(lines[3].text, "\ttrace: memvar_to_visit=0x0\n");
    EXPECT_EQ(lines[4].text, "load_trace_pages_to_memory() Leaving, rc=0\n");
    EXPECT_EQ(lines[5].text, "tr_pin_pages(1) Leaving rc=0\n");
    for (size_t i = 0; i < lines.size(); ++i)
        EXPECT_EQ(lines[i].priority, i == 3 ? LOG_DEBUG : LOG_WARNING) << lines[i].text;

    clear_system_log();
    ASSERT_EQ(tr_pin_pages_1(0), 0);
    ASSERT_EQ(system_log().size(), 2U);
    EXPECT_TRUE(system_log_has("tr_pin_pages(0) Entered\n"));
    EXPECT_TRUE(system_log_has("tr_pin_pages(0) Leaving rc=0\n"));
}

TEST_F(Pinning, SaysNothingInTheLogBelowLevelEight)
{
    stand_in trace("/tmp/never.trc", memory_page);
    global_debug_level = 7;
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_TRUE(system_log().empty());
}

TEST_F(Pinning, TouchesEveryPageOfASetUnderTheNameOfItsTrace)
{
    const scratch files;
    make_page_set(files / "t", 3, 16384);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    global_debug_level = 8;
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    const std::string line = "\ttrace: Load all part of the pages to bring into memory (" + (files / "t.1.sp") + ")\n";
    int touched = 0;
    for (const log_line &each : system_log()) touched += each.text == line ? 1 : 0;
    EXPECT_EQ(touched, 3);
}

TEST_F(Pinning, TouchesATraceThatStartsWhileItIsOn)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    ASSERT_EQ(tr_pin_pages_1(1), 0);
    global_debug_level = 8;
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_TRUE(
        system_log_has("\ttrace: Load all part of the pages to bring into memory (" + (files / "a.trc") + ")\n"));
}

TEST(PinningAtStart, DoesNotInitialiseTheLibrary)
{
    stand_in trace("/tmp/never.trc", memory_page);
    trace.watch();
    EXPECT_EQ(tr_pin_pages_1(1), 0);
    EXPECT_EQ(anchors.bInitialized, 0);
    EXPECT_EQ(faults, 0);
    EXPECT_NE(memory_is_pinned, 0);
}
} // namespace
