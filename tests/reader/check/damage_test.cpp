// Every flipped bit and every cut of small files: the reader ends, within bounds, and both formats print the outcome.
#include <gtest/gtest.h>

#include <algorithm>

#include "reader/every_kind.h"
#include "reader/reading.h"

namespace qn::test
{
namespace
{

// Records of all kinds all over a ring that is wrapped, in 2 KiB.
std::vector<std::byte> small_wrapped_file()
{
    const auto all_kinds = every_kind();
    constexpr std::size_t records_begin = 200, records_end = 1204, size = 2048;
    const auto records = all_kinds.bytes().subspan(records_begin, records_end - records_begin);
    trace_builder file(size);
    for (std::size_t i = 0; i < records.size(); ++i) {
        file.put_u8(size - records.size() + i, std::to_integer<std::uint8_t>(records[i]));
    }
    file.seq = 100;
    file.add_strings(1, {"new", "newer"});
    file.add_id(7);
    file.set_oldest(file.at);
    file.add_free(size - records.size() - file.at);
    return file.copy();
}

std::size_t most_records(std::size_t size) { return 2 * (size / 28) + 1; }

void expect_bounded_output(std::span<const std::byte> bytes)
{
    const auto read = read_all(bytes);
    EXPECT_LE(read.records.size(), most_records(bytes.size()));
    for (const auto &record : read.records) {
        EXPECT_LE(record.offset + record.header.length, bytes.size());
    }
    // A byte of a file becomes at most six in text and JSON, and every record has its line.
    const std::size_t most_bytes = 4096 + 12 * bytes.size() + 1024 * read.records.size();
    EXPECT_LT(text_of(bytes, {.raw = true, .with_header = true}).size(), most_bytes);
    EXPECT_LT(json_of(bytes, {.raw = true, .with_header = true}).size(), most_bytes);
}

TEST(Damage, TheFileOfTheseTestsIsSoundButForItsUnfinishedRecord)
{
    const auto read = read_all(small_wrapped_file());
    EXPECT_EQ(read.damage().size(), 1u);
    EXPECT_EQ(read.data_seqs().size(), 16u);
}

TEST(Damage, EveryFlippedBitLeavesABoundedReading)
{
    auto bytes = small_wrapped_file();
    for (std::size_t bit = 0; bit < 8 * bytes.size(); ++bit) {
        const auto flip = std::byte{1} << (bit % 8);
        bytes[bit / 8] ^= flip;
        expect_bounded_output(bytes);
        bytes[bit / 8] ^= flip;
    }
}

TEST(Damage, EveryOverwrittenWordLeavesABoundedReading)
{
    const auto sound = small_wrapped_file();
    for (const std::uint32_t word :
         {0u, 1u, 4u, 28u, 32u, 0xFFFFu, 0x7FFFFFFFu, 0x80000000u, 0xFFFFFFFCu, 0xFFFFFFFFu}) {
        for (std::size_t at = 0; at + 4 <= sound.size(); at += 4) {
            auto bytes = sound;
            for (std::size_t i = 0; i < 4; ++i) {
                bytes[at + i] = static_cast<std::byte>(word >> (8 * i) & 0xFF);
            }
            expect_bounded_output(bytes);
        }
    }
}

TEST(Damage, ARecordsFlippedBitsLeaveTheRecordsBeforeIt)
{
    auto bytes = small_wrapped_file();
    const auto sound = read_all(bytes);
    ASSERT_GT(sound.records.size(), 10u);
    const auto &damaged = sound.records[8];
    for (std::size_t bit = 0; bit < 8 * damaged.header.length; ++bit) {
        const auto flip = std::byte{1} << (bit % 8);
        bytes[damaged.offset + bit / 8] ^= flip;
        const auto read = read_all(bytes);
        ASSERT_GE(read.records.size(), 8u);
        for (std::size_t i = 0; i < 8; ++i) {
            EXPECT_EQ(read.records[i].offset, sound.records[i].offset) << bit;
        }
        // And those that were written after the wrap.
        EXPECT_EQ(read.records.back().header.seq, 104u) << bit;
        bytes[damaged.offset + bit / 8] ^= flip;
    }
}

TEST(Damage, EveryTruncationShowsWhatIsLeft)
{
    const auto whole = small_wrapped_file();
    const auto sound = read_all(whole);
    for (std::size_t size = 0; size < whole.size(); ++size) {
        const auto bytes = std::span(whole).first(size);
        const auto read = read_all(bytes);
        EXPECT_FALSE(read.damage().empty()) << size;
        expect_bounded_output(bytes);
        if (size < 228) continue;
        // Exactly the records that are still complete, in the same order.
        std::vector<std::uint64_t> left, found;
        for (const auto &record : sound.records) {
            if (record.offset + record.header.length <= size && record.kind != "free") left.push_back(record.offset);
        }
        for (const auto &record : read.records) {
            if (record.kind != "free") found.push_back(record.offset);
        }
        EXPECT_EQ(found, left) << size;
    }
}

TEST(Damage, ATruncatedFileIsToldWithItsSizes)
{
    const auto whole = small_wrapped_file();
    const auto read = read_all(std::span(whole).first(1500));
    ASSERT_FALSE(read.damage().empty());
    EXPECT_EQ(read.damage()[0], "1500: the file is truncated: it has 1500 bytes of 2048");
}

} // namespace
} // namespace qn::test
