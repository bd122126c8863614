// What a query handle answers, how long, and what is refused as a handle.
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include <gtest/gtest.h>
#include <unistd.h>

#include "components/outcome.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

const outcome bad_handle = failure(37, 38, "2625-037 The specified query handle is not valid.\n");

// A file whose header is written here by its offsets.
class Query : public ::testing::Test
{
protected:
    void SetUp() override
    {
        std::string bytes(static_cast<size_t>(sysconf(_SC_PAGESIZE)), '\0');
        bytes[1] = static_cast<char>(0xFE);
        const uint32_t pid = 0x01020304;
        std::memcpy(&bytes[48], &pid, sizeof pid);
        std::memcpy(&bytes[52], "/usr/sbin/daemon", sizeof "/usr/sbin/daemon");
        write_file(file, bytes);
        ASSERT_EQ(tr_open_query_1(file.c_str(), &handle), 0);
    }
    void TearDown() override
    {
        if (handle == nullptr) return;
        EXPECT_EQ(tr_close_query_1(handle), 0);
    }
    void overwrite(size_t offset, const void *bytes, size_t size)
    {
        std::FILE *stream = std::fopen(file.c_str(), "r+b");
        ASSERT_NE(stream, nullptr);
        std::fseek(stream, static_cast<long>(offset), SEEK_SET);
        std::fwrite(bytes, 1, size, stream);
        std::fclose(stream);
    }
    std::string program()
    {
        qn_char_t *name = nullptr;
        EXPECT_EQ(tr_query_prog_1(handle, &name), 0);
        const std::string copy = name != nullptr ? name : "";
        std::free(name);
        return copy;
    }

    const scratch files;
    const std::string file = files / "t.trc";
    tr_query_handle_t handle = nullptr;
};

TEST_F(Query, TellsTheProcess)
{
    pid_t pid = 0;
    leave_marker();
    EXPECT_EQ(after(tr_query_pid_1(handle, &pid)), success());
    EXPECT_EQ(pid, 0x01020304);
}

TEST_F(Query, TellsTheProgram)
{
    leave_marker();
    qn_char_t *name = nullptr;
    EXPECT_EQ(after(tr_query_prog_1(handle, &name)), success());
    EXPECT_STREQ(name, "/usr/sbin/daemon");
    std::free(name);
}

TEST_F(Query, TellsThePlatformAsAnUnsignedByte)
{
    qn_uint32_t platform = 0;
    leave_marker();
    EXPECT_EQ(after(tr_query_platform_1(handle, &platform)), success());
    EXPECT_EQ(platform, 254U);
}

TEST_F(Query, GivesEachCallItsOwnCopyOfTheProgram)
{
    qn_char_t *first = nullptr;
    qn_char_t *second = nullptr;
    ASSERT_EQ(tr_query_prog_1(handle, &first), 0);
    ASSERT_EQ(tr_query_prog_1(handle, &second), 0);
    EXPECT_NE(first, second);
    first[0] = 'X';
    EXPECT_STREQ(second, "/usr/sbin/daemon");
    std::free(first);
    std::free(second);
}

TEST_F(Query, EndsAProgramNameThatFillsItsField)
{
    overwrite(52, std::string(47, 'p').append(1, '\0').c_str(), 48);
    EXPECT_EQ(program(), std::string(47, 'p'));
}

TEST_F(Query, SeesTheLiveFile)
{
    const uint32_t pid = 77;
    overwrite(48, &pid, sizeof pid);
    overwrite(52, "other", sizeof "other");
    const uint8_t platform = 2;
    overwrite(1, &platform, sizeof platform);
    pid_t seen_pid = 0;
    qn_uint32_t seen_platform = 0;
    EXPECT_EQ(tr_query_pid_1(handle, &seen_pid), 0);
    EXPECT_EQ(tr_query_platform_1(handle, &seen_platform), 0);
    EXPECT_EQ(seen_pid, 77);
    EXPECT_EQ(seen_platform, 2U);
    EXPECT_EQ(program(), "other");
}

TEST_F(Query, OutlivesTheFilesName)
{
    unlink(file.c_str());
    EXPECT_EQ(program(), "/usr/sbin/daemon");
}

TEST_F(Query, LeavesNoNameWhenThereIsNoMemoryForIt)
{
    char place[4] = "";
    qn_char_t *name = place;
    qn_int32_t status = 0;
    {
        const failing_allocation out_of_memory(1);
        status = tr_query_prog_1(handle, &name);
    }
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(name, nullptr);
}

TEST_F(Query, ClosesAndClearsTheErrorRecord)
{
    leave_marker();
    EXPECT_EQ(after(tr_close_query_1(handle)), success());
    handle = nullptr;
}

TEST_F(Query, ServesSeveralHandlesOnOneFile)
{
    tr_query_handle_t other = nullptr;
    ASSERT_EQ(tr_open_query_1(file.c_str(), &other), 0);
    EXPECT_NE(other, handle);
    EXPECT_EQ(tr_close_query_1(other), 0);
    EXPECT_EQ(program(), "/usr/sbin/daemon");
}

TEST_F(Query, TellsWhatATraceOfThisProcessSays)
{
    const std::string trace = files / "own.trc";
    ASSERT_EQ(tr_set_filename_1(trace.c_str()), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    tr_query_handle_t own = nullptr;
    ASSERT_EQ(tr_open_query_1(trace.c_str(), &own), 0);
    pid_t pid = 0;
    qn_uint32_t platform = 0;
    EXPECT_EQ(tr_query_pid_1(own, &pid), 0);
    EXPECT_EQ(tr_query_platform_1(own, &platform), 0);
    EXPECT_EQ(pid, getpid());
    EXPECT_EQ(platform, 2U);
    EXPECT_EQ(tr_close_query_1(own), 0);
}

// Every call refuses it and touches no output.
void expect_refusal(tr_query_handle_t handle)
{
    pid_t pid = 4711;
    qn_uint32_t platform = 4711;
    char place[4] = "";
    qn_char_t *name = place;
    EXPECT_EQ(after(tr_query_pid_1(handle, &pid)), bad_handle);
    EXPECT_EQ(after(tr_query_prog_1(handle, &name)), bad_handle);
    EXPECT_EQ(after(tr_query_platform_1(handle, &platform)), bad_handle);
    EXPECT_EQ(after(tr_close_query_1(handle)), bad_handle);
    EXPECT_EQ(pid, 4711);
    EXPECT_EQ(platform, 4711U);
    EXPECT_EQ(name, place);
}

TEST(QueryHandle, IsRefusedWhenItIsNull) { expect_refusal(nullptr); }

TEST(QueryHandle, IsRefusedWithoutItsFourBytes)
{
    for (const char *id : {"XXXX", "    ", "_tr_", "_TR\0"}) {
        trace_query_anchor_t none{};
        std::memcpy(none.id, id, 4);
        none.fd = -1;
        expect_refusal(&none);
    }
    alignas(trace_query_anchor_t) char only_four[4] = {'N', 'O', 'P', 'E'}; // nothing behind them is looked at
    expect_refusal(reinterpret_cast<tr_query_handle_t>(only_four));
}
} // namespace
