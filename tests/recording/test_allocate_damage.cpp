// What the allocator does when the ring is not sound: clips what can be clipped, else starts afresh; and what it says.
#include <cstdarg>
#include <cstdio>
#include <ctime>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "support/system_log.h"

using namespace qn::test;
using qn::tr::store_relaxed;

namespace
{
constexpr uint32_t small_file = 4096;

std::string printed(const char *format, ...)
{
    char text[512];
    va_list args;
    va_start(args, format);
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    vsnprintf(text, sizeof text, format, args);
#pragma GCC diagnostic pop
    va_end(args);
    return text;
}

// The ring of a file that was started afresh: its start record, and nothing else.
void expect_fresh(const one_trace &trace)
{
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 2U);
    EXPECT_EQ(ring[0].function(), 0);
    EXPECT_EQ(ring[1].function(), 16);
    EXPECT_EQ(ring[1].offset, 200U);
    EXPECT_EQ(ring[1].sequence(), 2U);
}

// Puts other sizes beside the trace's file, less than a memory page.
void pretend_sizes(uint32_t requested, uint32_t actual)
{
    anchors.uRequestedFileSize = requested;
    anchors.uActualFileSize = actual;
}

// Asks for a record on a ring that cannot give one, and expects the complaint and a fresh file.
void expect_given_up(const one_trace &trace, uint32_t length, const std::string &complaint)
{
    const std::string before = trace.image().bytes();
    const time_t from = time(nullptr);
    bool given = true;
    const std::string said = standard_error_of([&] { given = allocate(length).given; });
    EXPECT_FALSE(given);

    // The line of ctime(), with its newline, comes first.
    bool right = false;
    for (time_t when = from; when <= time(nullptr); ++when) right |= said == ctime(&when) + ("0:" + complaint);
    EXPECT_TRUE(right) << said;
    expect_fresh(trace);
    EXPECT_EQ(file_bytes(trace.file() + ".save").substr(200, 1000), before.substr(200, 1000));
}
} // namespace

TEST(DamagedRing, HasALengthPastTheEndClipped)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 104);
    EXPECT_EQ(standard_error_of([] { EXPECT_EQ(allocate(32).offset, 3996U); }), "");
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 3U);
    EXPECT_EQ(ring[0].offset, 4028U);
    EXPECT_EQ(ring[0].length(), 68U);
}

TEST(DamagedRing, HasAHugeLengthClipped)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 0xFFFFFFFC);
    EXPECT_EQ(allocate(72).length, 100U);
    trace.image().ring();
}

TEST(DamagedRing, SaysWhatItClips)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 104);
    store_relaxed(global_debug_level, 8);
    clear_system_log();
    allocate(32);
    const unsigned char *record = anchors.pMap + 3996;
    const std::string line =
        printed("Bad length: len: 0x%X (%u), pNextRec: %p (%u), pMapEnd: %p (%u)\n", 104U, 104U, record,
                static_cast<unsigned>(reinterpret_cast<uintptr_t>(record)), anchors.pMapEnd,
                static_cast<unsigned>(reinterpret_cast<uintptr_t>(anchors.pMapEnd)));
    ASSERT_TRUE(system_log_has(line));
    for (const log_line &logged : system_log()) EXPECT_EQ(logged.priority, LOG_WARNING);
}

TEST(DamagedRing, IsClippedInSilenceAtDebugLevel7)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 104);
    store_relaxed(global_debug_level, 7);
    clear_system_log();
    allocate(32);
    EXPECT_TRUE(system_log().empty());
}

TEST(OddLength, IsNotedAndGranted)
{
    const one_trace trace(small_file);
    store_relaxed(global_debug_level, 8);
    clear_system_log();
    const allocated record = allocate(33);
    EXPECT_EQ(record.length, 33U);
    ASSERT_EQ(system_log().size(), 1U);
    EXPECT_EQ(system_log()[0].text, "Odd length requested: 33\n");
    EXPECT_EQ(system_log()[0].priority, LOG_WARNING);
}

TEST(OddLength, IsGrantedInSilenceAtDebugLevel7)
{
    const one_trace trace(small_file);
    store_relaxed(global_debug_level, 7);
    clear_system_log();
    EXPECT_TRUE(allocate(33).given);
    EXPECT_TRUE(system_log().empty());
}

TEST(OddLength, IsWhatIsNotedAndNotAMultipleOfTwo)
{
    const one_trace trace(small_file);
    store_relaxed(global_debug_level, 8);
    clear_system_log();
    EXPECT_TRUE(allocate(34).given);
    EXPECT_TRUE(system_log().empty());
}

TEST(DamagedRing, WithARecordOfNoLengthIsGivenUp)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 0);
    expect_given_up(trace, 32, "opal_trace: allocate_space allocation loop (32)\n");
}

TEST(DamagedRing, NamesTheRequestThatLoopedInItsComplaint)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 0);
    expect_given_up(trace, 1948, "opal_trace: allocate_space allocation loop (1948)\n");
}

TEST(DamagedRing, ThatEndsTwiceForOneRequestIsGivenUp)
{
    const one_trace trace(small_file);
    lay_out({{2000}, {1896}}, 1);
    anchors.uMaxSize = 3896;
    expect_given_up(trace, 3896, "opal_trace: allocate_space allocation loop overwrap\n");
}

TEST(DamagedRing, WithNoRoomForAHeaderBeforeTheEndIsGivenUp)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 76); // the next record would have 24 bytes
    expect_given_up(trace, 64, "opal_trace: allocate_space overrun one\n");
}

TEST(DamagedRing, IsUsedWhenAHeaderJustFitsBeforeTheEnd)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {72}, {28}}, 1);
    const allocated record = allocate(72);
    EXPECT_EQ(record.offset, 3996U);
    EXPECT_EQ(record.length, 100U);
}

TEST(AllocationLoop, LooksAtOneRecordFor28BytesOfTheFileAndOneMore)
{
    const one_trace trace(small_file);
    lay_out({{32}, {32}, {32}, {32}, {32}, {3736}}, 0);
    pretend_sizes(28, 28 * 3);
    EXPECT_EQ(allocate(100).length, 128U); // four records
}

TEST(AllocationLoop, GoesByTheRequestedSizeOfAFileThatGotLess)
{
    const one_trace trace(small_file);
    lay_out({{32}, {32}, {32}, {32}, {32}, {3736}}, 0);
    pretend_sizes(28 * 3, 28);
    EXPECT_EQ(allocate(100).length, 128U);
}

// A file that exists keeps its size, however little is requested later.
TEST(AllocationLoop, LetsARecordTakeThePlaceOfAnyNumberInAFileLargerThanRequested)
{
    const one_trace trace(small_file);
    const tr_file_token_t token = start_another(trace.folder() / "other.trc", 65536);
    EXPECT_EQ(qn::tr::stop_trace_locked(token), 0);
    token->uRequestedFileSize = small_file;
    EXPECT_EQ(qn::tr::start_trace_locked(token), 0);
    ASSERT_EQ(token->uActualFileSize, 65536U);
    for (qn_uint32_t id = 1; id <= 3000; ++id) ASSERT_EQ(tr_ms_record_id_1("TEST", id, token), 0);

    const std::vector<char> block(16 * small_file / 4); // over 500 records, and no more than 147 fit into small_file
    const std::string said = standard_error_of(
        [&] { EXPECT_EQ(tr_ms_record_data_1("TEST", 1, token, 1, block.data(), static_cast<int>(block.size())), 0); });
    EXPECT_EQ(said, "");
    const auto records = trace_image::of_file(trace.folder() / "other.trc").records();
    EXPECT_GT(records.size(), 1000U);
    EXPECT_EQ(records.back().function(), 3);
}

TEST(AllocationLoop, EndsWhenARequestTakesMoreRecords)
{
    const one_trace trace(small_file);
    lay_out({{32}, {32}, {32}, {32}, {32}, {3736}}, 0);
    pretend_sizes(28, 28 * 3);
    bool given = true;
    const std::string said = standard_error_of([&] { given = allocate(104).given; });
    EXPECT_FALSE(given);
    EXPECT_NE(said.find("0:opal_trace: allocate_space allocation loop (104)\n"), std::string::npos) << said;
    expect_fresh(trace);
}

TEST(DamagedRing, CostsAWriterItsRecordAndNoMore)
{
    const one_trace trace(small_file);
    lay_out({{3796}, {100}}, 1);
    poke_u32(3996, 0);
    standard_error_of([] { EXPECT_EQ(tr_record_id_1("TEST", 1), 0); });
    EXPECT_TRUE(trace.written().empty());
    EXPECT_EQ(tr_record_id_1("TEST", 2), 0);
    EXPECT_EQ(trace.only_record().u32(28), 2U);
}

TEST(DamagedRing, IsReportedWithTheTimeAndTheOption)
{
    const time_t from = time(nullptr);
    const std::string said = standard_error_of([] { log_trc_error("Hello\n", '0'); });
    bool right = false;
    for (time_t when = from; when <= time(nullptr); ++when) right |= said == ctime(&when) + std::string("0:Hello\n");
    EXPECT_TRUE(right) << said;
}
