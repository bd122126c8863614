// Giving out space in a ring: how many records are consumed for a request, and what is left behind the new record.
#include <pthread.h>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "support/system_log.h"

using namespace qn::test;
using qn::tr::store_relaxed;

namespace
{
constexpr uint32_t small_file = 4096; // a ring of 3896 bytes, whose longest record has 1948

uint64_t counter_now()
{
    qn_uint64_t now = 0;
    cu_get_ctr_1(&now);
    return now;
}
} // namespace

TEST(Allocate, GivesNothingWithoutAnAnchor)
{
    unsigned int length = 32;
    EXPECT_EQ(allocate_space_page(nullptr, &length), nullptr);
    EXPECT_EQ(length, 32U);
}

TEST(Allocate, GivesNothingWithoutAMapping)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    unsigned int length = 32;
    EXPECT_EQ(allocate_space_page(&anchors, &length), nullptr);
    EXPECT_EQ(length, 32U);
    EXPECT_EQ(allocate_space(&anchors, &length), nullptr);
}

TEST(Allocate, SplitsTheFreeRecord)
{
    const one_trace trace(small_file);
    EXPECT_EQ(allocate(32).offset, 252U);
    const auto ring = trace.image().ring();
    // The oldest record comes first: the free rest, then the ring from its start.
    ASSERT_EQ(ring.size(), 3U);
    EXPECT_EQ(ring[0].offset, 284U);
    EXPECT_EQ(ring[0].length(), 4096U - 284);
    EXPECT_EQ(ring[0].function(), 0);
    EXPECT_EQ(ring[0].sequence(), 4095U);
    EXPECT_EQ(ring[2].offset, 252U);
    EXPECT_EQ(ring[2].length(), 32U);
}

TEST(Allocate, HandsTheRecordOverAsBeingWritten)
{
    const one_trace trace(small_file);
    allocate(32);
    EXPECT_EQ(trace.image().ring().back().function(), 0xFFFF);
}

TEST(Allocate, NumbersRecordsInStepsOfTwo)
{
    const one_trace trace(small_file);
    allocate(32);
    allocate(36);
    allocate(40);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 5U);
    EXPECT_EQ(ring[1].sequence(), 2U); // the start record
    EXPECT_EQ(ring[2].sequence(), 4U);
    EXPECT_EQ(ring[3].sequence(), 6U);
    EXPECT_EQ(ring[4].sequence(), 8U);
    EXPECT_EQ(anchors.seqNumber, 8U);
}

TEST(Allocate, StampsThreadAndTime)
{
    const one_trace trace(small_file);
    const uint64_t before = counter_now();
    allocate(32);
    const uint64_t after = counter_now();
    const record_image record = trace.image().ring().back();
    EXPECT_EQ(record.thread(), static_cast<uint32_t>(pthread_self()));
    EXPECT_GE(record.time_stamp(), before);
    EXPECT_LE(record.time_stamp(), after);
}

TEST(Allocate, LeavesTheReservedWordAlone)
{
    const one_trace trace(small_file);
    lay_out({{3896}}, 0);
    allocate(32);
    EXPECT_EQ(trace.image().ring().back().u16(6), 0xABAB);
}

TEST(Allocate, NamesTheFreePointerAsTheOldestRecord)
{
    const one_trace trace(small_file);
    allocate(44);
    EXPECT_EQ(trace.image().oldest_offset(), 252U + 44);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchors.pNextFree) - anchors.pMap, 252 + 44);
}

TEST(Allocate, LeavesTheLengthArgumentAlone)
{
    const one_trace trace(small_file);
    lay_out({{60}, {3836}}, 0);
    EXPECT_EQ(allocate(32).asked_for, 32U);
}

TEST(Allocate, DoesNotRoundTheLength)
{
    const one_trace trace(small_file);
    EXPECT_EQ(allocate(34).length, 34U);
    EXPECT_EQ(trace.image().oldest_offset(), 252U + 34);
}

TEST(Allocate, GivesTheLongestRecord)
{
    const one_trace trace(small_file);
    EXPECT_EQ(anchors.uMaxSize, 1948U);
    const allocated record = allocate(1948);
    ASSERT_TRUE(record.given);
    EXPECT_EQ(record.length, 1948U);
}

TEST(Allocate, RefusesAByteMoreInSilence)
{
    const one_trace trace(small_file);
    const std::string before = trace.image().bytes();
    store_relaxed(global_debug_level, 8);
    clear_system_log();
    bool given = true;
    EXPECT_EQ(standard_error_of([&] { given = allocate(1949).given; }), "");
    EXPECT_FALSE(given);
    EXPECT_TRUE(system_log().empty());
    EXPECT_EQ(trace.image().bytes(), before);
}

TEST(Allocate, KeepsASpanOf28BytesMoreWhole)
{
    const one_trace trace(small_file);
    lay_out({{100}, {60}, {48}, {3688}}, 1);
    const allocated record = allocate(32);
    EXPECT_EQ(record.offset, 300U);
    EXPECT_EQ(record.length, 60U);
    const trace_image image = trace.image();
    EXPECT_EQ(image.oldest_offset(), 360U);
    const auto ring = image.ring();
    ASSERT_EQ(ring.size(), 4U);
    EXPECT_EQ(ring[0].length(), 48U); // nothing was split off, nothing else consumed
    EXPECT_EQ(ring[0].function(), 1);
    EXPECT_EQ(ring[3].sequence(), 1002U);
}

TEST(Allocate, SplitsASpanOf32BytesMore)
{
    const one_trace trace(small_file);
    lay_out({{64}, {3832}}, 0);
    EXPECT_EQ(allocate(32).length, 32U);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 3U);
    EXPECT_EQ(ring[0].offset, 232U);
    EXPECT_EQ(ring[0].length(), 32U);
    EXPECT_EQ(ring[0].function(), 0);
    EXPECT_EQ(ring[0].sequence(), 4095U);
}

TEST(Allocate, ConsumesTheNextRecordWhenTheSpanFallsShort)
{
    const one_trace trace(small_file);
    lay_out({{56}, {40}, {3800}}, 0); // 4 bytes short of room for a rest's header
    EXPECT_EQ(allocate(32).length, 32U);
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 3U);
    EXPECT_EQ(ring[0].offset, 232U);
    EXPECT_EQ(ring[0].length(), 56U + 40 - 32);
    EXPECT_EQ(ring[1].length(), 3800U);
}

TEST(Allocate, ConsumesAsManyRecordsAsItTakes)
{
    const one_trace trace(small_file);
    lay_out({{32}, {32}, {32}, {32}, {32}, {3736}}, 1);
    EXPECT_EQ(allocate(68).length, 96U); // three of them: exactly 28 more
    const auto ring = trace.image().ring();
    ASSERT_EQ(ring.size(), 4U);
    EXPECT_EQ(ring[0].offset, 328U);
    EXPECT_EQ(ring[0].length(), 32U);
    EXPECT_EQ(ring[3].offset, 232U);
}

TEST(Allocate, GoesBackToTheStartBehindASpanThatEndsWithTheFile)
{
    const one_trace trace(small_file);
    lay_out({{3836}, {60}}, 1);
    const allocated record = allocate(32);
    EXPECT_EQ(record.offset, 4036U);
    EXPECT_EQ(record.length, 60U);
    EXPECT_EQ(trace.image().oldest_offset(), 200U);
    EXPECT_EQ(anchors.pNextFree, anchors.pWrap);
    EXPECT_EQ(anchors.seqNumber, 1002U); // no filler, no wrap
}

TEST(Allocate, KeepsARestAtTheVeryEndOfTheFile)
{
    const one_trace trace(small_file);
    lay_out({{3832}, {64}}, 1);
    EXPECT_EQ(allocate(32).length, 32U);
    const auto ring = trace.image().ring();
    EXPECT_EQ(ring[0].offset, 4064U);
    EXPECT_EQ(ring[0].length(), 32U);
}

TEST(Allocate, UsesTheActivePageWhileSpoolingIsOn)
{
    const one_trace trace(small_file);
    const tr_file_token_t page = start_another(trace.folder() / "page.trc", small_file);
    trace_spool_spec_t spool{};
    spool.onoff = 1;
    spool.pages = 2;
    anchors.spool = &spool;
    anchors.pActivePg = page;
    anchors.ppActivePg = &anchors.pActivePg;

    unsigned int length = 32;
    const auto *record = reinterpret_cast<unsigned char *>(allocate_space(&anchors, &length));
    EXPECT_TRUE(record >= page->pMap && record < page->pMapEnd);

    spool.onoff = 0;
    record = reinterpret_cast<unsigned char *>(allocate_space(&anchors, &length));
    EXPECT_TRUE(record >= anchors.pMap && record < anchors.pMapEnd);
    anchors.spool = nullptr;
}
