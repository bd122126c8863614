// A thread cancelled in the middle of a start: nothing is left open, mapped or locked.
#include <cerrno>

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

class CancelledStart : public testing::Test
{
protected:
    void expect_nothing_left(trace_anchor_t *anchor, int descriptors)
    {
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(anchor->mapFd, -1);
        EXPECT_EQ(anchor->pMap, nullptr);
        EXPECT_EQ(anchor->pMapEnd, nullptr);
        EXPECT_EQ(anchor->uMaxSize, 0U);
        EXPECT_TRUE(is_free(anchor->anchorMutex));
        calls() = {};
        EXPECT_EQ(start(anchor), 0) << "the next start succeeds";
        EXPECT_EQ(trace_image::of_file(anchor->fileName).records_of(16).size(), 1U);
        stop(anchor);
    }

    void block_in_fsync()
    {
        calls().fsync = [this](int) {
            thread.block();
            return 0;
        };
    }

    scratch folder;
    cancelled_thread thread;
};

TEST_F(CancelledStart, InTheSyncLeavesNothing)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    block_in_fsync();
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    expect_nothing_left(anchor, descriptors);
}

TEST_F(CancelledStart, WhileOpeningLeavesNothing)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    calls().open = [this](const char *, int, mode_t) {
        thread.block();
        return -1;
    };
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    expect_nothing_left(anchor, descriptors);
}

TEST_F(CancelledStart, WhileExtendingLeavesNothing)
{
    trace_anchor_t *anchor = anchor_for(folder / "f", 1048576);
    int writes = 0;
    calls().write = [&](int fd, const void *bytes, size_t count) {
        if (++writes == 3) thread.block();
        return __real_write(fd, bytes, count);
    };
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    expect_nothing_left(anchor, descriptors);
}

// The program's name is read when the file is mapped already.
TEST_F(CancelledStart, WithTheFileMappedUnmapsIt)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    const unsigned char *mapped = nullptr;
    calls().proc_args = [&](pid_t, char *, size_t) {
        mapped = anchor->pMap;
        thread.block();
        return 0;
    };
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    EXPECT_NE(mapped, nullptr);
    expect_nothing_left(anchor, descriptors);
}

TEST_F(CancelledStart, InARegistrationLeavesTheLibraryFree)
{
    ASSERT_EQ(tr_set_filename_1((folder / "f").c_str()), 0);
    block_in_fsync();
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] {
        client program("ABCD");
        program.register_now();
    }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_EQ(anchors.pFirstComp, nullptr) << "the half-built component is gone";
    expect_nothing_left(&anchors, descriptors);
}

TEST_F(CancelledStart, InAChangeOfTheFileNameLeavesTheLibraryFree)
{
    client program("ABCD");
    ASSERT_EQ(program.register_now(), 0);
    block_in_fsync();
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { tr_set_filename_1((folder / "f").c_str()); }));
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    expect_nothing_left(&anchors, descriptors);
}

// A number that was closed is another file's at once, and the trace that had it may not have taken note yet.
TEST_F(CancelledStart, LeavesATraceAloneThatHasTheSameDescriptor)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    trace_anchor_t *other = anchor_for(folder / "other");
    ASSERT_EQ(start(other), 0);
    calls().fsync = [&](int fd) {
        other->mapFd = fd;
        thread.block();
        return 0;
    };
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    EXPECT_NE(other->pMap, nullptr);
    other->mapFd = -1;
    expect_nothing_left(anchor, descriptors);
    stop(other);
}

// A writer, who starts its own damaged trace afresh, holds no lock that would keep the pages of other traces there.
TEST_F(CancelledStart, OfADamagedTraceByItsWriterLooksAtNoPagesOfOthers)
{
    client program("ABCD");
    ASSERT_EQ(program.register_now(), 0);
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    anchor->pNextFree->length = 0;
    void *gone = mmap(nullptr, sizeof(trace_anchor_t), PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(gone, MAP_FAILED);
    trace_anchor_t *other = anchor_for(folder / "other");
    other->nextPage = static_cast<trace_anchor_t *>(gone);
    block_in_fsync();
    const int descriptors = open_descriptors();
    EXPECT_TRUE(thread.run([&] { tr_ms_record_id_1("ABCD", 1, anchor); }));
    other->nextPage = nullptr;
    munmap(gone, sizeof(trace_anchor_t));
    EXPECT_TRUE(exists(folder / "f.save"));
    expect_nothing_left(anchor, descriptors);
}

// Without standard input, a trace file is opened as descriptor 0.
class StartWithDescriptorZero : public CancelledStart
{
protected:
    void SetUp() override
    {
        kept = dup(0);
        close(0);
    }
    void TearDown() override
    {
        close(0);
        if (kept != -1) dup2(kept, 0);
    }
    static bool is_open() { return fcntl(0, F_GETFD) != -1; }

    int kept = -1;
};

TEST_F(StartWithDescriptorZero, ClosesItWhenItSucceeds)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    EXPECT_EQ(start(anchor), 0);
    EXPECT_FALSE(is_open());
    stop(anchor);
}

TEST_F(StartWithDescriptorZero, ClosesItWhenItFails)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    calls().fstatvfs = [](int fd, struct statvfs *) {
        EXPECT_EQ(fd, 0);
        return fail_with(EIO);
    };
    EXPECT_EQ(start(anchor), 22);
    EXPECT_FALSE(is_open());
}

TEST_F(StartWithDescriptorZero, LeavesItOpenWhenItIsCancelled)
{
    trace_anchor_t *anchor = anchor_for(folder / "f");
    block_in_fsync();
    EXPECT_TRUE(thread.run([&] { start(anchor); }));
    EXPECT_TRUE(is_open());
    EXPECT_EQ(anchor->mapFd, -1);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_TRUE(is_free(anchor->anchorMutex));
}

bool is_open(int fd) { return fcntl(fd, F_GETFD) != -1; }

TEST(CancelStartTrace, ClosesTheDescriptor)
{
    int fd = ::open("/dev/null", O_RDONLY);
    ASSERT_GT(fd, 0);
    cancel_start_trace(&fd);
    EXPECT_FALSE(is_open(fd));
}

// It may be the client's standard input.
TEST(CancelStartTrace, LeavesDescriptorZeroOpen)
{
    ASSERT_NE(dup2(::open("/dev/null", O_RDONLY), 0), -1);
    int fd = 0;
    cancel_start_trace(&fd);
    EXPECT_TRUE(is_open(0));
}

TEST(CancelStartTrace, DoesNothingWithoutADescriptor)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    ASSERT_EQ(anchor->mapFd, -1);
    const int descriptors = open_descriptors();
    int fd = -1;
    cancel_start_trace(&fd);
    EXPECT_EQ(open_descriptors(), descriptors);
    EXPECT_NE(anchor->pMap, nullptr) << "no file is being opened, none is given up";
    stop(anchor);
}

TEST(CancelStartTrace, UnmapsTheFileThatWasBeingOpened)
{
    const scratch folder;
    trace_anchor_t *other = anchor_for(folder / "other");
    ASSERT_EQ(start(other), 0);
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    int fd = ::open((folder / "f").c_str(), O_RDWR);
    ASSERT_GT(fd, 0);
    anchor->mapFd = fd;
    const unsigned char *map = anchor->pMap;
    cancel_start_trace(&fd);
    EXPECT_EQ(anchor->mapFd, -1);
    EXPECT_EQ(anchor->pMap, nullptr);
    EXPECT_EQ(anchor->pMapEnd, nullptr);
    unsigned char resident[16];
    EXPECT_EQ(mincore(const_cast<unsigned char *>(map), 65536, resident), -1) << "nothing is mapped there";
    EXPECT_NE(other->pMap, nullptr);
    stop(other);
}
} // namespace
