// Selections: what each condition lets pass, how they go together, and what they do not take.
#include <gtest/gtest.h>

#include <functional>
#include <stdexcept>
#include <string>

#include "reader/every_kind.h"
#include "reader/select_reading.h"
#include "tools/qntrace/select/last.h"

namespace qn::test
{
namespace
{

using dump::selection;

constexpr std::uint32_t filler = 4095;

// The records of a file with every kind that pass.
seqs selected(const std::function<void(selection &)> &choose)
{
    selection chosen;
    choose(chosen);
    return seqs_selected(every_kind(), chosen);
}

std::string refusal(const std::function<void(selection &)> &choose)
{
    selection chosen;
    try {
        choose(chosen);
    } catch (const std::invalid_argument &error) {
        return error.what();
    }
    return "";
}

TEST(Selection, TakesEverythingUntilItIsToldOtherwise)
{
    EXPECT_EQ(selected([](selection &) {}), (seqs{filler, 0, 2, 4, 6, 8, 10, 12, 14, 16, 18, 20, 22, 24, 26, 28}));
}

TEST(Selection, ComponentsAreComparedWithoutWhatFillsThemUp)
{
    EXPECT_EQ(selected([](auto &s) { s.add_component("AB"); }), (seqs{16, 18, 20}));
    EXPECT_EQ(selected([](auto &s) { s.add_component("AB  "); }), (seqs{16, 18, 20}));
    EXPECT_EQ(selected([](auto &s) { s.add_component("IDX"); }), (seqs{4, 6, 8, 10, 12, 14}));
    EXPECT_EQ(selected([](auto &s) { s.add_component("I"); }), seqs{});
}

TEST(Selection, OfSeveralComponentsAnyWillDo)
{
    EXPECT_EQ(selected([](auto &s) {
                  s.add_component("AB");
                  s.add_component("IDX2");
              }),
              (seqs{16, 18, 20, 26, 28}));
}

TEST(Selection, KindsAreNamedAsInTheText)
{
    EXPECT_EQ(selected([](auto &s) { s.add_kind("error"); }), seqs{14});
    EXPECT_EQ(selected([](auto &s) {
                  s.add_kind("note");
                  s.add_kind("restart");
                  s.add_kind("unfinished");
                  s.add_kind("free");
              }),
              (seqs{filler, 0, 22, 26}));
}

TEST(Selection, AnUnknownKindIsRefusedWithThoseThatThereAre)
{
    EXPECT_EQ(
        refusal([](auto &s) { s.add_kind("errors"); }),
        "errors is no kind; there are free, unfinished, id, note, data, values32, values64, error, strings, start, "
        "calibration, restart, unknown");
}

TEST(Selection, ThreadsAreDecimalOrHexadecimal)
{
    trace_builder file;
    file.add_id(1);
    file.thread = 0xFFFFFFFF;
    file.add_id(2);
    file.close();
    for (const auto *text : {"4294967295", "0xffffffff", "0XFFFFFFFF"}) {
        selection chosen;
        chosen.add_thread(text);
        EXPECT_EQ(seqs_selected(file, chosen), seqs{4}) << text;
    }
}

TEST(Selection, WhatIsNoThreadIsRefused)
{
    for (const auto *text : {"", "x", "0x", "-1", "+1", " 1", "1 ", "1-2", "0x1g", "4294967296", "0x100000000"}) {
        EXPECT_EQ(refusal([&](auto &s) { s.add_thread(text); }),
                  "expected a number of at most 32 bits, decimal or hexadecimal behind 0x")
            << text;
    }
}

TEST(Selection, IdsAreNumbersAndRangesThatIncludeTheirEnds)
{
    EXPECT_EQ(selected([](auto &s) { s.add_ids("21"); }), seqs{8});
    EXPECT_EQ(selected([](auto &s) { s.add_ids("0x15"); }), seqs{8});
    EXPECT_EQ(selected([](auto &s) { s.add_ids("22-24"); }), (seqs{10, 12, 16}));
    EXPECT_EQ(selected([](auto &s) { s.add_ids("0x16-23"); }), (seqs{10, 12}));
    EXPECT_EQ(selected([](auto &s) {
                  s.add_ids("17-17");
                  s.add_ids("99");
              }),
              (seqs{4, 28}));
}

TEST(Selection, ARecordWithoutAnIdMatchesNoRange)
{
    EXPECT_EQ(selected([](auto &s) { s.add_ids("0-4294967295"); }), (seqs{4, 8, 10, 12, 14, 16, 20, 28}));
    EXPECT_EQ(selected([](auto &s) { s.add_ids("0xffffffff"); }), seqs{});
}

TEST(Selection, WhatIsNoRangeIsRefused)
{
    for (const auto *text : {"", "-", "1-", "-1", "2-1", "1-2-3", "none", "1,2", "4294967296", "1-4294967296"}) {
        EXPECT_EQ(
            refusal([&](auto &s) { s.add_ids(text); }),
            "expected a number N, or a range N-M that goes up, of at most 32 bits, decimal or hexadecimal behind 0x")
            << text;
    }
}

TEST(Selection, SinceAndUntilIncludeTheirTimes)
{
    const auto at = "2026-11-21T05:12:01.123460789Z"; // when the record 8 was written
    EXPECT_EQ(selected([&](auto &s) {
                  s.set_since(at, test_now);
                  s.set_until(at, test_now);
              }),
              seqs{8});
    // The calibration turned the clock back.
    EXPECT_EQ(selected([&](auto &s) { s.set_until(at, test_now); }), (seqs{0, 2, 4, 6, 8, 24, 26, 28}));
    EXPECT_EQ(selected([&](auto &s) { s.set_since(at, test_now); }), (seqs{8, 10, 12, 14, 16, 18, 20, 22}));
}

TEST(Selection, ANanosecondBesideARecordSelectsOrLeavesIt)
{
    EXPECT_EQ(selected([&](auto &s) {
                  s.set_since("@1795237921.123460788", test_now);
                  s.set_until("@1795237921.123461788", test_now);
              }),
              seqs{8});
    EXPECT_EQ(selected([&](auto &s) {
                  s.set_since("@1795237921.123460790", test_now);
                  s.set_until("@1795237921.123461790", test_now);
              }),
              seqs{10});
}

TEST(Selection, RelativeTimesCountFromNow)
{
    const timespec two_seconds_later = {test_now.tv_sec + 2, 0};
    EXPECT_EQ(selected([&](auto &s) { s.set_since("-500ms", two_seconds_later); }), seqs{22});
    EXPECT_EQ(selected([&](auto &s) { s.set_until("-1s", two_seconds_later); }), (seqs{24, 26, 28}));
}

TEST(Selection, ARecordWithoutATimeIsNeverInAPeriod)
{
    trace_builder file;
    file.put_u64(24, 0); // no ticks a second
    file.add_id(1);
    file.close();
    selection from_the_beginning;
    from_the_beginning.set_since("0000-01-01T00:00:00Z", test_now);
    EXPECT_EQ(seqs_selected(file, from_the_beginning), seqs{});
    selection to_the_end;
    to_the_end.set_until("9999-12-31T23:59:59Z", test_now);
    EXPECT_EQ(seqs_selected(file, to_the_end), seqs{});
}

TEST(Selection, GrepLooksIntoAllTexts)
{
    EXPECT_EQ(selected([](auto &s) { s.set_grep("formatted"); }), seqs{18});
    EXPECT_EQ(selected([](auto &s) { s.set_grep("^plain$"); }), seqs{16});
    EXPECT_EQ(selected([](auto &s) { s.set_grep("opening \"/tmp/.*\": -5 "); }), seqs{14});
    EXPECT_EQ(selected([](auto &s) { s.set_grep("^(SPOOL|core)"); }), (seqs{0, 22}));
    EXPECT_EQ(selected([](auto &s) { s.set_grep("hello|0123456789"); }), seqs{}); // data blocks
    EXPECT_EQ(selected([](auto &s) { s.set_grep("app\\.cat"); }), seqs{});        // the catalogue's name
}

TEST(Selection, WhatIsNoRegularExpressionIsRefused)
{
    EXPECT_EQ(refusal([](auto &s) { s.set_grep("(a"); }), "this is no regular expression: Unmatched ( or \\(");
    EXPECT_EQ(refusal([](auto &s) { s.set_grep(std::string(1001, 'a')); }),
              "a regular expression of 1001 bytes is too long: 1000 are taken");
    EXPECT_EQ(refusal([](auto &s) { s.set_grep(std::string(1000, 'a')); }), "");
}

TEST(Selection, EachOfItsConditionsMustHold)
{
    EXPECT_EQ(selected([](auto &s) {
                  s.add_component("IDX");
                  s.add_kind("id");
                  s.add_kind("values32");
                  s.add_kind("strings");
                  s.add_ids("1-30");
              }),
              (seqs{4, 10}));
    EXPECT_EQ(selected([](auto &s) {
                  s.add_component("AB");
                  s.set_grep("e");
                  s.set_where("id == 24", test_now);
              }),
              seqs{16});
}

TEST(Selection, AFillerHasNothingThatItsHeaderOnlySeemsToHave)
{
    EXPECT_EQ(selected([](auto &s) {
                  s.add_kind("free");
                  s.add_component("IDX2");
              }),
              seqs{});
    EXPECT_EQ(selected([](auto &s) {
                  s.add_kind("free");
                  s.add_thread("0x7f01");
              }),
              seqs{});
}

// Sequence numbers of the newest `most` of a file with every kind.
seqs last_of(std::size_t most)
{
    dump::last_records newest(most);
    seqs_if(every_kind(), [&](const auto &, const auto &record) {
        newest.keep(record);
        return true;
    });
    seqs result;
    newest.for_each([&](const reader::trace_record &record) { result.push_back(record.raw.header.seq); });
    return result;
}

TEST(LastRecords, AreTheNewestOldestFirst)
{
    EXPECT_EQ(last_of(0), seqs{});
    EXPECT_EQ(last_of(1), seqs{28});
    EXPECT_EQ(last_of(3), (seqs{24, 26, 28}));
    EXPECT_EQ(last_of(15), (seqs{0, 2, 4, 6, 8, 10, 12, 14, 16, 18, 20, 22, 24, 26, 28}));
}

TEST(LastRecords, AreAllOfThemWhenThereAreNoMore)
{
    const seqs all = {filler, 0, 2, 4, 6, 8, 10, 12, 14, 16, 18, 20, 22, 24, 26, 28};
    EXPECT_EQ(last_of(16), all);
    EXPECT_EQ(last_of(17), all);
    EXPECT_EQ(last_of(SIZE_MAX), all);
}

} // namespace
} // namespace qn::test
