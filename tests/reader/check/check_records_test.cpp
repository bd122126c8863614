// What check_file() says of rings and records: what is damage, what is a loss, and what is neither.
#include <gtest/gtest.h>

#include "reader/check/long_trace.h"
#include "reader/every_kind.h"
#include "tools/qntrace/check/file_check.h"

namespace qn::test
{
namespace
{

using severity = reader::finding::severity;

dump::file_check check(const trace_builder &file)
{
    reader::memory_source source(file.bytes());
    return dump::check_file(source);
}

// The texts of all findings of one severity.
std::vector<std::string> texts(const dump::file_check &checked, severity level)
{
    std::vector<std::string> found;
    for (const auto &finding : checked.findings)
        if (finding.what.level == level) found.push_back(finding.what.text);
    return found;
}

using strings = std::vector<std::string>;

// Three records that are sound, and whatever `add` adds between the second and the third.
template <typename Add>
dump::file_check check_with(const Add &add)
{
    trace_builder file;
    file.add_id(1);
    file.add_id(2);
    add(file);
    file.add_id(3);
    file.close();
    return check(file);
}

void expect_damage(const dump::file_check &checked, const std::string &text)
{
    EXPECT_EQ(texts(checked, severity::damage), strings{text});
    EXPECT_FALSE(checked.sound());
    EXPECT_EQ(checked.records, 3U);
}

TEST(CheckRecords, AFileWithEveryKindAndBothByteOrdersIsSound)
{
    const auto sound = check(every_kind());
    EXPECT_TRUE(sound.sound());
    EXPECT_EQ(sound.records, 14U);
    EXPECT_EQ(sound.unreadable_bytes, 0U);
    EXPECT_EQ(sound.ring_bytes, 4096U - 200U);
    EXPECT_TRUE(check(long_trace(endian::big)).sound());
}

TEST(CheckRecords, AnUnfinishedRecordIsALoss)
{
    const auto checked = check_with([](trace_builder &file) { file.add(0xFFFF, file.body().u32(1)); });
    EXPECT_TRUE(checked.sound());
    EXPECT_EQ(checked.lost.unfinished, 1U);
    EXPECT_EQ(texts(checked, severity::loss).size(), 1U);
}

TEST(CheckRecords, AGapInTheSequenceNumbersIsALoss)
{
    const auto checked = check_with([](trace_builder &file) { file.seq += 6; });
    EXPECT_TRUE(checked.sound());
    EXPECT_EQ(checked.lost.missing, 3U);
    EXPECT_EQ(texts(checked, severity::loss), strings{"3 records are missing before the sequence number 12"});
    EXPECT_EQ(checked.findings[0].behind, 4U);
}

TEST(CheckRecords, ASequenceNumberThatGoesBackIsDamage)
{
    const auto checked = check_with([](trace_builder &file) { file.seq -= 4; });
    EXPECT_EQ(texts(checked, severity::damage), strings{"sequence number 2 follows 4"});
}

TEST(CheckRecords, AnOddSequenceNumberIsDamage)
{
    const auto checked = check_with([](trace_builder &file) { file.put_u32(file.add_id(9) + 8, 7); });
    expect_damage(checked, "sequence number 7 is odd, which no record's is");
}

TEST(CheckRecords, AFillerWithAnImpossibleNumberIsDamage)
{
    for (const std::uint32_t number : {4093U, 2U}) {
        const auto checked = check_with([&](trace_builder &file) { file.add_free(40, number); });
        EXPECT_FALSE(checked.sound()) << number;
        EXPECT_EQ(checked.records, 3U) << number;
    }
}

TEST(CheckRecords, ANumberThatAKilledWriterLeftAtTheOldestRecordIsNone)
{
    trace_builder file;
    file.at = 600;
    file.seq = 400;
    file.add(0xFFFF, file.body().u32(1)); // the space of the oldest record, taken, but not yet given away
    file.seq = 100;
    while (file.at + 32 + 28 <= 4096) file.add_id(1);
    file.seq += 2;
    file.add_free(4096 - file.at, file.seq);
    file.at = 200;
    while (file.at + 2 * 32 <= 600) file.add_id(2);
    file.add(1, file.body().u32(3), 600 - file.at - 32);
    file.set_oldest(600);
    EXPECT_TRUE(check(file).sound());
}

TEST(CheckRecords, AClockThatStepsBackIsNoted)
{
    const auto checked = check_with([](trace_builder &file) { file.counter -= 5'000'000; });
    EXPECT_TRUE(checked.sound());
    EXPECT_EQ(texts(checked, severity::note), strings{"the clock steps back by 4999us"});
}

TEST(CheckRecords, AStartRecordOfAnotherComponentIsDamage)
{
    const auto checked = check_with([](trace_builder &file) {
        const auto at = file.add_start(4711, trace_builder::ticks_per_second, trace_builder::epoch_ns);
        file.put_u32(at + 12, 0x41414141);
    });
    expect_damage(
        checked,
        "a record of the kind start, which the library writes itself, is another component's (sequence number 6)");
}

TEST(CheckRecords, AStartOfNoProcessIsDamage)
{
    const auto checked = check_with(
        [](trace_builder &file) { file.add_start(0, trace_builder::ticks_per_second, trace_builder::epoch_ns); });
    expect_damage(checked, "the process that starts here has the id 0 (sequence number 6)");
}

TEST(CheckRecords, APageNoteAmidTheRecordsIsDamage)
{
    const auto checked = check_with([](trace_builder &file) {
        file.component = "____";
        file.add(2, file.body().text("SPOOL: app.1.sp not spooled 2 consecutive times"));
        file.component = "TEST";
    });
    expect_damage(checked,
                  "a page note, which begins a page with the number 0, stands amid the records (sequence number 6)");
}

TEST(CheckRecords, APageNoteThatTellsNoNumberIsDamage)
{
    trace_builder file;
    file.component = "____";
    file.seq = static_cast<std::uint32_t>(-2);
    file.add(2, file.body().text("SPOOL: app.1.sp not spooled"));
    file.close();
    EXPECT_EQ(texts(check(file), severity::damage),
              strings{"the page note does not tell how often the page was overwritten (sequence number 0)"});
}

TEST(CheckRecords, APageOverwrittenBeforeItWasCopiedIsALoss)
{
    trace_builder file;
    file.component = "____";
    file.seq = static_cast<std::uint32_t>(-2);
    file.add(2, file.body().text("SPOOL: app.1.sp not spooled 3 consecutive times"));
    file.close();
    const auto checked = check(file);
    EXPECT_TRUE(checked.sound());
    EXPECT_EQ(checked.lost.unspooled, 3U);
}

TEST(CheckRecords, ACountThatLeavesMostOfTheRecordUnusedIsDamage)
{
    const auto checked = check_with([](trace_builder &file) {
        byte_string body = file.body();
        body.u32(7).u32(2); // of 40
        for (std::uint32_t i = 0; i < 40; ++i) body.u32(i);
        file.add(12, body);
    });
    expect_damage(checked, "the record has 196 bytes, what it holds needs 44 (sequence number 6)");
}

TEST(CheckRecords, ARestOfTheRingThatStaysWithItsRecordIsNoDamage)
{
    for (const std::size_t slack : {4U, 24U, 28U})
        EXPECT_TRUE(check_with([&](trace_builder &file) { file.add(1, file.body().u32(9), slack); }).sound()) << slack;
}

TEST(CheckRecords, ErrorTextsThatRunIntoEachOtherAreDamage)
{
    const auto checked = check_with([](trace_builder &file) {
        byte_string body = file.body();
        body.u32(1).u32(2).u32(3).u32(72).u32(76).u32(0).u32(0).u32(0).u32(0).u32(0).u32(0);
        file.add(14, body.chars("func").text("file.c").text("room for both"));
    });
    expect_damage(checked, "two texts of the error overlap (sequence number 6)");
}

TEST(CheckRecords, WhatTheWalkCannotPassIsCountedInBytes)
{
    trace_builder file;
    file.add_id(1);
    const auto torn = file.add_id(2);
    file.add_id(3);
    file.close();
    file.set_oldest(200);
    file.put_u32(torn, 7);
    const auto checked = check(file);
    EXPECT_EQ(checked.records, 1U);
    EXPECT_EQ(checked.unreadable_bytes, 4096U - torn);
    ASSERT_EQ(checked.findings.size(), 1U);
    EXPECT_EQ(checked.findings[0].what.offset, torn);
    EXPECT_EQ(checked.findings[0].behind, 2U);
}

TEST(CheckRecords, WhatATruncatedFileLacksIsUnreadable)
{
    const auto whole = long_trace().copy();
    const auto cut = std::span(whole).first(60000);
    reader::memory_source source(cut);
    const auto checked = dump::check_file(source);
    EXPECT_FALSE(checked.sound());
    EXPECT_EQ(checked.ring_bytes, long_trace_bytes - 200);
    EXPECT_GE(checked.unreadable_bytes, long_trace_bytes - 60000);
}

TEST(CheckRecords, AFloodOfFindingsIsCounted)
{
    trace_builder file(16384);
    for (int i = 0; i < 300; ++i) file.add(5, file.body().u32(1)); // of no known kind
    file.close();
    const auto checked = check(file);
    EXPECT_EQ(checked.findings.size(), dump::file_check::most_findings);
    EXPECT_EQ(checked.more_findings, 200U);
    EXPECT_EQ(checked.damages, 300U);
}

} // namespace
} // namespace qn::test
