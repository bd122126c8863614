// What salvage keeps: the sound records with all that they are, in a file that is sound and of the same byte order.
#include <gtest/gtest.h>

#include <cstdio>
#include <memory>

#include "reader/check/long_trace.h"
#include "reader/every_kind.h"
#include "reader/reading.h"
#include "tools/qntrace/check/file_check.h"
#include "tools/qntrace/salvage/ring_writer.h"
#include "tools/qntrace/salvage/sound_records.h"

namespace qn::test
{
namespace
{

using bytes = std::vector<std::byte>;

struct salvaged {
    bytes file; // empty: nothing could be read
    std::uint64_t left_out = 0;
    std::uint64_t refused = 0; // by the writer
};

bytes contents_of(std::FILE *stream)
{
    std::fseek(stream, 0, SEEK_END);
    bytes all(static_cast<std::size_t>(std::ftell(stream)));
    std::rewind(stream);
    EXPECT_EQ(std::fread(all.data(), 1, all.size(), stream), all.size());
    return all;
}

salvaged salvage(std::span<const std::byte> file)
{
    salvaged result;
    reader::memory_source source(file);
    reader::trace_reader trace(source, [](const reader::finding &) {});
    if (!trace.header()) return result;
    bytes header(file.begin(), file.begin() + static_cast<std::ptrdiff_t>(trace.header()->ring.begin));
    const std::unique_ptr<std::FILE, int (*)(std::FILE *)> out(std::tmpfile(), std::fclose);
    dump::ring_writer ring(out.get(), header, *trace.header());
    dump::sound_records sound(*trace.header(), [&](const reader::trace_record &record, const cu_timeinfo_t &base) {
        if (!ring.add(record, base)) ++result.refused;
    });
    while (const auto record = trace.next()) sound.pass(*record);
    sound.finish();
    ring.finish();
    result.left_out = sound.left_out();
    result.file = contents_of(out.get());
    return result;
}

dump::file_check check(std::span<const std::byte> file)
{
    reader::memory_source source(file);
    return dump::check_file(source);
}

// The JSON lines of the records: all that is decoded, times and all.
std::vector<std::string> lines(std::span<const std::byte> file)
{
    std::vector<std::string> all;
    const auto text = json_of(file);
    for (std::size_t begin = 0; begin < text.size();) {
        const auto end = text.find('\n', begin);
        all.push_back(text.substr(begin, end - begin));
        begin = end + 1;
    }
    return all;
}

void expect_salvaged(std::span<const std::byte> damaged, const std::vector<std::string> &expected)
{
    const auto result = salvage(damaged);
    const auto checked = check(result.file);
    EXPECT_TRUE(checked.sound()) << (checked.findings.empty() ? "" : checked.findings[0].what.text);
    EXPECT_EQ(checked.records, expected.size());
    EXPECT_EQ(lines(result.file), expected);
}

// Without the line at `index`.
std::vector<std::string> without(std::vector<std::string> all, std::size_t index)
{
    all.erase(all.begin() + static_cast<std::ptrdiff_t>(index));
    return all;
}

TEST(Salvage, KeepsEveryRecordOfASoundFileInEitherByteOrder)
{
    for (const endian order : {endian::little, endian::big}) {
        const auto file = long_trace(order);
        expect_salvaged(file.bytes(), lines(file.bytes()));
        const auto result = salvage(file.bytes());
        EXPECT_EQ(result.file.size(), file.bytes().size());
        EXPECT_EQ(result.file[0], file.bytes()[0]);
    }
}

TEST(Salvage, LeavesNoGapWhereTheRingWasClosedOff)
{
    const auto result = salvage(long_trace().bytes());
    EXPECT_EQ(check(result.file).lost.missing, 0U);
}

TEST(Salvage, KeepsTheTimesOfSeveralTimeBases)
{
    const auto file = every_kind();
    const auto result = salvage(file.bytes());
    EXPECT_EQ(lines(result.file), lines(file.bytes()));
    EXPECT_TRUE(check(result.file).sound());
}

TEST(Salvage, AnUnfinishedRecordIsMissingThen)
{
    const auto result = salvage(every_kind().bytes());
    EXPECT_EQ(check(result.file).lost.missing, 1U);
    EXPECT_EQ(check(result.file).lost.unfinished, 0U);
}

struct three_records {
    trace_builder file;
    std::size_t first, second, third;
    three_records() : first(file.add_id(1)), second(file.add_strings(2, {"two"})), third(file.add_id(3))
    {
        file.close();
    }
};

TEST(Salvage, LeavesOutARecordWhoseBodyIsDamaged)
{
    three_records of;
    const auto all = lines(of.file.bytes());
    of.file.put_u32(of.second + 36, 4000); // more bytes of strings than there are
    expect_salvaged(of.file.bytes(), without(all, 1));
    EXPECT_EQ(salvage(of.file.bytes()).left_out, 1U);
}

TEST(Salvage, LeavesOutTheOneRecordWhoseNumberIsWrong)
{
    for (const std::uint32_t number : {78U, 0U, 7U, 0x80000004U}) {
        trace_builder file;
        std::vector<std::size_t> places;
        for (std::uint32_t id = 1; id <= 5; ++id) places.push_back(file.add_id(id));
        file.close();
        const auto all = lines(file.bytes());
        file.put_u32(places[2] + 8, number);
        expect_salvaged(file.bytes(), without(all, 2));
    }
}

TEST(Salvage, KeepsTheRecordsBehindADamagedOneInTheNewerPart)
{
    auto file = long_trace();
    const auto all = lines(file.bytes());
    const auto read = read_all(file.bytes());
    file.put_u32(read.records[41].offset, 13);
    const auto left = lines(file.bytes());
    EXPECT_LT(left.size(), all.size());
    expect_salvaged(file.bytes(), left);
}

TEST(Salvage, ATruncatedFileBecomesAWholeOne)
{
    const auto whole = long_trace().copy();
    const auto cut = std::span(whole).first(50001);
    expect_salvaged(cut, lines(cut));
    EXPECT_EQ(salvage(cut).file.size(), whole.size());
}

TEST(Salvage, TheTimesStayRightWithoutTheRecordThatSetThem)
{
    trace_builder file;
    file.add_id(1);
    const auto start = file.add_start(4711, 2 * trace_builder::ticks_per_second, trace_builder::epoch_ns + 1'000'000);
    file.add_id(2);
    file.add_start(4712, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.add_id(3);
    file.close();
    const auto all = lines(file.bytes());
    file.put_u32(start + 32, 0); // a start of no process
    const auto result = salvage(file.bytes());
    EXPECT_EQ(result.left_out, 1U);
    auto found = lines(result.file);
    ASSERT_EQ(found.size(), all.size());
    EXPECT_NE(found[1].find("\"kind\":\"calibration\""), std::string::npos) << found[1];
    EXPECT_EQ(without(found, 1), without(all, 1));
    EXPECT_TRUE(check(result.file).sound());
}

TEST(Salvage, ARecordWhoseTimeNothingTellsAnyMoreIsRefused)
{
    trace_builder file;
    file.add_id(1);
    const auto start = file.add_start(4711, 2 * trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.put_u32(start + 32, 0);
    file.seq -= 2; // no number is left for what sets the time
    file.put_u32(start + 8, 3);
    file.add_id(2);
    file.close();
    const auto result = salvage(file.bytes());
    EXPECT_EQ(result.refused, 1U);
    EXPECT_EQ(check(result.file).records, 1U);
}

TEST(Salvage, TheFirstTimeBaseThatIsFoundStandsInForADamagedOne)
{
    trace_builder file;
    file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
    file.add_id(1);
    file.close();
    const auto all = lines(file.bytes());
    file.put_u64(24, 0);
    expect_salvaged(file.bytes(), all);
}

TEST(Salvage, ARestTooShortForARecordHeaderStaysWithTheLastRecord)
{
    trace_builder file(200 + 3 * 32 + 20);
    for (std::uint32_t id = 1; id <= 3; ++id) file.add_id(id);
    file.set_oldest(200);
    expect_salvaged(file.bytes(), lines(file.bytes()));
}

TEST(Salvage, AFileWithoutRecordsIsAFreshOne)
{
    trace_builder file;
    file.add_free(4096 - 200, 0);
    expect_salvaged(file.bytes(), {});
}

// Whatever bit of the header flips: what is salvaged is sound, and nearly always has all records.
TEST(Salvage, AHeaderWithAnyFlippedBitIsMended)
{
    const auto file = every_kind();
    auto damaged = file.copy();
    unsigned whole = 0;
    for (std::size_t bit = 0; bit < 8 * 200; ++bit) {
        const auto flip = std::byte{1} << (bit % 8);
        damaged[bit / 8] ^= flip;
        // A size of gigabytes would become one in memory.
        const bool is_size = bit / 8 >= 20 && bit / 8 < 24;
        if (!is_size && check(damaged).readable) {
            const auto result = salvage(damaged);
            const auto checked = check(result.file);
            EXPECT_TRUE(checked.sound()) << bit << ": "
                                         << (checked.findings.empty() ? "" : checked.findings[0].what.text);
            EXPECT_LE(checked.records, check(damaged).records) << bit;
            if (checked.records == 14) ++whole;
        }
        damaged[bit / 8] ^= flip;
    }
    EXPECT_GT(whole, 1500U);
}

// Of all records.
TEST(Salvage, WhateverBitFlipsTheOutcomeIsSound)
{
    const auto file = every_kind();
    auto damaged = file.copy();
    for (std::size_t bit = 8 * 200; bit < 8 * 1300; ++bit) {
        const auto flip = std::byte{1} << (bit % 8);
        damaged[bit / 8] ^= flip;
        const auto result = salvage(damaged);
        const auto checked = check(result.file);
        ASSERT_TRUE(checked.sound()) << bit << ": " << checked.findings[0].what.text;
        damaged[bit / 8] ^= flip;
    }
}

} // namespace
} // namespace qn::test
