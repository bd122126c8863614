// Whether an existing file is continued, as far as its ring decides: every kind of damage, and the one that is mended.
#include <gtest/gtest.h>

#include "files/support_files.h"

namespace
{
using namespace qn::test;

constexpr uint32_t size = 65536;
constexpr uint32_t ring = 200;

class Ring : public testing::Test
{
protected:
    // An empty file of this program whose ring the test fills. No start record is written on a start.
    void SetUp() override
    {
        anchor = start_without_record(file, size);
        stop(anchor);
        image = file_bytes(file);
        debug_on();
    }

    void oldest(uint32_t offset) { std::memcpy(&image[44], &offset, sizeof offset); }
    void first(uint32_t offset) { std::memcpy(&image[8], &offset, sizeof offset); }
    void version(uint16_t number) { std::memcpy(&image[2], &number, sizeof number); }
    void record(uint32_t offset, uint32_t length, uint32_t sequence, uint16_t function = 1)
    {
        put_record(image, offset, length, function, sequence);
    }

    void restart()
    {
        write_file(file, image);
        clear_system_log();
        ASSERT_EQ(start(anchor), 0);
    }

    bool says(const std::string &damage) const
    {
        return system_log_has("\ttrace: reInit for " + file + " due to " + damage + "\n");
    }

    void expect_empty_ring()
    {
        EXPECT_TRUE(system_log_has("\ttrace: reInit block for " + file + "\n"));
        EXPECT_FALSE(system_log_has("\ttrace: Re-using existing file.\n"));
        EXPECT_FALSE(exists(file + ".save"));
        const trace_image now = trace_image::of_file(file);
        EXPECT_EQ(now.oldest_offset(), ring);
        EXPECT_EQ(now.ring_offset(), ring);
        ASSERT_EQ(now.ring().size(), 1U);
        EXPECT_EQ(now.ring()[0].sequence(), 0U);
        EXPECT_EQ(anchor->seqNumber, 0U);
        EXPECT_EQ(anchor->pNextFree, anchor->pWrap);
        EXPECT_EQ(anchor->uMaxSize, (size - ring) / 2);
        stop(anchor);
    }

    void expect_damage(const std::string &damage)
    {
        restart();
        EXPECT_TRUE(says(damage)) << testing::PrintToString(debug_lines());
        expect_empty_ring();
    }

    // For offsets without room for a record: that they are damage counts, not which.
    void expect_some_damage()
    {
        restart();
        EXPECT_TRUE(says("corruption 1") || says("corruption 2") || says("corruption 3"))
            << testing::PrintToString(debug_lines());
        expect_empty_ring();
    }

    void expect_continued(uint32_t last_sequence, uint32_t next_offset)
    {
        restart();
        EXPECT_TRUE(system_log_has("\ttrace: Re-using existing file.\n")) << testing::PrintToString(debug_lines());
        EXPECT_EQ(anchor->seqNumber, last_sequence);
        EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pNextFree), anchor->pMap + next_offset);
        trace_image::of_file(file).ring();
        stop(anchor);
    }

    scratch folder;
    std::string file = folder / "f";
    std::string image;
    trace_anchor_t *anchor = nullptr;
};

TEST_F(Ring, ThatIsEmptyIsContinued) { expect_continued(0, ring); }

TEST_F(Ring, ThatWrapsIsContinuedAtItsOldestRecord)
{
    oldest(500);
    record(200, 300, 1004);
    record(500, 500, 1000);
    record(1000, size - 1000, 1002);
    expect_continued(1004, 500);
}

TEST_F(Ring, IsContinuedWithTheNumberOfItsLastRecordAndNotOfAFiller)
{
    record(200, 100, 20);
    record(300, size - 300, 4095, 0);
    expect_continued(20, 200);
}

// The walk takes numbers as they come; which is the highest is not asked.
TEST_F(Ring, IsContinuedWithTheLastNumberAlsoAfterAnOverflow)
{
    record(200, 100, 0xFFFFFFFE);
    record(300, size - 300, 0);
    expect_continued(0, 200);
}

TEST_F(Ring, WithARecordThatWasBeingWrittenIsContinued)
{
    record(200, 100, 20);
    record(300, 100, 22, 0xFFFF);
    record(400, size - 400, 4095, 0);
    expect_continued(22, 200);
}

TEST_F(Ring, OfRecordsOfTheSmallestLengthIsContinued)
{
    uint32_t offset = 200;
    uint32_t sequence = 0;
    for (; offset + 28 + 28 <= size; offset += 28) record(offset, 28, sequence += 2);
    record(offset, size - offset, sequence += 2);
    expect_continued(sequence, 200);
}

class OldestOffset : public Ring, public testing::WithParamInterface<uint32_t>
{
};

TEST_P(OldestOffset, BeyondTheFileIsCorruption1)
{
    oldest(GetParam());
    expect_damage("corruption 1");
}

INSTANTIATE_TEST_SUITE_P(Offsets, OldestOffset, testing::Values(65537, 65564, 131072, 0x80000000, 0xFFFFFFFF));

using OffsetWithoutRoom = OldestOffset;

TEST_P(OffsetWithoutRoom, IsCorruption)
{
    oldest(GetParam());
    expect_some_damage();
}

INSTANTIATE_TEST_SUITE_P(Offsets, OffsetWithoutRoom,
                         testing::Values(0, 4, 196, 199, 65536 - 27, 65536 - 4, 65536 - 1, 65536));

TEST_F(Ring, MayHaveItsOldestRecordInItsLast28Bytes)
{
    oldest(size - 28);
    record(size - 28, 28, 10);
    record(200, size - 28 - 200, 12);
    expect_continued(12, size - 28);
}

class RecordLength : public Ring, public testing::WithParamInterface<uint32_t>
{
};

TEST_P(RecordLength, PastTheEndIsCorruption3)
{
    record(200, 100, 2);
    record(300, GetParam(), 4);
    expect_damage("corruption 3");
}

INSTANTIATE_TEST_SUITE_P(Lengths, RecordLength,
                         testing::Values(size - 300 + 1, size - 300 + 4, size, 0x7FFFFFFF, 0xFFFFFF00, 0xFFFFFFFF));

using LengthThatLeavesNoRoom = RecordLength;

TEST_P(LengthThatLeavesNoRoom, IsCorruption)
{
    record(200, size - 200 - GetParam(), 2);
    expect_some_damage();
}

INSTANTIATE_TEST_SUITE_P(BytesLeft, LengthThatLeavesNoRoom, testing::Values(1, 4, 24, 27));

TEST_F(Ring, WithALengthOfZeroIsCorruption2)
{
    record(200, 100, 2);
    record(300, 0, 4);
    expect_damage("corruption 2");
}

class SequenceNumber : public Ring, public testing::WithParamInterface<uint32_t>
{
};

TEST_P(SequenceNumber, ThatIsOddIsCorruption2)
{
    record(200, 100, 2);
    record(300, size - 300, GetParam());
    expect_damage("corruption 2");
}

INSTANTIATE_TEST_SUITE_P(Numbers, SequenceNumber, testing::Values(1, 3, 4093, 4097, 0xFFFFFFFF));

TEST_F(Ring, WithAnEmptyOldestRecordIsCorruption2)
{
    record(200, 0, 0, 0);
    expect_damage("corruption 2");
}

// The newest record runs into the oldest, as when a process died between two stores of an allocation.
TEST_F(Ring, WithTheNewestRecordOverTheOldestIsMended)
{
    oldest(500);
    record(500, size - 500, 100);
    record(200, 100, 102);
    record(300, 400, 104);
    restart();
    EXPECT_TRUE(system_log_has("\ttrace: Re-using existing file.\n"));
    EXPECT_EQ(anchor->seqNumber, 102U) << "the number of the mended record does not count";
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pNextFree), anchor->pMap + 300);

    const trace_image now = trace_image::of_file(file);
    EXPECT_EQ(now.oldest_offset(), 300U);
    const auto records = now.ring();
    ASSERT_EQ(records.size(), 3U);
    EXPECT_EQ(records[0].offset, 300U);
    EXPECT_EQ(records[0].length(), 200U);
    EXPECT_EQ(records[0].function(), 0);
    EXPECT_EQ(records[0].sequence(), 4095U);
    EXPECT_EQ(records[1].sequence(), 100U);
    stop(anchor);
}

TEST_F(Ring, WithRoomForJustAFillerBeforeTheOldestIsMended)
{
    oldest(228);
    record(228, size - 228, 100);
    record(200, 60, 102);
    restart();
    EXPECT_TRUE(system_log_has("\ttrace: Re-using existing file.\n"));
    const auto records = trace_image::of_file(file).ring();
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].length(), 28U);
    stop(anchor);
}

TEST_F(Ring, WithoutRoomForAFillerBeforeTheOldestIsCorruptionStraddle)
{
    oldest(224);
    record(224, size - 224, 100);
    record(200, 60, 102);
    expect_damage("corruption straddle");
}

// A record that is mended may end anywhere, up to the end of the file.
TEST_F(Ring, WithANewestRecordUpToTheEndOfTheFileIsMended)
{
    oldest(500);
    record(500, size - 500, 100);
    record(200, size - 200, 102);
    restart();
    EXPECT_TRUE(system_log_has("\ttrace: Re-using existing file.\n"));
    EXPECT_EQ(trace_image::of_file(file).ring().size(), 2U);
    stop(anchor);
}

TEST_F(Ring, WithTheNewestRecordPastTheEndIsCorruption3)
{
    oldest(500);
    record(500, size - 500, 100);
    record(200, size - 200 + 4, 102);
    expect_damage("corruption 3");
}

TEST_F(Ring, IsWrittenOnWhereItWasMended)
{
    oldest(500);
    record(500, size - 500, 100, 0);
    record(200, 100, 102);
    record(300, 400, 104);
    write_file(file, image);
    ASSERT_TRUE(in_child([&] {
        global_switch = 0;
        return start(anchor) == 0 && tr_ms_record_id_1("TEST", 5, anchor) == 0 && anchor->seqNumber == 106;
    }));
    const trace_image now = trace_image::of_file(file);
    now.ring();
    EXPECT_EQ(ids_in(file).back(), 5U);
}

// Steps of 4 bytes up to a last record of 28: every length and every number is sound, but a file has no room for so many.
TEST_F(Ring, WithMoreRecordsThanFitIsCorruption)
{
    for (uint32_t offset = 200; offset + 4 <= size; offset += 4) {
        const uint32_t length = 4;
        std::memcpy(&image[offset], &length, sizeof length);
    }
    record(size - 28, 28, 4, 0);
    expect_some_damage();
}

class FirstOffset : public Ring, public testing::WithParamInterface<uint32_t>
{
};

// The walk would never come back to the oldest record, or leave the file.
TEST_P(FirstOffset, ThatCannotBeIsCorruption)
{
    first(GetParam());
    oldest(400);
    record(200, 200, 10);
    record(400, size - 400, 12);
    expect_some_damage();
}

INSTANTIATE_TEST_SUITE_P(Offsets, FirstOffset, testing::Values(0, 4, 404, 65536 - 4, 65536, 0x7FFFFFFF, 0xFFFFFFFC));

struct ring_place {
    uint16_t version;
    uint32_t offset;
};

void PrintTo(const ring_place &given, std::ostream *out) { *out << given.offset << " in version " << given.version; }

class RingPlace : public Ring, public testing::WithParamInterface<ring_place>
{
};

// Older versions have shorter headers; a longer one does no harm.
TEST_P(RingPlace, IsWhereTheHeaderSays)
{
    const auto [number, offset] = GetParam();
    version(number);
    first(offset);
    oldest(offset + 300);
    record(offset, 300, 22);
    record(offset + 300, size - offset - 300, 20);
    restart();
    EXPECT_TRUE(system_log_has("\ttrace: Re-using existing file.\n")) << testing::PrintToString(debug_lines());
    EXPECT_EQ(anchor->seqNumber, 22U);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pWrap), anchor->pMap + offset);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pNextFree), anchor->pMap + offset + 300);
    EXPECT_EQ(anchor->uMaxSize, (size - offset) / 2 / 4 * 4);
    const trace_image now = trace_image::of_file(file);
    EXPECT_EQ(now.ring_offset(), offset);
    EXPECT_EQ(now.ring().size(), 2U);
    stop(anchor);
}

INSTANTIATE_TEST_SUITE_P(Places, RingPlace,
                         testing::Values(ring_place{6, 200}, ring_place{5, 196}, ring_place{4, 188}, ring_place{3, 180},
                                         ring_place{6, 204}, ring_place{6, 400}));

TEST_F(Ring, OfTheDamagedFileIsUsableAtOnce)
{
    record(200, 100, 2);
    record(300, 0, 4);
    write_file(file, image);
    ASSERT_TRUE(in_child([&] {
        global_switch = 0;
        if (start(anchor) != 0) return false;
        write_ids(anchor, 5000);
        return true;
    }));
    EXPECT_EQ(ids_in(file).back(), 5000U);
}
} // namespace
