// Records of data blocks: padding, cuts and refusals.
#include <gtest/gtest.h>

#include "recording/expected_bytes.h"
#include "recording/one_trace.h"
#include "recording/writers.h"
#include "trace/trace.h"

using namespace qn::test;

namespace
{
constexpr uint16_t data_blocks = 3;
constexpr uint32_t small_file = 4096; // its longest record has 1948 bytes
constexpr int longest = 1948;
constexpr int mebibyte = 0x100000;

#define QN_TEST_8_BLOCKS "x", 1, "x", 1, "x", 1, "x", 1, "x", 1, "x", 1, "x", 1, "x", 1
#define QN_TEST_32_BLOCKS QN_TEST_8_BLOCKS, QN_TEST_8_BLOCKS, QN_TEST_8_BLOCKS, QN_TEST_8_BLOCKS
} // namespace

TEST(DataWriter, WritesABlockOf5BytesIn48)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, "hello", 5), 0);
    const record_image record = trace.only_record();
    EXPECT_EQ(record.length(), 48U);
    expect_record(record, data_blocks, "COMP", expected_bytes().u32(7).u32(1).u32(5).raw("hello").pad_to_4());
}

TEST(DataWriter, StartsEveryBlockAtAMultipleOf4)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 4, "a", 1, "bcdefg", 6, "hij", 3, "klmn", 4), 0);
    expected_bytes body;
    body.u32(7).u32(4);
    body.u32(1).raw("a").pad_to_4();
    body.u32(6).raw("bcdefg").pad_to_4();
    body.u32(3).raw("hij").pad_to_4();
    body.u32(4).raw("klmn");
    expect_record(trace.only_record(), data_blocks, "COMP", body);
}

TEST(DataWriter, KeepsBytesAsTheyAre)
{
    const one_trace trace;
    const std::string bytes("\0\xFF\n%s", 5);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, bytes.data(), 5), 0);
    expect_record(trace.only_record(), data_blocks, "COMP",
                  expected_bytes().u32(7).u32(1).u32(5).raw(bytes).pad_to_4());
}

TEST(DataWriter, WritesABlockOfNoBytesAsItsLengthWord)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 2, "x", 0, "y", 1), 0);
    expect_record(trace.only_record(), data_blocks, "COMP",
                  expected_bytes().u32(7).u32(2).u32(0).u32(1).raw("y").pad_to_4());
}

TEST(DataWriter, WritesNoBlocksAtAll)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 0), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(DataWriter, KeepsANegativeCountWithNoBlocks)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, static_cast<qn_uint32_t>(-3)), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0xFFFFFFFD));
}

TEST(DataWriter, KeepsTheMostNegativeCount)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 0x80000000), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0x80000000));
}

TEST(DataWriter, Takes128Blocks)
{
    const one_trace trace;
    EXPECT_EQ(
        tr_record_data_1("COMP", 7, 128, QN_TEST_32_BLOCKS, QN_TEST_32_BLOCKS, QN_TEST_32_BLOCKS, QN_TEST_32_BLOCKS),
        0);
    expected_bytes body;
    body.u32(7).u32(128);
    for (int i = 0; i < 128; ++i) body.u32(1).raw("x").pad_to_4();
    expect_record(trace.only_record(), data_blocks, "COMP", body);
}

TEST(DataWriter, Refuses129Blocks)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_data_1("COMP", 7, 129, "x", 1), 29);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 0x7FFFFFFF, "x", 1), 29);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
}

TEST(DataWriter, RefusesANullBlock)
{
    const one_trace trace;
    leave_marker();
    const void *none = nullptr;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, none, 1), 30);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 2, "x", 1, none, 0), 30);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST(DataWriter, RefusesANegativeLength)
{
    const one_trace trace;
    leave_marker();
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, "x", -1), 31);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 2, "x", 1, "y", -1), 31);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(trace.written().empty());
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST(DataWriter, RefusesMoreThanAMebibyte)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, "x", mebibyte + 1), 31);
    EXPECT_TRUE(trace.written().empty());
}

TEST(DataWriter, TakesAMebibyte)
{
    const one_trace trace(3 * mebibyte);
    const std::string block(mebibyte, 'b');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, block.data(), mebibyte), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(1).u32(mebibyte).raw(block));
}

TEST(DataWriter, ChecksThePointerBeforeTheLength)
{
    const one_trace trace;
    const void *none = nullptr;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, none, -1), 30);
}

TEST(DataWriter, ChecksTheComponentBeforeTheCount)
{
    const one_trace trace;
    EXPECT_EQ(tr_record_data_1("", 7, 129), 2);
}

TEST(DataWriter, ChecksTheCountBeforeTheLockAndTheBlocksBehindIt)
{
    const one_trace trace;
    const unlockable lock(anchors.anchorMutex);
    const void *none = nullptr;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 129), 29);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, none, 1), 9);
}

TEST(DataWriter, DropsTheBlocksThatDoNotFit)
{
    const one_trace trace(small_file);
    const std::string first(100, 'x');
    const std::string second(longest - 36 - 104 - 4, 'y'); // just fits
    const std::string third(200, 'z');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 2, first.data(), 100, second.data(), static_cast<int>(second.size()) + 1), 0);
    EXPECT_EQ(trace.only_record().u32(32), 1U); // a byte more did not
    EXPECT_EQ(tr_record_data_1("COMP", 7, 3, first.data(), 100, second.data(), static_cast<int>(second.size()),
                               third.data(), 200),
              0);
    expect_record(trace.written().back(), data_blocks, "COMP",
                  expected_bytes().u32(7).u32(2).u32(100).raw(first).u32(longest - 144).raw(second));
}

TEST(DataWriter, DropsSmallerBlocksBehindTheFirstThatDoesNotFit)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 3, "a", 1, huge.data(), longest, "b", 1), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(1).u32(1).raw("a").pad_to_4());
}

TEST(DataWriter, DoesNotLookAtBlocksBehindTheCut)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    const void *none = nullptr;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 3, "a", 1, huge.data(), longest, none, -1), 0);
    EXPECT_EQ(trace.only_record().u32(32), 1U);
}

TEST(DataWriter, WritesOnlyTheFixedPartWhenTheFirstBlockIsTooLong)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, huge.data(), longest), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(DataWriter, WritesOnlyTheFixedPartWhenTheFirstOfSeveralBlocksIsTooLong)
{
    const one_trace trace(small_file);
    const std::string huge(longest, 'x');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 2, huge.data(), static_cast<int>(huge.size()), "y", 1), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(DataWriter, TakesTheLongestBlockThatFits)
{
    const one_trace trace(small_file);
    const std::string block(longest - 40, 'x');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, block.data(), static_cast<int>(block.size())), 0);
    expect_record(trace.only_record(), data_blocks, "COMP",
                  expected_bytes().u32(7).u32(1).u32(static_cast<uint32_t>(block.size())).raw(block));
}

TEST(DataWriter, LeavesOutABlockOfAByteMoreThanFits)
{
    const one_trace trace(small_file);
    const std::string block(longest - 39, 'x');
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, block.data(), static_cast<int>(block.size())), 0);
    expect_record(trace.only_record(), data_blocks, "COMP", expected_bytes().u32(7).u32(0));
}

TEST(DataWriter, ChecksTheBlocksOfATraceThatIsNotActive)
{
    const one_trace trace;
    anchors.uMaxSize = 0;
    const void *none = nullptr;
    EXPECT_EQ(tr_record_data_1("COMP", 7, 129), 29);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, none, 1), 30);
    EXPECT_EQ(tr_record_data_1("COMP", 7, 1, "x", -1), 31);
}
