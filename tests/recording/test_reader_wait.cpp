// Waiting for a reader of the file: what is waited for, how long, and what becomes of the reader's words.
#include <algorithm>

#include <gtest/gtest.h>

#include "recording/one_trace.h"
#include "recording/ring_layout.h"
#include "recording/sleeps.h"

using namespace qn::test;

namespace
{
constexpr uint32_t small_file = 4096; // its longest record has 1948 bytes
constexpr uint32_t longest = 1948;
constexpr uint32_t whole_ring = 3896;

bool all_are(const std::vector<unsigned> &values, unsigned value)
{
    return std::all_of(values.begin(), values.end(), [=](unsigned one) { return one == value; });
}
} // namespace

TEST(WaitTail, LooksAgainEvery5Milliseconds)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 8);
    on_sleep([&](int count) {
        if (count == 3) reader.set_u32(tail_reader::seq_lock, 1);
    });
    wait_tail(&anchors, 8);
    EXPECT_EQ(sleeps(), std::vector<unsigned>(3, 5000));
}

TEST(WaitTail, SleepsBeforeItLooksFirst)
{
    const one_trace trace(small_file);
    wait_tail(&anchors, 8); // nobody holds 8
    EXPECT_EQ(sleeps(), std::vector<unsigned>(1, 5000));
}

TEST(WaitTail, EndsWhenTheReaderGoesOnToAnotherRecord)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 8);
    on_sleep([&](int) { reader.set_u32(tail_reader::seq_lock, 10); });
    wait_tail(&anchors, 8);
    EXPECT_EQ(sleeps().size(), 1U);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 10U);
}

TEST(WaitTail, BreaksTheLockAfter400Sleeps)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 8);
    uint32_t lock_at_the_last = 0;
    on_sleep([&](int) { lock_at_the_last = reader.u32(tail_reader::seq_lock); });
    wait_tail(&anchors, 8);
    EXPECT_EQ(sleeps().size(), 400U);
    EXPECT_TRUE(all_are(sleeps(), 5000));
    EXPECT_EQ(lock_at_the_last, 8U);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 1U);
}

TEST(WaitTail, LeavesTheLockToAReaderThatLetsGoInTheLastSleep)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 8);
    on_sleep([&](int count) {
        if (count == 400) reader.set_u32(tail_reader::seq_lock, 20);
    });
    wait_tail(&anchors, 8);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 20U);
}

TEST(HeldRecord, IsOverwrittenOnlyWhenTheReaderHasLetGo)
{
    const one_trace trace(small_file);
    lay_out({{64, 1, 30}, {3832, 1, 32}}, 0);
    const std::string before = trace.image().bytes();
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 30);
    on_sleep([&](int count) {
        if (count < 5) return;
        reader.set_u32(tail_reader::seq_lock, 1);
        EXPECT_EQ(trace.image().bytes(), before);
    });
    EXPECT_TRUE(allocate(32).given);
    EXPECT_EQ(sleeps(), std::vector<unsigned>(5, 5000));
}

TEST(HeldRecord, IsWaitedForWhereverItStandsInTheSpan)
{
    const one_trace trace(small_file);
    lay_out({{32, 1, 30}, {32, 1, 32}, {3832, 1, 34}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 34);
    on_sleep([&](int) { reader.set_u32(tail_reader::seq_lock, 1); });
    EXPECT_TRUE(allocate(40).given);
    EXPECT_EQ(sleeps().size(), 1U);
}

TEST(HeldRecord, HoldsNobodyUpElsewhereInTheRing)
{
    const one_trace trace(small_file);
    lay_out({{64, 1, 30}, {64, 1, 32}, {3768, 1, 34}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 32);
    EXPECT_TRUE(allocate(32).given);
    EXPECT_TRUE(sleeps().empty());
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 32U);
}

TEST(HeldRecord, IsLostToTheReaderAfter2Seconds)
{
    const one_trace trace(small_file);
    lay_out({{64, 1, 30}, {3832, 1, 32}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 30);
    EXPECT_TRUE(allocate(32).given);
    EXPECT_EQ(sleeps().size(), 400U);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 1U);
}

TEST(HeldRecord, HoldsAWriterUpToo)
{
    const one_trace trace(small_file);
    lay_out({{64, 1, 30}, {3832, 1, 32}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 30);
    on_sleep([&](int count) {
        if (count == 2) reader.set_u32(tail_reader::seq_lock, 1);
    });
    EXPECT_EQ(tr_record_id_1("TEST", 5), 0);
    EXPECT_EQ(sleeps().size(), 2U);
}

TEST(HeldRecord, HoldsAWriterUpWhereverItStandsInTheSpan)
{
    const one_trace trace(small_file);
    lay_out({{32, 1, 30}, {36, 1, 32}, {3828, 1, 34}}, 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 32);
    on_sleep([&](int) { reader.set_u32(tail_reader::seq_lock, 1); });
    EXPECT_EQ(tr_record_id_1("TEST", 5), 0);
    EXPECT_EQ(sleeps().size(), 1U);
    EXPECT_EQ(trace.image().ring().back().u32(28), 5U);
}

TEST(Coordination, RaisesTheFlagWhileItWaits)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    std::vector<unsigned> flags;
    on_sleep([&](int count) {
        flags.push_back(reader.u16(tail_reader::flags));
        if (count == 3) reader.set_u32(tail_reader::tail_request, 0);
    });
    EXPECT_EQ(do_coordination(&anchors), 0);
    EXPECT_EQ(sleeps(), std::vector<unsigned>(3, 25000));
    EXPECT_EQ(flags, std::vector<unsigned>(3, 0x8000));
    EXPECT_EQ(reader.u16(tail_reader::flags), 0);
}

TEST(Coordination, SetsTheFlagsAsAWhole)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    poke_u16(tail_reader::flags, 0x0001);
    reader.set_u32(tail_reader::tail_request, 1);
    unsigned flags = 0;
    on_sleep([&](int) { flags = reader.u16(tail_reader::flags); });
    do_coordination(&anchors);
    EXPECT_EQ(flags, 0x8000U);
}

TEST(Coordination, LeavesTheSeqLockToAReaderThatAnswers)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 44);
    reader.set_u32(tail_reader::tail_request, 1);
    on_sleep([&](int) { reader.set_u32(tail_reader::tail_request, 0); });
    do_coordination(&anchors);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 44U);
}

TEST(Coordination, TakesNotice20SleepsLong)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 3);
    reader.set_u32(tail_reader::seq_lock, 44);
    on_sleep([&](int) { EXPECT_EQ(reader.u32(tail_reader::tail_request), 3U); });
    EXPECT_EQ(do_coordination(&anchors), 0);
    EXPECT_EQ(sleeps().size(), 20U);
    EXPECT_TRUE(all_are(sleeps(), 25000));
    EXPECT_EQ(reader.u32(tail_reader::tail_request), 0U);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 1U);
}

TEST(Coordination, LeavesTheFlagRaisedWhenNobodyAnswered)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    do_coordination(&anchors);
    EXPECT_EQ(reader.u16(tail_reader::flags), 0x8000);
}

TEST(Coordination, LowersTheFlagForAnAnswerInTheLastSleep)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    reader.set_u32(tail_reader::seq_lock, 44);
    on_sleep([&](int count) {
        if (count == 20) reader.set_u32(tail_reader::tail_request, 0);
    });
    do_coordination(&anchors);
    EXPECT_EQ(reader.u16(tail_reader::flags), 0);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 44U);
}

TEST(Coordination, WithoutARequestLetsGoOfTheReadersRecord)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::seq_lock, 44);
    poke_u16(tail_reader::flags, 0x0040);
    EXPECT_EQ(do_coordination(&anchors), 0);
    EXPECT_TRUE(sleeps().empty());
    EXPECT_EQ(reader.u32(tail_reader::tail_request), 0U);
    EXPECT_EQ(reader.u32(tail_reader::seq_lock), 1U);
    EXPECT_EQ(reader.u16(tail_reader::flags), 0x0040);
}

TEST(TailRequest, IsSeenByARecordOfTheLongestLength)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    on_sleep([&](int) { reader.set_u32(tail_reader::tail_request, 0); });
    EXPECT_TRUE(allocate(longest).given);
    EXPECT_EQ(sleeps(), std::vector<unsigned>(1, 25000));
}

TEST(TailRequest, IsNotSeenByAShorterRecord)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    EXPECT_TRUE(allocate(longest - 4).given);
    EXPECT_TRUE(sleeps().empty());
    EXPECT_EQ(reader.u32(tail_reader::tail_request), 1U);
}

TEST(TailRequest, CountsWithItsValue)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, longest - 32); // together just the longest record
    EXPECT_TRUE(allocate(32).given);
    EXPECT_TRUE(sleeps().empty());
    reader.set_u32(tail_reader::tail_request, longest - 31);
    EXPECT_TRUE(allocate(32).given);
    EXPECT_EQ(sleeps().size(), 20U);
}

TEST(TailRequest, LetsARecordBeLongerThanTheLongest)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    const allocated record = allocate(longest + 400);
    EXPECT_TRUE(record.given);
    EXPECT_EQ(record.length, longest + 400);
    EXPECT_EQ(sleeps().size(), 20U);
    trace.image().ring();
    EXPECT_FALSE(allocate(longest + 400).given); // the request is gone, and with it the exception
}

TEST(TailRequest, LetsARecordBeAsLongAsTheRing)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    const allocated record = allocate(whole_ring - 28);
    EXPECT_EQ(record.offset, 200U);
    EXPECT_EQ(record.length, whole_ring);
}

TEST(TailRequest, LetsNoRecordBeLongerThanTheRing)
{
    const one_trace trace(small_file);
    EXPECT_EQ(tr_record_id_1("TEST", 9), 0);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, 1);
    EXPECT_EQ(standard_error_of([] { EXPECT_FALSE(allocate(whole_ring - 27).given); }), "");
    EXPECT_EQ(sleeps().size(), 20U);
    EXPECT_EQ(trace.only_record().u32(28), 9U);
    EXPECT_TRUE(allocate(32).given);
}

TEST(TailRequest, HoldsAWriterOfALongRecordUp)
{
    const one_trace trace(small_file);
    tail_reader reader(trace.file());
    reader.set_u32(tail_reader::tail_request, longest);
    EXPECT_EQ(tr_record_id_1("TEST", 9), 0);
    EXPECT_EQ(sleeps().size(), 20U);
    EXPECT_EQ(trace.only_record().u32(28), 9U);
}
