// Headers: what is read although a field is wrong, and what is refused.
#include <gtest/gtest.h>

#include "reader/reading.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

using strings = std::vector<std::string>;
using seqs = std::vector<std::uint32_t>;

trace_builder three_ids()
{
    trace_builder file;
    for (std::uint32_t id = 1; id <= 3; ++id) {
        file.add_id(id);
    }
    file.close();
    return file;
}

TEST(Header, EveryFieldIsReadFromItsOffset)
{
    trace_builder file(8192);
    file.put_u16(4, 0x8000);
    file.put_u16(6, 7);
    file.put_u32(12, 42);
    file.put_u32(16, 43);
    file.put_u32(40, 44);
    file.put_u32(188, 45);
    file.put_u8(192, 4);
    file.put_u32(196, static_cast<std::uint32_t>(-60));
    file.close();
    const auto read = read_all(file.bytes());
    ASSERT_TRUE(read.header);
    EXPECT_TRUE(read.findings.empty());
    const auto &header = *read.header;
    EXPECT_EQ(header.order, reader::byte_order::little);
    EXPECT_EQ(header.properties, 0xC0);
    EXPECT_EQ(header.platform, 2);
    EXPECT_EQ(header.version, 6);
    EXPECT_EQ(header.flags, 0x8000);
    EXPECT_EQ(header.node_number, 7);
    EXPECT_EQ(header.ring_offset, 200u);
    EXPECT_EQ(header.seq_lock, 42u);
    EXPECT_EQ(header.tail_request, 43u);
    EXPECT_EQ(header.file_size, 8192u);
    EXPECT_EQ(header.time_info.timeinfo1, trace_builder::ticks_per_second);
    EXPECT_EQ(header.time_info.timeinfo2, trace_builder::epoch_ns);
    EXPECT_EQ(header.machine_id, 44u);
    EXPECT_EQ(header.oldest_record_offset, 200u);
    EXPECT_EQ(header.pid, 4711u);
    EXPECT_EQ(header.program, "/opt/app/bin/app -v");
    EXPECT_EQ(header.build_name, "builder 1");
    EXPECT_EQ(header.base_program, "app");
    EXPECT_EQ(header.node_id, 0xABCDu);
    EXPECT_EQ(header.page_reuse_time, 45u);
    EXPECT_EQ(header.page_state, 4);
    EXPECT_EQ(header.tz_offset_minutes, -60);
}

TEST(Header, AFreshRingHoldsNoData)
{
    trace_builder file(65536);
    file.add_free(65536 - 200, 0);
    const auto read = read_all(file.bytes());
    EXPECT_TRUE(read.findings.empty());
    ASSERT_EQ(read.records.size(), 1u);
    EXPECT_EQ(read.records[0].kind, "free");
    EXPECT_EQ(read.records[0].header.length, 65336u);
    EXPECT_TRUE(read.data_seqs().empty());
}

TEST(Header, AnEmptyOrTinyFileIsNoTraceFile)
{
    const auto file = three_ids();
    for (std::size_t size = 0; size < 80; ++size) {
        const auto read = read_all(file.bytes().first(size));
        EXPECT_FALSE(read.header) << size;
        EXPECT_EQ(read.damage().size(), 1u) << size;
        EXPECT_TRUE(read.records.empty()) << size;
    }
}

TEST(Header, OtherFilesAreNotTakenForTraceFiles)
{
    std::vector<std::byte> zeros(65536);
    std::vector<std::byte> ones(65536, std::byte{0xFF});
    std::vector<std::byte> text(65536, std::byte{'a'});
    std::vector<std::byte> pattern(65536); // what a new file is filled with before its header is written
    for (std::size_t i = 0; i < pattern.size(); ++i) {
        pattern[i] = static_cast<std::byte>(i & 0xFF);
    }
    for (const auto &bytes : {zeros, ones, text, pattern}) {
        const auto read = read_all(bytes);
        EXPECT_FALSE(read.header);
        EXPECT_EQ(read.damage(), strings{"0: not a trace file: its header makes no sense"});
    }
}

TEST(Header, ANewerVersionIsToldAndReadNoFurther)
{
    auto file = three_ids();
    file.put_u16(2, 7);
    const auto read = read_all(file.bytes());
    EXPECT_FALSE(read.header);
    EXPECT_TRUE(read.records.empty());
    EXPECT_EQ(read.damage(),
              strings{"2: format version 7 is newer than this program, which knows the versions up to 6"});
}

TEST(Header, OlderVersionsMayBeginTheirRingElsewhere)
{
    for (const std::uint32_t begin : {180u, 188u, 204u, 256u, 4096u}) {
        trace_builder file(16384);
        file.put_u16(2, 5);
        file.put_u32(8, begin);
        file.put_u32(44, begin);
        file.at = begin;
        file.add_id(1);
        file.add_id(2);
        file.close();
        const auto read = read_all(file.bytes());
        EXPECT_TRUE(read.findings.empty()) << begin;
        EXPECT_EQ(read.data_seqs(), (seqs{2, 4})) << begin;
        EXPECT_EQ(read.header->page_state.has_value(), begin >= 200) << begin;
        EXPECT_EQ(read.header->node_id.has_value(), begin >= 188) << begin;
    }
}

TEST(Header, AMissingPropertyBitIsToldAndTheRestShown)
{
    auto file = three_ids();
    file.put_u8(0, 0x80);
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.damage(), strings{"0: the property bit 0x40, which every trace file has, is not set"});
}

TEST(Header, AWrongByteOrderBitIsToldAndTheRestShown)
{
    auto file = three_ids();
    file.put_u8(0, 0x40);
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.damage(),
              strings{"0: the byte-order bit 0x80 contradicts the rest of the header, which is little-endian"});
}

TEST(Header, AWrongRingOffsetIsReplacedByTheUsualOne)
{
    for (const std::uint32_t hostile : {0u, 51u, 48u, 201u, 8192u, 0x7FFFFFFCu, 0xFFFFFFFFu}) {
        auto file = three_ids();
        file.put_u32(8, hostile);
        const auto read = read_all(file.bytes());
        EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6})) << hostile;
        ASSERT_EQ(read.damage().size(), 1u) << hostile;
        EXPECT_EQ(read.damage()[0],
                  "8: the header gives " + std::to_string(hostile) + " as the offset of the first record; 200 is used");
    }
}

TEST(Header, AWrongFileSizeIsToldAndTheFilesOwnIsUsed)
{
    auto file = three_ids();
    file.put_u32(20, 0);
    auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.damage(), strings{"20: the header gives 0 as the size of the file, which has 4096 bytes"});

    file.put_u32(20, 0xFFFFFFFF);
    read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.damage(), strings{"4096: the file is truncated: it has 4096 bytes of 4294967295"});
}

TEST(Header, BytesBehindTheRingAreToldAndNotRead)
{
    auto bytes = three_ids().copy();
    bytes.resize(5000, std::byte{0x55});
    const auto read = read_all(bytes);
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    EXPECT_EQ(read.damage(), strings{"4096: 904 bytes behind the end of the ring do not belong to the trace"});
}

TEST(Header, AnOldestOffsetOutsideTheRingDoesNotHideTheRecords)
{
    for (const std::uint32_t hostile : {0u, 196u, 201u, 4069u, 4072u, 4096u, 0xFFFFFFFCu}) {
        auto file = three_ids();
        file.set_oldest(hostile);
        const auto read = read_all(file.bytes());
        EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6})) << hostile;
        EXPECT_EQ(read.damage(), strings{"44: the header gives " + std::to_string(hostile) +
                                         " as the offset of the oldest record, the ring is 200 to 4096"});
    }
}

TEST(Header, ATimeBaseWithoutTicksLeavesTheOldestRecordsWithoutTime)
{
    auto file = three_ids();
    file.put_u64(24, 0);
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.data_seqs(), (seqs{2, 4, 6}));
    ASSERT_EQ(read.damage().size(), 1u);
    EXPECT_EQ(read.damage()[0].substr(0, 4), "24: ");
    EXPECT_FALSE(read.records.back().time_ns);
}

TEST(Header, TextsWithoutAnEndStopAtTheirFields)
{
    auto file = three_ids();
    file.put(52, byte_string().chars(std::string(48, 'p')));
    file.put(100, byte_string().chars(std::string(32, 'b')));
    file.put(132, byte_string().chars(std::string(48, 'q')));
    const auto read = read_all(file.bytes());
    EXPECT_EQ(read.header->program, std::string(48, 'p'));
    EXPECT_EQ(read.header->build_name, std::string(32, 'b'));
    EXPECT_EQ(read.header->base_program, std::string(48, 'q'));
}

} // namespace
} // namespace qn::test
