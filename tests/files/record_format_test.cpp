// Records on the disk: the first ones of a fresh ring, and lengths that readers reckon with.
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

class StartedFile : public testing::Test
{
protected:
    void SetUp() override
    {
        anchor = anchor_for(file);
        ASSERT_EQ(start(anchor), 0);
    }
    void TearDown() override { stop(anchor); }

    scratch folder;
    std::string file = folder / "f";
    trace_anchor_t *anchor = nullptr;
};

TEST_F(StartedFile, BeginsWithAStartRecordOfThisProcess)
{
    const auto ring = trace_image::of_file(file).ring();
    ASSERT_EQ(ring.size(), 2U);
    const record_image &record = ring[1];
    EXPECT_EQ(record.offset, 200U);
    EXPECT_EQ(record.length(), 52U);
    EXPECT_EQ(record.function(), 16);
    EXPECT_EQ(record.sequence(), 2U);
    EXPECT_EQ(record.component(), "____");
    EXPECT_EQ(record.thread(), static_cast<uint32_t>(pthread_self()));
    EXPECT_EQ(record.u32(32), static_cast<uint32_t>(getpid()));
}

TEST_F(StartedFile, HasTheFreeRestAsItsOldestRecord)
{
    const trace_image image = trace_image::of_file(file);
    const auto ring = image.ring();
    ASSERT_EQ(ring.size(), 2U);
    EXPECT_EQ(image.oldest_offset(), 252U);
    EXPECT_EQ(ring[0].length(), 65336U - 52U);
    EXPECT_EQ(ring[0].function(), 0);
    EXPECT_EQ(ring[0].sequence(), 4095U);
}

TEST_F(StartedFile, TakesAnIdentifierInThirtyTwoBytes)
{
    EXPECT_EQ(tr_ms_record_id_1("ABCD", 0xCAFE, anchor), 0);
    const auto records = trace_image::of_file(file).records_of(1);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].length(), 32U);
    EXPECT_EQ(records[0].sequence(), 4U);
    EXPECT_EQ(records[0].component(), "ABCD");
    EXPECT_EQ(records[0].u32(28), 0xCAFEU);
}

TEST_F(StartedFile, TakesAStringOfTwoCharactersInFortyFourBytes)
{
    EXPECT_EQ(tr_ms_record_strings_1("ABCD", 1, anchor, 1, "ab"), 0);
    const auto records = trace_image::of_file(file).records_of(15);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].u32(32), 1U);
    EXPECT_EQ(records[0].u32(36), 3U);
    EXPECT_EQ(records[0].text(40), "ab");
    EXPECT_EQ(records[0].length(), 44U);
}

TEST_F(StartedFile, TakesABlockOfFiveBytesInFortyEightBytes)
{
    EXPECT_EQ(tr_ms_record_data_1("ABCD", 1, anchor, 1, "12345", 5), 0);
    const auto records = trace_image::of_file(file).records_of(3);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].length(), 48U);
    EXPECT_EQ(records[0].u32(32), 1U);
    EXPECT_EQ(records[0].u32(36), 5U);
    EXPECT_EQ(records[0].bytes.substr(40, 5), "12345");
}

TEST_F(StartedFile, PutsTheFileNameOfAnErrorWithoutFunctionBehindTheArguments)
{
    cu_set_error_1(18, nullptr, "qn_tr.cat", 1, 18, "Error %d.\n", 5);
    cu_error_t *error = nullptr;
    ASSERT_EQ(cu_get_error_1(&error), 0);
    EXPECT_EQ(tr_ms_record_error_1("ABCD", 1, anchor, nullptr, 7, "source.c", &error), 0);
    cu_rel_error_1(error);
    const auto records = trace_image::of_file(file).records_of(14);
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].u32(40), 0U);
    EXPECT_EQ(records[0].u32(68), 1U);
    EXPECT_EQ(records[0].u32(44), 72U + 16U);
    EXPECT_EQ(records[0].text(88), "source.c");
}

TEST(RecordHeader, IsNotWrittenInItsReservedWord)
{
    const scratch folder;
    write_file(folder / "f", std::string(65536, '\xAA'));
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    write_ids(anchor, 1);
    const auto starts = trace_image::of_file(folder / "f").records_of(16);
    ASSERT_EQ(starts.size(), 1U);
    EXPECT_EQ(starts[0].u16(6), 0xAAAA);
    EXPECT_EQ(starts[0].u32(28), 0xAAAAAAAAU) << "a start record's trace id";
    const auto ids = trace_image::of_file(folder / "f").records_of(1);
    ASSERT_EQ(ids.size(), 1U);
    EXPECT_EQ(ids[0].u16(6), 0xAAAA);
    stop(anchor);
}

TEST(StartRecord, CarriesTheTimeBase)
{
    const scratch folder;
    calls().procspeed = [](cu_timeinfo_t *time) {
        *time = {0x0102030405060708, 0x1112131415161718};
        return 0;
    };
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    const auto starts = trace_image::of_file(folder / "f").records_of(16);
    ASSERT_EQ(starts.size(), 1U);
    EXPECT_EQ(starts[0].u64(36), 0x0102030405060708U);
    EXPECT_EQ(starts[0].u64(44), 0x1112131415161718U);
    stop(anchor);
}

TEST(StartRecord, IsNotWrittenOnceTracingIsStopped)
{
    const scratch folder;
    start_without_record(folder / "f");
    EXPECT_TRUE(trace_image::of_file(folder / "f").records().empty());
}
} // namespace
