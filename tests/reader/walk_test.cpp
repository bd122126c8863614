// The way round the ring: sound ones, torn ones, and ones that move while they are read.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <functional>

#include "reader/reading.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

using strings = std::vector<std::string>;
using seqs = std::vector<std::uint32_t>;

// Newer records (12, 14, 16) before the oldest ones (2 to 10), a filler between them and one at the end.
struct wrapped_ring {
    trace_builder file{4096};
    std::vector<std::size_t> older, newer;
    std::size_t oldest = 0;

    wrapped_ring()
    {
        file.at = 200 + 3 * 32 + 60;
        oldest = file.at;
        for (std::uint32_t id = 1; id <= 5; ++id) {
            older.push_back(file.add_id(id));
        }
        file.seq += 2;
        file.add_free(4096 - file.at, file.seq); // the filler of a wrap takes a sequence number
        file.at = 200;
        for (std::uint32_t id = 6; id <= 8; ++id) {
            newer.push_back(file.add_id(id));
        }
        oldest = file.add_free(60);
        file.set_oldest(oldest);
    }
};

TEST(Walk, AWrappedRingIsReadOldestFirst)
{
    const wrapped_ring ring;
    const auto read = read_all(ring.file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8, 10, 14, 16, 18}));
    EXPECT_EQ(read.records.front().kind, "free");
    EXPECT_EQ(read.records.front().offset, ring.oldest);
}

TEST(Walk, ARecordMayEndExactlyAtTheEndOfTheRing)
{
    trace_builder file(200 + 4 * 32);
    for (std::uint32_t id = 1; id <= 4; ++id) {
        file.add_id(id);
    }
    file.close();
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8}));
}

TEST(Walk, ARecordMayBe28BytesLongerThanItsBody)
{
    trace_builder file;
    file.add(1, file.body().u32(1), 28);
    file.add(12, file.body().u32(2).u32(1).u32(5), 28);
    file.add_start(1, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.close();
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.records[1].header.length, 60u);
}

TEST(Walk, TheTailOfAPageWithANoticeIsAFillerOfItsOwn)
{
    trace_builder file;
    file.component = "____";
    file.seq = static_cast<std::uint32_t>(-2);
    file.add(2, file.body().text("SPOOL: p not spooled 1 consecutive time"));
    file.add_id(1);
    file.set_oldest(file.at);
    file.add_free(4096 - file.at - 68);
    file.add_free(68);
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{0, 2}));
}

TEST(Walk, DamageAmongTheOlderRecordsLeavesTheNewerOnes)
{
    const struct {
        std::uint32_t length;
        const char *problem;
    } cases[] = {
        {0, "record length 0 is less than a record header"},
        {27, "record length 27 is less than a record header"},
        {33, "record length 33 is not a multiple of 4"},
        {34, "record length 34 is not a multiple of 4"},
        {4096, "record length 4096 reaches past the end of the ring at 4096"},
        {0x80000000, "record length 2147483648 reaches past the end of the ring at 4096"},
        {0xFFFFFFFC, "record length 4294967292 reaches past the end of the ring at 4096"},
    };
    for (const auto &bad : cases) {
        wrapped_ring ring;
        ring.file.put_u32(ring.older[2], bad.length);
        const auto read = read_all(ring.file.bytes());
        EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 14, 16, 18})) << bad.length;
        EXPECT_EQ(read.damage(), strings{std::to_string(ring.older[2]) + ": " + bad.problem});
    }
}

TEST(Walk, DamageAmongTheNewerRecordsLeavesTheOlderOnes)
{
    wrapped_ring ring;
    ring.file.put_u32(ring.newer[1], 0);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8, 10, 14}));
    EXPECT_EQ(read.damage().size(), 1u);
}

TEST(Walk, DamageInBothPartsIsToldTwice)
{
    wrapped_ring ring;
    ring.file.put_u32(ring.older[3], 2);
    ring.file.put_u32(ring.newer[2], 3);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 14, 16}));
    EXPECT_EQ(read.damage().size(), 2u);
}

TEST(Walk, ALengthThatLeavesNoRoomForARecordAtTheEndIsDamage)
{
    trace_builder file;
    file.add_id(1);
    file.set_oldest(200);
    file.add_free(4096 - file.at - 8);
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2}));
    EXPECT_EQ(read.damage(), strings{"4088: the 8 bytes before the end of the ring are too few for a record"});
}

TEST(Walk, ARecordThatStraddlesTheOldestIsDamage)
{
    for (const std::uint32_t extra : {4u, 28u, 32u}) {
        wrapped_ring ring;
        ring.file.put_u32(ring.newer[2], 32 + extra);
        const auto read = read_all(ring.file.bytes());
        EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8, 10, 14, 16})) << extra;
        EXPECT_EQ(read.damage(),
                  strings{std::to_string(ring.newer[2]) + ": this record of " + std::to_string(32 + extra) +
                          " bytes overlaps the oldest record at " + std::to_string(ring.oldest)});
    }
}

TEST(Walk, AnOldestOffsetInsideARecordIsFoundAgainByASurvey)
{
    wrapped_ring ring;
    ring.file.set_oldest(ring.older[1] + 8); // its length would be the sequence number 4
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8, 10, 14, 16, 18}));
    EXPECT_EQ(read.damage(),
              strings{std::to_string(ring.older[1] + 8) + ": record length 4 is less than a record header"});
    EXPECT_EQ(read.records.front().offset, ring.oldest);
}

TEST(Walk, WithoutAnOldestRecordADamagedRingIsReadFromItsBeginning)
{
    wrapped_ring ring;
    ring.file.set_oldest(0);
    ring.file.put_u32(ring.older[1], 0);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{14, 16, 18, 2}));
    ASSERT_EQ(read.damage().size(), 3u); // the offset, the step back from 18 to 2, the length
    EXPECT_EQ(read.damage()[1], std::to_string(ring.older[0]) + ": sequence number 2 follows 18");
}

TEST(Walk, ARecordBeingWrittenIsToldAndTheOthersShown)
{
    wrapped_ring ring;
    ring.file.put_u16(ring.newer[2] + 4, 0xFFFF);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6, 8, 10, 14, 16}));
    EXPECT_EQ(read.damage(), strings{std::to_string(ring.newer[2]) +
                                     ": this record is being written, or its writer died before it was complete"
                                     " (sequence number 18)"});
}

TEST(Walk, AnOddSequenceNumberIsToldAndTheWalkGoesOn)
{
    wrapped_ring ring;
    ring.file.put_u32(ring.older[2] + 8, 7);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 7, 8, 10, 14, 16, 18}));
    EXPECT_EQ(read.damage(),
              strings{std::to_string(ring.older[2]) + ": sequence number 7 is odd, which no record's is"});
}

TEST(Walk, ASequenceNumberThatGoesBackIsTold)
{
    wrapped_ring ring;
    ring.file.put_u32(ring.older[2] + 8, 0x1000);
    const auto read = read_all(ring.file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 0x1000, 8, 10, 14, 16, 18}));
    EXPECT_EQ(read.damage(), strings{std::to_string(ring.older[3]) + ": sequence number 8 follows 4096"});
}

TEST(Walk, SequenceNumbersMayWrapRound)
{
    trace_builder file;
    file.seq = 0xFFFFFFFA;
    for (std::uint32_t id = 1; id <= 4; ++id) {
        file.add_id(id);
    }
    file.close();
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{0xFFFFFFFC, 0xFFFFFFFE, 0, 2}));
}

TEST(Walk, ARecordLongerThanHalfTheRingIsToldAndNotDecoded)
{
    trace_builder file(8192);
    file.add_id(1);
    file.add(15, file.body().u32(1).u32(1).u32(4).text("big").zeros(4000));
    file.add_id(2);
    file.close();
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.records[2].kind, "unknown");
    ASSERT_EQ(read.damage().size(), 1u);
    EXPECT_NE(read.damage()[0].find("more than half the ring"), std::string::npos);
}

TEST(Walk, TheLongestRecordAWriterIsGivenIsRead)
{
    constexpr std::size_t size = 4 * 1024 * 1024; // longer than the reader's window
    constexpr std::size_t longest = (size - 200) / 2 / 4 * 4;
    trace_builder file(size);
    file.add_id(1);
    file.add(15, file.body().u32(1).u32(1).u32(longest - 40).text(std::string(longest - 41, 'x')));
    file.add_id(2);
    file.close();
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.records[2].header.length, longest);
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
}

TEST(Walk, ARingOfTheSmallestRecordsEndsAfterThemAll)
{
    trace_builder file(200 + 28 * 100000);
    while (file.at < file.bytes().size()) {
        file.add(0xFFFF, file.body());
    }
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.records.size(), 100000u);
    EXPECT_EQ(read.damage().size(), 100000u);
}

// A source that runs `before` ahead of every read: somebody else at work on the file.
class changing_source final : public reader::byte_source
{
public:
    explicit changing_source(std::vector<std::byte> first) : bytes(std::move(first)), size_(bytes.size()) {}
    std::uint64_t size() const override { return size_; }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override
    {
        ++reads;
        if (before) before();
        if (offset >= bytes.size()) return 0;
        const auto count = std::min<std::size_t>(into.size(), bytes.size() - offset);
        std::memcpy(into.data(), bytes.data() + offset, count);
        return count;
    }

    std::vector<std::byte> bytes;
    std::function<void()> before;
    int reads = 0;

private:
    std::uint64_t size_;
};

// Records of 32 bytes all over a ring that is four windows long.
trace_builder long_ring(std::uint32_t first_seq)
{
    trace_builder file(200 + 32 * 32768);
    file.seq = first_seq - 2;
    while (file.at < file.bytes().size()) {
        file.add_id(file.seq);
    }
    return file;
}

TEST(Walk, AFileThatShrinksWhileItIsReadEndsTheWalk)
{
    changing_source source(long_ring(2).copy());
    source.before = [&] {
        if (source.reads == 3) source.bytes.resize(300'000);
    };
    const auto read = read_all(source);
    EXPECT_GT(read.data_seqs().size(), 1000u);
    EXPECT_LT(read.data_seqs().size(), 32768u);
    ASSERT_EQ(read.damage().size(), 1u);
    EXPECT_NE(read.damage()[0].find("the file ends inside this record's header"), std::string::npos);
}

TEST(Walk, AFileThatBecomesEmptyWhileItIsReadEndsTheWalk)
{
    changing_source source(long_ring(2).copy());
    source.before = [&] {
        if (source.reads == 2) source.bytes.clear();
    };
    const auto read = read_all(source);
    EXPECT_EQ(read.damage().size(), 1u);
}

TEST(Walk, AReaderThatTheWriterOvertakesGoesOnAtTheNewOldestRecord)
{
    // Between the first and the second window the writer goes round the ring with longer records.
    trace_builder rewritten(200 + 32 * 32768);
    rewritten.seq = 2 * 32768;
    while (rewritten.at + 36 + 28 <= rewritten.bytes().size()) {
        rewritten.add(12, rewritten.body().u32(1).u32(0), 0);
    }
    rewritten.close();
    changing_source source(long_ring(2).copy());
    source.before = [&] {
        if (source.reads == 2) source.bytes = rewritten.copy();
    };
    const auto read = read_all(source);
    EXPECT_TRUE(read.damage().empty()) << read.damage().front();
    EXPECT_EQ(read.notes().size(), 1u);
    const auto all = read.data_seqs();
    EXPECT_TRUE(std::is_sorted(all.begin(), all.end())); // nothing twice, nothing out of order
    EXPECT_EQ(std::adjacent_find(all.begin(), all.end()), all.end());
    EXPECT_EQ(all.back(), rewritten.seq);
}

TEST(Walk, AFileThatNeverStandsStillIsReadInBoundedTime)
{
    changing_source source(long_ring(2).copy());
    source.before = [&] {
        // Each read finds another oldest record and garbage everywhere.
        std::fill(source.bytes.begin() + 200, source.bytes.end(), std::byte{1});
        const std::uint32_t oldest = 200 + 4 * static_cast<std::uint32_t>(source.reads);
        std::memcpy(source.bytes.data() + 44, &oldest, sizeof(oldest));
    };
    const auto read = read_all(source);
    EXPECT_TRUE(read.data_seqs().empty());
    EXPECT_FALSE(read.damage().empty());
    EXPECT_LT(source.reads, 200);
}

TEST(Walk, ARecordCompletedMeanwhileIsShown)
{
    trace_builder file;
    const auto offset = file.add_id(1);
    file.add_id(2);
    file.close();
    file.put_u16(offset + 4, 0xFFFF);
    changing_source source(file.copy());
    source.before = [&] {
        if (source.reads == 2) source.bytes[offset + 4] = std::byte{1};
        if (source.reads == 2) source.bytes[offset + 5] = std::byte{0};
    };
    const auto read = read_all(source);
    EXPECT_TRUE(read.findings.empty());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4}));
}

// Tells the longest stretch that was read at a time.
class measured_source final : public reader::byte_source
{
public:
    explicit measured_source(std::span<const std::byte> bytes) : source_(bytes) {}
    std::uint64_t size() const override { return source_.size(); }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override
    {
        longest = std::max(longest, into.size());
        return source_.read_at(offset, into);
    }
    std::size_t longest = 0;

private:
    reader::memory_source source_;
};

TEST(Walk, WhoOnlyCountsDoesNotReadALongRecord)
{
    constexpr std::size_t window_bytes = 4096;
    trace_builder file(100'000);
    file.add(12, file.body().u32(17).u32(10'000).zeros(40'000));
    file.add_id(18);
    file.close();
    file.set_oldest(200);
    measured_source source(file.bytes());
    reader::trace_reader trace(
        source, [](const reader::finding &) {}, window_bytes);
    const auto first = trace.next_undecoded();
    ASSERT_TRUE(first);
    EXPECT_EQ(first->raw.header.length, 28U + 8 + 40'000);
    EXPECT_EQ(first->raw.bytes.u32(28), 17U);
    const auto second = trace.next_undecoded();
    ASSERT_TRUE(second);
    EXPECT_EQ(second->raw.bytes.u32(28), 18U);
    EXPECT_EQ(source.longest, window_bytes);
}

} // namespace
} // namespace qn::test
