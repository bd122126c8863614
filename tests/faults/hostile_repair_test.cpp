// What a hostile process can store at the worst moment, stored just then: what it costs, and what is put right again.
// The waits for a reader take no time here, and are counted.
#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstring>
#include <ctime>
#include <dlfcn.h>
#include <filesystem>
#include <functional>
#include <memory>
#include <sys/syscall.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "faults/program.h"
#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/sleeps.h"
#include "trace/trace.h"

namespace
{
std::function<void()> on_getpid;
std::atomic<int> moments{0};
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
// A start asks for its process id between the fresh ring and its first record.
pid_t getpid() noexcept
{
    if (on_getpid) on_getpid();
    return static_cast<pid_t>(syscall(SYS_getpid));
}

int pthread_cond_clockwait(pthread_cond_t *condition, pthread_mutex_t *mutex, clockid_t clock, const timespec *until)
{
    using real_call = int(pthread_cond_t *, pthread_mutex_t *, clockid_t, const timespec *);
    static auto *const real = reinterpret_cast<real_call *>(dlsym(RTLD_NEXT, "pthread_cond_clockwait"));
    if (clock == CLOCK_MONOTONIC) ++moments;
    return real(condition, mutex, clock, until);
}
}
#pragma GCC visibility pop

namespace
{
using namespace qn::test;

constexpr uint32_t small_file = 4096;
constexpr uint32_t ring_begins = 200;

// Header words, by their offsets.
constexpr size_t version = 2;
constexpr size_t ring_offset = 8;
constexpr size_t file_size = 20;
constexpr size_t page_state = 192;

class HostileWord : public testing::Test
{
protected:
    HostileWord() { alarm(most_seconds); }
    ~HostileWord() override
    {
        on_getpid = nullptr;
        count("Hostile words in the shared header", "rounds", 1);
        count("Hostile words in the shared header", "faults", 1);
    }

    void make_page_set()
    {
        with_page_set(folder.folder());
        ASSERT_EQ(name_it({}), 0);
        ASSERT_NE(anchors.nextPage, nullptr);
    }
    static void poke(trace_anchor_t *page, size_t at, uint32_t value)
    {
        std::memcpy(page->pMap + at, &value, sizeof value);
    }
    // Records until the page is left.
    static void fill(const trace_anchor_t *page)
    {
        while (anchors.pActivePg == page) ASSERT_EQ(write_ids(1, 1), 0);
    }

    const scratch folder{memory_folder()};
};

// A reader that lets go, or has its hold broken, and holds the next record at once.
TEST_F(HostileWord, OfAHoldCostsTwoSecondsForEachRecordThatIsOverwrittenAndNoMore)
{
    const one_trace trace(small_file);
    lay_out({{32, 1, 30}, {32, 1, 32}, {32, 1, 34}, {32, 1, 36}, {3768, 1, 38}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 30);
    on_sleep([&](int count) { reader.set_u32(tail_reader::seq_lock, 30 + 2 * (static_cast<uint32_t>(count) / 400)); });
    EXPECT_TRUE(allocate(100).given);
    EXPECT_EQ(sleeps().size(), 4U * 400);
}

TEST_F(HostileWord, OfNoHoldMakesNobodyWaitForARecordOfThatNumber)
{
    const one_trace trace(small_file);
    lay_out({{32, 1, 1}, {32, 1, 1}, {32, 1, 1}, {32, 1, 1}, {3768, 1, 38}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, qn::tr::format::seq_lock_none);
    EXPECT_TRUE(allocate(100).given);
    EXPECT_EQ(sleeps().size(), 0U);
}

TEST_F(HostileWord, InALengthLeadsNoWriterToTheLastBytesOfTheFile)
{
    const one_trace trace(small_file);
    lay_out({{3760, 1, 30}, {136, 1, 32}}, 1);
    poke_u32(3960, 128); // 8 bytes stay behind the last record
    standard_error_of([] { EXPECT_FALSE(allocate(100).given); });
    for (qn_uint32_t id = 1; id <= 300; ++id) ASSERT_EQ(tr_record_id_1("TEST", id), 0);
    EXPECT_FALSE(trace.written().empty());
}

TEST_F(HostileWord, OfARequestCostsHalfASecondForEachRecord)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    on_sleep([&](int) { reader.set_u32(tail_reader::tail_request, 0xFFFFFFFF); });
    reader.set_u32(tail_reader::tail_request, 0xFFFFFFFF);
    for (qn_uint32_t id = 1; id <= 3; ++id) {
        reader.set_u32(tail_reader::tail_request, 0xFFFFFFFF);
        EXPECT_EQ(tr_record_id_1("TEST", id), 0);
    }
    EXPECT_EQ(sleeps().size(), 3U * 20);
    EXPECT_EQ(trace.written().size(), 3U);
}

TEST_F(HostileWord, InTheLayoutIsPutRightWhenTheRingComesRound)
{
    const one_trace trace(small_file);
    poke_u16(0, 0);
    poke_u16(version, 9);
    poke_u32(ring_offset, 0xFFFFFFFC);
    poke_u32(file_size, 28);
    for (qn_uint32_t id = 1; id <= 300; ++id) ASSERT_EQ(tr_record_id_1("TEST", id), 0);
    EXPECT_EQ(trace.image().u8(0), 0xC0);
    EXPECT_EQ(trace.image().u16(version), 6);
    EXPECT_EQ(trace.image().ring_offset(), ring_begins);
    EXPECT_EQ(trace.image().file_size(), small_file);
    EXPECT_EQ(trace.written().back().u32(28), 300U);
}

class HostileRingOffset : public HostileWord, public testing::WithParamInterface<uint32_t>
{
};

TEST_P(HostileRingOffset, DoesNotMoveTheRingOfAPageThatIsWrittenAnew)
{
    make_page_set();
    trace_anchor_t *next = anchors.nextPage;
    poke(next, ring_offset, GetParam());
    fill(&anchors);
    ASSERT_EQ(anchors.pActivePg, next);
    const trace_image image = trace_image::of_file(next->fileName);
    EXPECT_EQ(image.ring_offset(), ring_begins);
    const auto ring = image.ring();
    ASSERT_EQ(ring.size(), 2U);
    EXPECT_EQ(ring.back().offset, ring_begins);
}

INSTANTIATE_TEST_SUITE_P(Values, HostileRingOffset,
                         testing::Values(0, 4, 204, 4096, program_file_bytes - 28, program_file_bytes,
                                         program_file_bytes + 4, 0x7FFFFFFC, 0xFFFFFFFC));

// With requests to wait in every page, a record that is longer than a page is let through everywhere and fits nowhere.
TEST_F(HostileWord, DoesNotSendARecordThatFitsNowhereRoundThePages)
{
    make_page_set();
    std::vector<std::unique_ptr<tail_reader>> readers;
    qn::tr::for_each_page(&anchors, [&](const trace_anchor_t *page) {
        readers.push_back(std::make_unique<tail_reader>(page->fileName));
    });
    const auto request_everywhere = [&](int) {
        for (const auto &reader : readers) reader->set_u32(tail_reader::tail_request, 1);
    };
    on_sleep(request_everywhere);
    request_everywhere(0);
    unsigned int length = program_file_bytes;
    const qn::tr::anchor_set_lock set(&anchors);
    EXPECT_EQ(allocate_space(&anchors, &length), nullptr);
    on_sleep(nullptr);
}

// The file cannot be put aside, so that the fresh ring is in the file that the other process has mapped.
TEST_F(HostileWord, InTheFirstRecordOfAFreshRingCostsOneRecord)
{
    const one_trace trace(small_file);
    std::filesystem::create_directory(trace.file() + ".save");
    on_getpid = [] {
        if (anchors.pMap != nullptr) poke_u32(ring_begins, 0);
    };
    poke_u32(ring_begins, 0);
    anchors.pNextFree = anchors.pWrap;
    const std::string said = standard_error_of([] { EXPECT_EQ(tr_record_id_1("TEST", 1), 0); });
    on_getpid = nullptr;
    EXPECT_NE(said.find("allocate_space allocation loop (32)"), std::string::npos) << said;
    EXPECT_EQ(std::count(said.begin(), said.end(), '\n'), 4) << "one start for one record\n" << said;

    standard_error_of([] { EXPECT_EQ(tr_record_id_1("TEST", 2), 0); });
    EXPECT_EQ(tr_record_id_1("TEST", 3), 0);
    EXPECT_EQ(trace.only_record().u32(28), 3U);
}

// A state that no writer gives a page while it waits for its copy. The thread looks again, and sleeps in between.
TEST_F(HostileWord, InAQueuedPagesStateMakesNoThreadSpin)
{
    make_page_set();
    tail_reader other_process(anchors.nextPage->fileName);
    other_process.set_u32(page_state, 0xFF);
    spool_enqueue(nullptr, nullptr, anchors.nextPage, &spq, 0);
    while (moments < 20) sched_yield();
    {
        const qn::tr::mutex_lock queue(spq.mutex);
        EXPECT_EQ(spq.cnt, 1);
    }
    other_process.set_u32(page_state, 2);
    wait_for_queue();
    EXPECT_EQ(other_process.u32(page_state), 4U);
}
} // namespace
