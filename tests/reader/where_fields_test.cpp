// What each field of a filter expression looks at, and what becomes of records that do not have it.
#include <gtest/gtest.h>

#include <algorithm>

#include "reader/every_kind.h"
#include "reader/select_reading.h"

namespace qn::test
{
namespace
{

constexpr std::uint32_t filler = 4095;

// In the order of the walk, which begins with the filler.
const seqs all = {filler, 0, 2, 4, 6, 8, 10, 12, 14, 16, 18, 20, 22, 24, 26, 28};

seqs where(std::string_view expression) { return seqs_where(every_kind(), expression); }

// All but those given.
seqs others(const seqs &excluded)
{
    seqs result;
    for (const auto seq : all) {
        if (std::find(excluded.begin(), excluded.end(), seq) == excluded.end()) result.push_back(seq);
    }
    return result;
}

TEST(WhereFields, CompIsTheComponentWithoutTrailingBlanks)
{
    EXPECT_EQ(where("comp == \"AB\""), (seqs{16, 18, 20}));
    EXPECT_EQ(where("comp == \"AB  \""), (seqs{16, 18, 20}));
    EXPECT_EQ(where("comp =~ \"^IDX$\""), (seqs{4, 6, 8, 10, 12, 14}));
    EXPECT_EQ(where("comp =~ \"IDX\""), (seqs{4, 6, 8, 10, 12, 14, 26, 28}));
    trace_builder padded;
    padded.component = "AB  ";
    padded.add_id(1);
    padded.close();
    EXPECT_EQ(seqs_where(padded, "comp == \"AB\""), seqs{2});
}

TEST(WhereFields, KindIsNamedAsInTheText)
{
    const struct {
        std::string name;
        seqs expected;
    } kinds[] = {{"free", {filler}}, {"unfinished", {26}}, {"id", {4, 6, 28}},        {"note", {0}},
                 {"data", {8}},      {"values32", {10}},   {"values64", {12}},        {"error", {14}},
                 {"start", {2}},     {"restart", {22}},    {"strings", {16, 18, 20}}, {"calibration", {24}},
                 {"unknown", seqs{}}};
    for (const auto &kind : kinds) {
        EXPECT_EQ(where("kind == \"" + kind.name + "\""), kind.expected) << kind.name;
    }
    EXPECT_EQ(where("kind =~ \"^values\""), (seqs{10, 12}));
}

TEST(WhereFields, IdIsThatOfTheRecordsThatHaveOne)
{
    EXPECT_EQ(where("id >= 0"), (seqs{4, 8, 10, 12, 14, 16, 20, 28}));
    EXPECT_EQ(where("id == 0xffffffff"), seqs{});
    EXPECT_EQ(where("id in (17, 21, 31)"), (seqs{4, 8, 14}));
}

TEST(WhereFields, ThreadSeqAndLengthAreOfTheRecordHeader)
{
    trace_builder file;
    file.add_id(1);
    file.thread = 0xFFFFFFFF;
    file.add(13, file.body().u32(2).u32(1).u64(0));
    file.close();
    EXPECT_EQ(seqs_where(file, "thread == 0x7f01"), seqs{2});
    EXPECT_EQ(seqs_where(file, "thread == 4294967295"), seqs{4});
    EXPECT_EQ(seqs_where(file, "seq == 4"), seqs{4});
    EXPECT_EQ(seqs_where(file, "length == 32"), seqs{2});
    EXPECT_EQ(seqs_where(file, "length == 44"), seqs{4});
}

TEST(WhereFields, PidIsThatOfTheHeaderOrOfAStart)
{
    auto file = every_kind();
    file.put_u32(48, 7);
    EXPECT_EQ(seqs_where(file, "pid == 4711"), seqs{2});
    EXPECT_EQ(seqs_where(file, "pid == 4712"), seqs{22});
    EXPECT_EQ(seqs_where(file, "pid == 7"), others({2, 22}));
}

TEST(WhereFields, TimeIsComparedToTheNanosecond)
{
    trace_builder file; // the first record is at 05:12:01.123456789, the others each a microsecond later
    file.add_id(1);
    file.add_id(2);
    file.add_id(3);
    file.close();
    EXPECT_EQ(seqs_where(file, "time == \"2026-11-21T05:12:01.123457789Z\""), seqs{4});
    EXPECT_EQ(seqs_where(file, "time > \"2026-11-21T05:12:01.123457789Z\""), seqs{6});
    EXPECT_EQ(seqs_where(file, "time >= \"2026-11-21T05:12:01.123457788Z\""), (seqs{4, 6}));
    EXPECT_EQ(seqs_where(file, "time < \"@1795237921.123457790\""), (seqs{2, 4}));
    EXPECT_EQ(seqs_where(file, "time in (\"2026-11-21T06:12:01.123456789+01:00\")"), seqs{2});
    EXPECT_EQ(seqs_where(file, "time > \"-10min\""), (seqs{2, 4, 6}));
}

TEST(WhereFields, ARecordWithoutATimeFailsEveryOrderOfIt)
{
    trace_builder file;
    file.put_u64(24, 0); // no ticks a second
    file.add_id(1);
    file.close();
    EXPECT_EQ(seqs_where(file, "time > \"@0\" || time <= \"@0\" || time == \"@0\""), seqs{});
    EXPECT_EQ(seqs_where(file, "time != \"@0\""), (seqs{filler, 2}));
}

TEST(WhereFields, TextIsAnyOfARecordsTexts)
{
    EXPECT_EQ(where("text == \"plain\""), seqs{16});
    EXPECT_EQ(where("text == \"\""), seqs{16});
    EXPECT_EQ(where("text == \"formatted text\""), seqs{18});
    EXPECT_EQ(where("text in (\"core event\", \"formatted text\")"), (seqs{18, 22}));
    EXPECT_EQ(where("text =~ \"not spooled [0-9]+ consecutive\""), seqs{0});
    EXPECT_EQ(where("text =~ \"^Error -13 opening\""), seqs{14});
    EXPECT_EQ(where("text =~ \"0\\\\.5$\""), seqs{14}); // an argument, filled in
    EXPECT_EQ(where("text =~ \"hello\""), seqs{});      // a data block
    EXPECT_EQ(where("text =~ \"e\""), (seqs{0, 14, 16, 18, 22}));
}

TEST(WhereFields, TextMayHoldAnyBytes)
{
    EXPECT_EQ(where("text == \"not \xff UTF-8\""), seqs{20});
    EXPECT_EQ(where("text == \"\x1b[31mred\x07\""), seqs{16});
}

TEST(WhereFields, ValueIsAnyOfARecordsValuesWithItsSign)
{
    EXPECT_EQ(where("value == -1"), seqs{10});
    EXPECT_EQ(where("value == -70000"), seqs{12});
    EXPECT_EQ(where("value < -9223372036854775807"), seqs{12});
    EXPECT_EQ(where("value in (3, 7)"), (seqs{10, 12}));
    EXPECT_EQ(where("value > 305419895"), seqs{10});
    EXPECT_EQ(where("value == 17"), seqs{}); // an id
}

TEST(WhereFields, ValueIsUnsignedBesideAHexadecimalNumber)
{
    EXPECT_EQ(where("value == 0xffffffff"), seqs{10});
    EXPECT_EQ(where("value == 0xfffffffffffeee90"), seqs{12});
    EXPECT_EQ(where("value >= 0x8000000000000000"), seqs{12});
    EXPECT_EQ(where("value == 4294967295"), seqs{});
}

TEST(WhereFields, FileProgramAndNodeAreOfTheFile)
{
    EXPECT_EQ(where("file == \"dir/test.trc\""), all);
    EXPECT_EQ(where("file =~ \"other\""), seqs{});
    EXPECT_EQ(where("program == \"app\""), all);
    EXPECT_EQ(where("program == \"/opt/app/bin/app -v\""), seqs{});
    EXPECT_EQ(where("node == 0xabcd"), all);
    EXPECT_EQ(where("node == 1"), seqs{});
}

TEST(WhereFields, NotEqualIsTheOppositeOfEqualForARecordWithoutTheField)
{
    EXPECT_EQ(where("id != 17"), others({4}));
    EXPECT_EQ(where("value != -1"), others({10}));
    EXPECT_EQ(where("text != \"plain\""), others({16}));
    EXPECT_EQ(where("text !~ \"e\""), others({0, 14, 16, 18, 22}));
}

TEST(WhereFields, AFillerHasItsKindLengthAndSequenceNumberOnly)
{
    EXPECT_EQ(where("comp =~ \"\" || thread >= 0 || id >= 0 || time > \"@0\" || text =~ \"\""), others({filler}));
    EXPECT_EQ(where("kind == \"free\" && seq == 4095 && length > 28"), seqs{filler});
}

TEST(WhereFields, ADamagedRecordIsComparedByWhatIsSound)
{
    trace_builder file;
    file.add(12, file.body().u32(1).u32(100).u32(5)); // 100 values are announced
    file.add(99, file.body().u32(1));                 // no kind
    file.close();
    EXPECT_EQ(seqs_where(file, "value == 5"), seqs{2});
    EXPECT_EQ(seqs_where(file, "kind == \"unknown\""), seqs{4});
    EXPECT_EQ(seqs_where(file, "kind == \"unknown\" && id >= 0"), seqs{});
}

} // namespace
} // namespace qn::test
