// Records of 32-bit and 64-bit values: no limit on their number but the longest record.
#include <utility>

#include <gtest/gtest.h>

#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint16_t values_32 = 12;
constexpr uint16_t values_64 = 13;
constexpr uint32_t small_file = 4096; // its longest record has 1948 bytes

template <int... i>
qn_int32_t write_many_32(std::integer_sequence<int, i...>, qn_uint32_t count)
{
    return tr_record_values_32_1("COMP", 7, count, i...);
}

template <int... i>
qn_int32_t write_many_64(std::integer_sequence<int, i...>, qn_uint32_t count)
{
    return tr_record_values_64_1("COMP", 7, count, qn_int64_t{i}...);
}
} // namespace

TEST(Values32Writer, WritesNoValues)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_values_32_1("COMP", 7, 0), 0);
    expect_record(trace.only_record(), values_32, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(Values32Writer, KeepsEveryBit)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_values_32_1("COMP", 7, 4, 0, -1, INT32_MIN, INT32_MAX), 0);
    expect_record(trace.only_record(), values_32, "COMP",
                  expected_bytes().u32(7).u32(4).u32(0).u32(0xFFFFFFFF).u32(0x80000000).u32(0x7FFFFFFF));
}

TEST(Values32Writer, TakesHundreds)
{
    const one_trace trace;
    EXPECT_EQ(write_many_32(std::make_integer_sequence<int, 400>(), 400), 0);
    expected_bytes body;
    body.u32(7).u32(400);
    for (uint32_t i = 0; i < 400; ++i) body.u32(i);
    expect_record(trace.only_record(), values_32, "COMP", body);
}

TEST(Values32Writer, FillsTheLongestRecord)
{
    const one_trace trace(small_file);
    EXPECT_EQ(write_many_32(std::make_integer_sequence<int, 478>(), 478), 0); // 36 + 4 * 478 = 1948
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 1948U);
    EXPECT_EQ(record.u32(32), 478U);
    EXPECT_EQ(record.u32(1944), 477U);
}

TEST(Values32Writer, CutsWhatDoesNotFit)
{
    const one_trace trace(small_file);
    EXPECT_EQ(write_many_32(std::make_integer_sequence<int, 479>(), 479), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 1948U);
    EXPECT_EQ(record.u32(32), 478U);
    EXPECT_EQ(record.u32(1944), 477U);
}

TEST(Values32Writer, CutsTheLargestNumber)
{
    const one_trace trace;
    anchors.uMaxSize = 44;
    EXPECT_EQ(tr_record_values_32_1("COMP", 7, 0xFFFFFFFF, 1, 2), 0);
    expect_record(trace.only_record(), values_32, "COMP", expected_bytes().u32(7).u32(2).u32(1).u32(2));
}

TEST(Values32Writer, CutsANumberWhoseLengthHasMoreThan32Bits)
{
    const one_trace trace;
    anchors.uMaxSize = 44;
    EXPECT_EQ(tr_record_values_32_1("COMP", 7, 0x40000000, 1, 2), 0);
    expect_record(trace.only_record(), values_32, "COMP", expected_bytes().u32(7).u32(2).u32(1).u32(2));
}

TEST(Values64Writer, WritesNoValues)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_values_64_1("COMP", 7, 0), 0);
    expect_record(trace.only_record(), values_64, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(Values64Writer, KeepsEveryBit)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_values_64_1("COMP", 7, 3, qn_int64_t{-1}, INT64_MIN, INT64_MAX), 0);
    expect_record(trace.only_record(), values_64, "COMP",
                  expected_bytes().u32(7).u32(3).u64(~0ULL).u64(0x8000000000000000ULL).u64(0x7FFFFFFFFFFFFFFFULL));
}

TEST(Values64Writer, PacksTheValuesBehindTheFixedPart)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_values_64_1("COMP", 7, 2, qn_int64_t{11}, qn_int64_t{12}), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 52U);
    EXPECT_EQ(record.u64(36), 11U);
    EXPECT_EQ(record.u64(44), 12U);
}

TEST(Values64Writer, FillsTheLongestRecord)
{
    const one_trace trace(small_file);
    EXPECT_EQ(write_many_64(std::make_integer_sequence<int, 239>(), 239), 0); // 36 + 8 * 239 = 1948
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 1948U);
    EXPECT_EQ(record.u32(32), 239U);
    EXPECT_EQ(record.u64(1940), 238U);
}

TEST(Values64Writer, CutsWhatDoesNotFit)
{
    const one_trace trace(small_file);
    EXPECT_EQ(write_many_64(std::make_integer_sequence<int, 240>(), 240), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 1948U);
    EXPECT_EQ(record.u32(32), 239U);
}

TEST(Values64Writer, IsGivenTheLongestRecordWhenHalfAValueMoreWouldFit)
{
    const one_trace trace;
    anchors.uMaxSize = 36 + 8 + 4;
    EXPECT_EQ(tr_record_values_64_1("COMP", 7, 2, qn_int64_t{11}, qn_int64_t{12}), 0);
    expect_record(trace.only_record(), values_64, "COMP", expected_bytes().u32(7).u32(1).u64(11).anything(4));
}

TEST(Values64Writer, CutsANumberWhoseLengthHasMoreThan32Bits)
{
    const one_trace trace;
    anchors.uMaxSize = 44;
    EXPECT_EQ(tr_record_values_64_1("COMP", 7, 0x20000000, qn_int64_t{1}), 0);
    expect_record(trace.only_record(), values_64, "COMP", expected_bytes().u32(7).u32(1).u64(1));
}

TEST(IdWriter, Writes32Bytes)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_id_1("COMP", 0xFFFFFFFE), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 32U);
    EXPECT_EQ(record.u32(28), 0xFFFFFFFEU);
}

TEST(IdWriter, LosesTheRecordWhenThereIsNoSpaceForIt)
{
    const one_trace trace;
    const std::string before = trace.image().bytes();
    anchors.uMaxSize = 28;
    EXPECT_EQ(tr_record_id_1("COMP", 1), 0);
    EXPECT_EQ(trace.image().bytes(), before);
}
