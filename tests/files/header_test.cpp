// The header and the empty ring of a fresh file, byte by byte.
#include <cstdlib>

#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

TEST(FreshHeader, DescribesFormatPlatformAndByteOrder)
{
    const scratch folder;
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    ASSERT_EQ(image.size(), 65536U);
    EXPECT_EQ(image.u8(0), 0xC0);
    EXPECT_EQ(image.u8(1), 2);
    EXPECT_EQ(image.u16(2), 6);
    EXPECT_EQ(image.u16(4), 0);
    EXPECT_EQ(image.u32(20), 65536U);
    EXPECT_EQ(image.u32(40), 0U);
}

TEST(FreshHeader, StoresItsWordsLowByteFirst)
{
    const scratch folder;
    start_without_record(folder / "f");
    const std::string bytes = file_bytes(folder / "f");
    EXPECT_EQ(bytes.substr(2, 2), std::string("\x06\x00", 2));
    EXPECT_EQ(bytes.substr(20, 4), std::string("\x00\x00\x01\x00", 4));
}

TEST(FreshHeader, HoldsNoRecordAndAsksNothingOfWriters)
{
    const scratch folder;
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.seq_lock(), 1U);
    EXPECT_EQ(image.tail_request(), 0U);
}

TEST(FreshHeader, HasAnEmptyRingBehindIt)
{
    const scratch folder;
    const trace_anchor_t *anchor = start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.ring_offset(), 200U);
    EXPECT_EQ(image.oldest_offset(), 200U);
    const auto ring = image.ring();
    ASSERT_EQ(ring.size(), 1U);
    EXPECT_EQ(ring[0].offset, 200U);
    EXPECT_EQ(ring[0].length(), 65336U);
    EXPECT_EQ(ring[0].function(), 0);
    EXPECT_EQ(ring[0].sequence(), 0U);

    EXPECT_EQ(anchor->seqNumber, 0U);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pWrap), anchor->pMap + 200);
    EXPECT_EQ(anchor->pNextFree, anchor->pWrap);
}

TEST(FreshHeader, NamesProcessAndProgram)
{
    const scratch folder;
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.pid(), static_cast<uint32_t>(getpid()));
    EXPECT_EQ(image.text(52, 48), program_in_header());
    EXPECT_EQ(image.text(132, 48), base_name_in_header());
    EXPECT_EQ(image.text(132, 48), "files_tests");
}

TEST(FreshHeader, CutsTheProgramTextToFortySevenCharacters)
{
    const scratch folder;
    const std::string command = "/opt/" + std::string(100, 'p') + "/" + std::string(60, 'b');
    calls().proc_args = [&](pid_t pid, char *buffer, size_t size) {
        EXPECT_EQ(pid, getpid());
        EXPECT_EQ(size, 512U);
        std::strncpy(buffer, command.c_str(), size);
        return 0;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.text(52, 48), command.substr(0, 47));
    EXPECT_EQ(image.u8(99), 0);
    EXPECT_EQ(image.text(132, 48), std::string(47, 'b'));
    EXPECT_EQ(image.u8(179), 0);
}

TEST(FreshHeader, TakesTheWholeTextAsBaseNameWhenItHasNoSlash)
{
    const scratch folder;
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, "daemon");
        return 0;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.text(52, 48), "daemon");
    EXPECT_EQ(image.text(132, 48), "daemon");
}

// The base name comes from the text before it is cut.
TEST(FreshHeader, FindsTheBaseNameBehindTheCut)
{
    const scratch folder;
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, ("/" + std::string(80, 'd') + "/tail").c_str());
        return 0;
    };
    start_without_record(folder / "f");
    EXPECT_EQ(trace_image::of_file(folder / "f").text(132, 48), "tail");
}

TEST(FreshHeader, NamesNoProgramWhenItsArgumentsCannotBeRead)
{
    const scratch folder;
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, "/leftover/text");
        return ENOENT;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.text(52, 48), "");
    EXPECT_EQ(image.text(132, 48), "");
}

TEST(FreshHeader, NamesTheBuild)
{
    const scratch folder;
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_FALSE(image.text(100, 32).empty());
    EXPECT_NE(image.text(100, 32), "Unknown");
    EXPECT_EQ(image.u8(131), 0);
}

TEST(BuildName, IsUnknownWithoutAnIdentifier)
{
    trace_file_header_t header;
    std::memset(&header, 0xAA, sizeof header);
    qn::tr::set_build_name(&header, "");
    EXPECT_STREQ(header.buildName, "Unknown");
    EXPECT_EQ(header.buildName[31], '\0');
}

TEST(BuildName, IsCutToThirtyOneCharacters)
{
    trace_file_header_t header;
    std::memset(&header, 0xAA, sizeof header);
    qn::tr::set_build_name(&header, "0123456789012345678901234567890123456789");
    EXPECT_STREQ(header.buildName, "0123456789012345678901234567890");
    EXPECT_EQ(header.baseProgName[0], static_cast<char>(0xAA));
}

TEST(FreshHeader, KeepsTheTimeBaseInTwoWords)
{
    const scratch folder;
    calls().procspeed = [](cu_timeinfo_t *time) {
        *time = {0x1122334455667788, 0x99AABBCCDDEEFF01};
        return 0;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.u64(24), 0x1122334455667788U);
    EXPECT_EQ(image.u64(32), 0x99AABBCCDDEEFF01U);
}

TEST(FreshHeader, NamesTheNode)
{
    const scratch folder;
    calls().cluster_info = [](cu_cluster_info_t *info) {
        *info = {};
        info->cu_node_number = 517;
        return 0;
    };
    calls().node_id = [](qn_uint64_t *node) {
        *node = 0x0123456789ABCDEF;
        return 0;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.u16(6), 517);
    EXPECT_EQ(image.u64(180), 0x0123456789ABCDEFU);
}

TEST(FreshHeader, HasNodeNumberZeroOutsideOfACluster)
{
    const scratch folder;
    calls().cluster_info = [](cu_cluster_info_t *info) {
        info->cu_node_number = 517;
        return ENOENT;
    };
    calls().node_id = [](qn_uint64_t *node) {
        *node = 99;
        return EINVAL;
    };
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.u16(6), 0);
    EXPECT_EQ(image.u64(180), 0U);
}

TEST(FreshHeader, AsksForTheClusterOnlyOnce)
{
    const scratch folder;
    int asked = 0;
    calls().cluster_info = [&](cu_cluster_info_t *info) {
        *info = {};
        info->cu_node_number = ++asked;
        return 0;
    };
    start_without_record(folder / "f");
    start_without_record(folder / "g");
    EXPECT_EQ(asked, 1);
    EXPECT_EQ(trace_image::of_file(folder / "g").u16(6), 1);
}

TEST(FreshHeader, HasNoPageStateInASingleFile)
{
    const scratch folder;
    write_file(folder / "f", std::string(65536, '\xAA'));
    start_without_record(folder / "f");
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.u8(192), 0);
    EXPECT_EQ(image.u32(188), 0U);
}

TEST(FreshHeader, LeavesItsPaddingAsItIs)
{
    const scratch folder;
    write_file(folder / "f", std::string(65536, '\xAA'));
    start_without_record(folder / "f");
    EXPECT_EQ(file_bytes(folder / "f").substr(193, 3), "\xAA\xAA\xAA");
}

struct zone {
    const char *variable;
    int32_t minutes;
};

void PrintTo(const zone &given, std::ostream *out) { *out << given.variable; }

class FreshHeaderIn : public testing::TestWithParam<zone>
{
};

TEST_P(FreshHeaderIn, KeepsTheMinutesFromLocalTimeToGreenwich)
{
    setenv("TZ", GetParam().variable, 1);
    tzset();
    const scratch folder;
    start_without_record(folder / "f");
    EXPECT_EQ(static_cast<int32_t>(trace_image::of_file(folder / "f").u32(196)), GetParam().minutes);
}

INSTANTIATE_TEST_SUITE_P(Zones, FreshHeaderIn,
                         testing::Values(zone{"UTC0", 0}, zone{"WST3", 180}, zone{"EST-5:30", -330},
                                         zone{"FAR-12", -720}));

TEST(InitTraceHeader, WritesOverWhatAnotherProgramLeft)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    std::memset(anchor->pMap, 0x55, 200);
    EXPECT_EQ(init_trace_header(anchor), 0);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.u8(0), 0xC0);
    EXPECT_EQ(image.u16(2), 6);
    EXPECT_EQ(image.u16(4), 0);
    EXPECT_EQ(image.oldest_offset(), 200U);
    EXPECT_EQ(image.file_size(), 65536U);
    EXPECT_EQ(image.seq_lock(), 1U);
    EXPECT_EQ(image.tail_request(), 0U);
    EXPECT_EQ(image.u32(48), 0x55555555U) << "the process is not the header's initialisation's business";
    stop(anchor);
}
} // namespace
