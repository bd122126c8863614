// Whether an existing file is continued, as far as its header decides, and what a continued header keeps.
#include <csignal>
#include <utility>

#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

constexpr const char *reused = "\ttrace: Re-using existing file.\n";

class ExistingFile : public testing::Test
{
protected:
    // A sound file with a start record and the ids 1, 2, 3.
    void SetUp() override
    {
        calls().node_id = [](qn_uint64_t *node) {
            *node = 0x1111;
            return 0;
        };
        anchor = anchor_for(file);
        ASSERT_EQ(start(anchor), 0);
        write_ids(anchor, 3);
        stop(anchor);
        debug_on();
    }

    void expect_continued()
    {
        ASSERT_EQ(start(anchor), 0);
        EXPECT_TRUE(system_log_has(reused));
        EXPECT_FALSE(system_log_has("\ttrace: reInit block for " + file + "\n"));
        EXPECT_EQ(ids_in(file), (std::vector<uint32_t>{1, 2, 3}));
        EXPECT_EQ(trace_image::of_file(file).records_of(16).size(), 2U);
        stop(anchor);
    }

    void expect_initialised(const std::string &reason)
    {
        ASSERT_EQ(start(anchor), 0);
        EXPECT_TRUE(system_log_has("\ttrace: reInit for " + file + " due to " + reason + "\n"));
        EXPECT_TRUE(system_log_has("\ttrace: reInit block for " + file + "\n"));
        EXPECT_FALSE(system_log_has(reused));
        const trace_image image = trace_image::of_file(file);
        EXPECT_EQ(image.records().size(), 1U) << "the new start record";
        EXPECT_EQ(image.u8(0), 0xC0);
        EXPECT_EQ(image.u8(1), 2);
        EXPECT_EQ(image.u16(2), 6);
        EXPECT_EQ(image.ring_offset(), 200U);
        EXPECT_EQ(image.file_size(), 65536U);
        EXPECT_FALSE(exists(file + ".save")) << "initialised in place";
        stop(anchor);
    }

    trace_image after_restart()
    {
        EXPECT_EQ(start(anchor), 0);
        EXPECT_TRUE(system_log_has(reused));
        const trace_image image = trace_image::of_file(file);
        stop(anchor);
        return image;
    }

    scratch folder;
    std::string file = folder / "f";
    trace_anchor_t *anchor = nullptr;
};

TEST_F(ExistingFile, IsContinued) { expect_continued(); }

TEST_F(ExistingFile, IsContinuedWithItsSequenceNumbers)
{
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->seqNumber, 10U) << "start, three ids, start";
    const auto records = trace_image::of_file(file).records();
    ASSERT_EQ(records.size(), 5U);
    for (size_t i = 0; i < records.size(); ++i) EXPECT_EQ(records[i].sequence(), 2 * (i + 1));
    EXPECT_EQ(records[4].function(), 16);
    EXPECT_EQ(records[4].offset, 200U + 52 + 3 * 32);
    stop(anchor);
}

TEST_F(ExistingFile, HasItsAnchorSetUpBehindTheNewestRecord)
{
    global_stop_trace(); // no start record
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->seqNumber, 8U);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pWrap), anchor->pMap + 200);
    EXPECT_EQ(reinterpret_cast<unsigned char *>(anchor->pNextFree), anchor->pMap + 348);
    EXPECT_EQ(anchor->uMaxSize, 32668U);
    EXPECT_EQ(anchor->uActualFileSize, 65536U);
}

TEST_F(ExistingFile, NamesTheNewProcess)
{
    put<uint32_t>(file, 48, 1);
    put_bytes(file, 132, std::string("another\0", 8));
    const trace_image image = after_restart();
    EXPECT_EQ(image.pid(), static_cast<uint32_t>(getpid()));
    EXPECT_EQ(image.text(52, 48), program_in_header());
    EXPECT_EQ(image.text(132, 48), base_name_in_header());
}

TEST_F(ExistingFile, KeepsWhatOnlyAFreshHeaderGets)
{
    put<uint16_t>(file, 6, 321);
    put<uint32_t>(file, 12, 4712);
    put<uint32_t>(file, 16, 5);
    put<uint64_t>(file, 24, 0x0A0B0C0D);
    put<uint64_t>(file, 32, 0x01020304);
    put<uint32_t>(file, 40, 77);
    put_bytes(file, 100, std::string("older build\0", 12));
    put<uint32_t>(file, 188, 1234);
    put<int32_t>(file, 196, -99);
    const trace_image image = after_restart();
    EXPECT_EQ(image.u16(6), 321);
    EXPECT_EQ(image.seq_lock(), 4712U);
    EXPECT_EQ(image.tail_request(), 5U);
    EXPECT_EQ(image.u64(24), 0x0A0B0C0DU);
    EXPECT_EQ(image.u64(32), 0x01020304U);
    EXPECT_EQ(image.u32(40), 77U);
    EXPECT_EQ(image.text(100, 32), "older build");
    EXPECT_EQ(image.u32(188), 1234U);
    EXPECT_EQ(static_cast<int32_t>(image.u32(196)), -99);
}

TEST_F(ExistingFile, HasItsFlagsCleared)
{
    put<uint16_t>(file, 4, 0x8000);
    EXPECT_EQ(after_restart().u16(4), 0);
}

TEST_F(ExistingFile, HasItsPageStateCleared)
{
    put<uint8_t>(file, 192, 4);
    EXPECT_EQ(after_restart().u8(192), 0);
}

TEST_F(ExistingFile, HasItsNodeRefreshed)
{
    put<uint64_t>(file, 180, 0x2222);
    EXPECT_EQ(after_restart().u64(180), 0x1111U);
}

TEST_F(ExistingFile, HasNodeZeroWhenTheNodeIsNotKnown)
{
    put<uint64_t>(file, 180, 0x2222);
    calls().node_id = [](qn_uint64_t *node) {
        *node = 0x3333;
        return ENOENT;
    };
    EXPECT_EQ(after_restart().u64(180), 0U);
}

// State, node and flags, in this order, are brought up to date before the ring is looked at.
TEST_F(ExistingFile, HasItsHeaderRefreshedBeforeItsRingIsWalked)
{
    put<uint8_t>(file, 192, 4);
    put<uint16_t>(file, 4, 0x8000);
    put<uint32_t>(file, 44, 70000);
    std::vector<std::pair<int, int>> states_and_flags;
    calls().node_id = [&](qn_uint64_t *node) {
        *node = 0x1111;
        states_and_flags.emplace_back(anchor->pMap[192], anchor->pMap[5]);
        return 0;
    };
    expect_initialised("corruption 1");
    EXPECT_EQ(states_and_flags, (std::vector<std::pair<int, int>>{{0, 0x80}, {0, 0}}))
        << "once while refreshing, once while initialising";
}

TEST_F(ExistingFile, OfAnotherProgramIsNotRefreshed)
{
    put<uint16_t>(file, 2, 7);
    int asked = 0;
    calls().node_id = [&](qn_uint64_t *node) {
        *node = 0x1111;
        ++asked;
        return 0;
    };
    expect_initialised("size,version,program name");
    EXPECT_EQ(asked, 1) << "only while initialising";
}

TEST_F(ExistingFile, OfVersionFiveIsContinuedAsSuch)
{
    put<uint16_t>(file, 2, 5);
    put<uint8_t>(file, 192, 4);
    const trace_image image = after_restart();
    EXPECT_EQ(image.u16(2), 5);
    EXPECT_EQ(image.u8(192), 0);
    EXPECT_EQ(image.u64(180), 0x1111U);
}

TEST_F(ExistingFile, OfVersionFourKeepsWhatStandsInPlaceOfThePageState)
{
    put<uint16_t>(file, 2, 4);
    put<uint8_t>(file, 192, 4);
    put<uint64_t>(file, 180, 0x2222);
    const trace_image image = after_restart();
    EXPECT_EQ(image.u8(192), 4);
    EXPECT_EQ(image.u64(180), 0x1111U);
}

TEST_F(ExistingFile, OfVersionThreeKeepsWhatStandsInPlaceOfTheNode)
{
    put<uint16_t>(file, 2, 3);
    put<uint8_t>(file, 192, 4);
    put<uint64_t>(file, 180, 0x2222);
    const trace_image image = after_restart();
    EXPECT_EQ(image.u8(192), 4);
    EXPECT_EQ(image.u64(180), 0x2222U);
}

TEST_F(ExistingFile, OfVersionSevenIsInitialised)
{
    put<uint16_t>(file, 2, 7);
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, OfTheOtherByteOrderIsInitialised)
{
    put<uint8_t>(file, 0, 0x40);
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, WithoutThePropertyOfEveryFileIsInitialised)
{
    put<uint8_t>(file, 0, 0x80);
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, WithOtherPropertiesBesidesIsContinued)
{
    put<uint8_t>(file, 0, 0xFF);
    expect_continued();
}

TEST_F(ExistingFile, OfAnotherProgramIsInitialised)
{
    put_bytes(file, 52, std::string("/opt/bin/another\0", 17));
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, OfAProgramWhoseTextOnlyBeginsAlikeIsInitialised)
{
    put<uint8_t>(file, 52 + program_in_header().size() - 1, 0);
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, OfAProgramThatDiffersBehindTheCutIsContinued)
{
    std::string command = std::string(47, 'p') + " one";
    calls().proc_args = [&](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, command.c_str());
        return 0;
    };
    put_bytes(file, 52, std::string(47, 'p'));
    command = std::string(47, 'p') + " two";
    expect_continued();
}

TEST_F(ExistingFile, WithAnotherSizeInItsHeaderIsInitialised)
{
    put<uint32_t>(file, 20, 65532);
    expect_initialised("size,version,program name");
}

TEST_F(ExistingFile, WhosePagesAreAllZeroIsInitialised)
{
    write_file(file, std::string(65536, '\0'));
    expect_initialised("size,version,program name");
}

class FileOfPlatform : public ExistingFile, public testing::WithParamInterface<int>
{
};

using OldFormat = FileOfPlatform;

TEST_P(OldFormat, IsInitialised)
{
    put<uint8_t>(file, 1, static_cast<uint8_t>(GetParam()));
    put<uint16_t>(file, 2, 5);
    put<uint32_t>(file, 8, 204);
    expect_initialised("format mismatch");
}

TEST_P(OldFormat, IsContinuedWhenItsRingIsWhereOursIs)
{
    put<uint8_t>(file, 1, static_cast<uint8_t>(GetParam()));
    put<uint16_t>(file, 2, 5);
    expect_continued();
}

TEST_P(OldFormat, IsToldByItsVersionToo)
{
    put<uint8_t>(file, 1, static_cast<uint8_t>(GetParam()));
    expect_continued();
}

INSTANTIATE_TEST_SUITE_P(Platforms, OldFormat, testing::Values(1, 4, 5));

TEST_P(FileOfPlatform, IsNotRefusedForItsFormat)
{
    put<uint8_t>(file, 1, static_cast<uint8_t>(GetParam()));
    put<uint16_t>(file, 2, 5);
    put<uint32_t>(file, 8, 196);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_FALSE(system_log_has("\ttrace: reInit for " + file + " due to format mismatch\n"));
    stop(anchor);
}

INSTANTIATE_TEST_SUITE_P(Platforms, FileOfPlatform, testing::Values(0, 2, 3, 6));

// The library is used only in the children: each is a program run of its own.
TEST(FileOfAnEarlierProcess, IsContinuedByTheNext)
{
    const scratch folder;
    const std::string file = folder / "f";
    for (qn_uint32_t run = 1; run <= 3; ++run)
        ASSERT_TRUE(in_child(
            [&] {
                client program("ABCD");
                if (tr_set_filename_1(file.c_str()) != 0 || program.register_now() != 0) return false;
                return tr_record_id_1("ABCD", run) == 0;
            },
            true));

    EXPECT_EQ(ids_in(file), (std::vector<uint32_t>{1, 2, 3}));
    const auto records = trace_image::of_file(file).records();
    ASSERT_EQ(records.size(), 6U);
    for (size_t i = 0; i < records.size(); ++i) EXPECT_EQ(records[i].sequence(), 2 * (i + 1));
    EXPECT_NE(records[0].u32(32), records[2].u32(32)) << "each start record names its process";
}

TEST(FileOfAnEarlierProcess, IsContinuedWhenThatWasKilled)
{
    const scratch folder;
    const std::string file = folder / "f";
    const pid_t victim = fork();
    if (victim == 0) {
        client program("ABCD");
        tr_set_filename_1(file.c_str());
        program.register_now();
        for (qn_uint32_t id = 1; id <= 5000; ++id) tr_record_id_1("ABCD", id);
        raise(SIGKILL);
    }
    int status = 0;
    ASSERT_EQ(waitpid(victim, &status, 0), victim);
    ASSERT_TRUE(WIFSIGNALED(status));

    const std::vector<uint32_t> before = ids_in(file);
    ASSERT_EQ(before.back(), 5000U);
    trace_anchor_t *anchor = anchor_for(file);
    debug_on();
    ASSERT_EQ(start(anchor), 0);
    EXPECT_TRUE(system_log_has(reused));
    const std::vector<uint32_t> after = ids_in(file);
    EXPECT_EQ(after.back(), 5000U);
    EXPECT_GE(after.size() + 4, before.size()) << "a start record takes the place of a few ids";
    stop(anchor);
}
} // namespace
