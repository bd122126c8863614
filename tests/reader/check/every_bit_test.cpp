// Every flipped bit and every cut of a file of 64 KiB: reading and checking end, within bounds, and what stands before
// the damage is shown as ever.
//
// A test for each bit of a byte; each takes every byte of the header and of the record headers, and of the other bytes
// every 16th, unless QN_EVERY_BIT is set in the environment: then it takes them all.
#include <gtest/gtest.h>

#include <cstdlib>

#include "reader/check/long_trace.h"
#include "reader/reading.h"
#include "tools/qntrace/check/file_check.h"

namespace qn::test
{
namespace
{

constexpr std::size_t header_bytes = 200;
constexpr std::size_t record_header_bytes = 28;

// A record as far as its place and its contents go, in one number each.
struct glimpse {
    std::uint64_t offset = 0;
    std::uint64_t seq_and_kind = 0;
    bool operator==(const glimpse &) const = default;
};

struct sight {
    std::vector<glimpse> records;
    std::size_t findings = 0;
};

sight look_at(std::span<const std::byte> bytes)
{
    sight seen;
    reader::memory_source source(bytes);
    reader::trace_reader trace(source, [&](const reader::finding &) { ++seen.findings; });
    while (const auto record = trace.next()) {
        const auto &header = record->raw.header;
        seen.records.push_back({record->raw.offset, std::uint64_t{header.seq} << 32 | header.function});
    }
    return seen;
}

// Ends, hands out no record twice, and does not find more than there can be.
void expect_bounded(const sight &seen, std::size_t bytes)
{
    const std::size_t most_records = bytes / record_header_bytes + 1;
    ASSERT_LE(seen.records.size(), most_records);
    ASSERT_LE(seen.findings, 4 * most_records + 16);
}

class every_flip
{
public:
    every_flip() : bytes_(long_trace().copy()), whole_(look_at(bytes_)) {}

    const sight &whole() const { return whole_; }

    void flip(std::size_t byte, unsigned bit)
    {
        bytes_[byte] ^= std::byte{1} << bit;
        const auto seen = look_at(bytes_);
        ASSERT_NO_FATAL_FAILURE(expect_bounded(seen, bytes_.size())) << byte << " bit " << bit;
        if (byte >= header_bytes) {
            const std::size_t damaged = record_at(byte);
            ASSERT_GE(seen.records.size(), damaged) << byte << " bit " << bit;
            ASSERT_TRUE(std::equal(whole_.records.begin(),
                                   whole_.records.begin() + static_cast<std::ptrdiff_t>(damaged), seen.records.begin()))
                << byte << " bit " << bit;
        }
        reader::memory_source source(bytes_);
        const auto checked = dump::check_file(source);
        ASSERT_LE(checked.records, whole_.records.size()) << byte << " bit " << bit;
        ASSERT_LE(checked.findings.size(), dump::file_check::most_findings) << byte << " bit " << bit;
        ASSERT_LE(checked.unreadable_bytes, checked.ring_bytes) << byte << " bit " << bit;
        bytes_[byte] ^= std::byte{1} << bit;
    }

    // The bytes that decide how the ring is walked, and of the others some or all.
    bool is_chosen(std::size_t byte) const
    {
        static const bool all = std::getenv("QN_EVERY_BIT") != nullptr;
        if (all || byte % 16 == 0 || byte < header_bytes) return true;
        return byte - whole_.records[record_at(byte)].offset < record_header_bytes;
    }

    std::size_t size() const { return bytes_.size(); }

private:
    // Which of the records in reading order the byte belongs to.
    std::size_t record_at(std::size_t byte) const
    {
        std::size_t found = 0;
        for (std::size_t i = 1; i < whole_.records.size(); ++i) {
            const std::uint64_t offset = whole_.records[i].offset;
            if (offset <= byte && (offset > whole_.records[found].offset || whole_.records[found].offset > byte))
                found = i;
        }
        return found;
    }

    std::vector<std::byte> bytes_;
    sight whole_;
};

TEST(EveryBit, TheFileOfTheseTestsIsSound)
{
    const auto bytes = long_trace().copy();
    reader::memory_source source(bytes);
    const auto checked = dump::check_file(source);
    EXPECT_TRUE(checked.sound());
    EXPECT_TRUE(checked.findings.empty());
    EXPECT_GT(checked.records, 150U);
}

class EveryBit : public testing::TestWithParam<unsigned>
{
};

TEST_P(EveryBit, FlippedLeavesWhatStandsBeforeIt)
{
    every_flip file;
    for (std::size_t byte = 0; byte < file.size(); ++byte) {
        if (!file.is_chosen(byte)) continue;
        file.flip(byte, GetParam());
        if (HasFatalFailure()) return;
    }
}

INSTANTIATE_TEST_SUITE_P(OfAByte, EveryBit, testing::Range(0U, 8U));

class EveryCut : public testing::TestWithParam<std::size_t>
{
};

// Each takes a quarter of the lengths.
TEST_P(EveryCut, ShowsEveryRecordThatIsStillWhole)
{
    const auto bytes = long_trace().copy();
    const auto whole = look_at(bytes);
    for (std::size_t size = GetParam(); size < bytes.size(); size += 4) {
        const auto left = std::span(bytes).first(size);
        const auto seen = look_at(left);
        ASSERT_NO_FATAL_FAILURE(expect_bounded(seen, size)) << size;
        reader::memory_source source(left);
        ASSERT_FALSE(dump::check_file(source).sound()) << size;
        if (size < header_bytes + record_header_bytes) continue;
        std::vector<glimpse> expected;
        for (std::size_t i = 0; i < whole.records.size(); ++i) {
            const std::size_t next = (i + 1) % whole.records.size();
            const std::uint64_t offset = whole.records[i].offset;
            const std::uint64_t end = whole.records[next].offset > offset ? whole.records[next].offset : bytes.size();
            if (end <= size) expected.push_back(whole.records[i]);
        }
        ASSERT_EQ(seen.records.size(), expected.size()) << size;
        ASSERT_TRUE(seen.records == expected) << size;
    }
}

INSTANTIATE_TEST_SUITE_P(Quarters, EveryCut, testing::Range(std::size_t{0}, std::size_t{4}));

} // namespace
} // namespace qn::test
