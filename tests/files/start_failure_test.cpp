// Every way in which a start fails: its code, its message, and that nothing stays behind.
#include <cerrno>

#include <fcntl.h>
#include <sys/mman.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

class FailingStart : public testing::Test
{
protected:
    // Starts the file, which fails with that code and message, and leaves no trace in the process.
    void expect_failure(int code, int message_number, const std::string &text)
    {
        trace_anchor_t *anchor = anchor_for(file);
        const int descriptors = open_descriptors();
        EXPECT_EQ(start(anchor), code);
        EXPECT_EQ(last_error().code, code);
        EXPECT_EQ(last_error().message_number, message_number);
        EXPECT_EQ(last_error().text, text);
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(anchor->mapFd, -1);
        EXPECT_EQ(anchor->pMap, nullptr);
        EXPECT_EQ(anchor->pMapEnd, nullptr);
        EXPECT_EQ(anchor->uMaxSize, 0U);
        EXPECT_TRUE(is_free(anchor->anchorMutex));

        calls() = {};
        EXPECT_EQ(start(anchor), 0) << "what failed once may succeed later";
        stop(anchor);
    }

    scratch folder;
    std::string file = folder / "f";
};

class FailingOpen : public FailingStart, public testing::WithParamInterface<int>
{
protected:
    void SetUp() override
    {
        calls().open = [](const char *, int, mode_t) { return fail_with(GetParam()); };
    }
};

using InvalidName = FailingOpen;

TEST_P(InvalidName, IsError17WithTheName)
{
    expect_failure(17, 17, "2625-016 Trace filename \"" + file + "\" is invalid.\n");
}

INSTANTIATE_TEST_SUITE_P(Errors, InvalidName, testing::Values(EFAULT, EINVAL));

using FullDiskAtOpen = FailingOpen;

TEST_P(FullDiskAtOpen, IsError35WithMessage36)
{
    expect_failure(35, 36, "2625-035 There is insufficient free space in file system to create trace file.\n");
}

INSTANTIATE_TEST_SUITE_P(Errors, FullDiskAtOpen, testing::Values(ENOSPC));

using OtherOpenFailure = FailingOpen;

TEST_P(OtherOpenFailure, IsError18WithItsNumber)
{
    expect_failure(18, 18, "2625-017 Error " + std::to_string(GetParam()) + " opening trace file.\n");
}

INSTANTIATE_TEST_SUITE_P(Errors, OtherOpenFailure,
                         testing::Values(EACCES, EMFILE, ENOENT, EROFS, ELOOP, ENAMETOOLONG, EISDIR, EPERM));

TEST_F(FailingStart, OpensAgainAfterAnInterruption)
{
    int interruptions = 3;
    calls().open = [&](const char *name, int flags, mode_t mode) {
        return interruptions-- > 0 ? fail_with(EINTR) : __real_open(name, flags, mode);
    };
    trace_anchor_t *anchor = anchor_for(file);
    EXPECT_EQ(start(anchor), 0);
    EXPECT_EQ(interruptions, -1);
    stop(anchor);
}

TEST_F(FailingStart, OpensReadWriteAndCreatesForTheOwnerAlone)
{
    calls().open = [&](const char *name, int flags, mode_t mode) {
        EXPECT_EQ(std::string(name), file);
        EXPECT_EQ(flags & O_ACCMODE, O_RDWR);
        EXPECT_NE(flags & O_CREAT, 0);
        EXPECT_EQ(flags & (O_TRUNC | O_EXCL | O_APPEND), 0);
        EXPECT_EQ(mode, 0600U);
        return __real_open(name, flags, mode);
    };
    trace_anchor_t *anchor = anchor_for(file);
    EXPECT_EQ(start(anchor), 0);
    stop(anchor);
}

TEST_F(FailingStart, RefusesAFileSystemOfTypeZero)
{
    calls().fstatfs = [](int, struct statfs *fs) {
        *fs = {};
        return 0;
    };
    expect_failure(19, 35, "2625-034 Trace file cannot be put in AFS file system on linux.\n");
}

TEST_F(FailingStart, SkipsTheFileSystemTestWhenItCannotBeMade)
{
    calls().fstatfs = [](int, struct statfs *fs) {
        *fs = {};
        return fail_with(ENOSYS);
    };
    trace_anchor_t *anchor = anchor_for(file);
    EXPECT_EQ(start(anchor), 0);
    stop(anchor);
}

TEST_F(FailingStart, ShowsTheResultOfFstatAndNotItsErrno)
{
    calls().fstat = [](int, struct stat *) { return fail_with(EIO); };
    expect_failure(19, 19, "2625-018 Error -1 returned from fstat() on trace file.\n");
}

TEST_F(FailingStart, ReportsAFailingFstatvfs)
{
    calls().fstatvfs = [](int, struct statvfs *) { return fail_with(EOVERFLOW); };
    expect_failure(22, 22,
                   "2625-021 Error " + std::to_string(EOVERFLOW) +
                       " was returned when attempting to change the size of the trace file.\n");
}

TEST_F(FailingStart, ReportsAFailingWrite)
{
    calls().write = [](int, const void *, size_t) { return fail_with(EIO); };
    expect_failure(23, 23,
                   "2625-022 Error " + std::to_string(EIO) +
                       " was returned when attempting to clear the contents of the trace file.\n");
}

TEST_F(FailingStart, ReportsAFailingMmap)
{
    calls().mmap = [](size_t, int, int, int, off_t) {
        errno = ENODEV;
        return MAP_FAILED;
    };
    expect_failure(
        21, 21, "2625-020 Error " + std::to_string(ENODEV) + " was returned when attempting to mmap() trace file.\n");
}

TEST_F(FailingStart, MapsTheWholeFileSharedReadAndWrite)
{
    size_t mapped = 0;
    calls().mmap = [&](size_t size, int protection, int flags, int fd, off_t offset) {
        mapped = size;
        EXPECT_EQ(protection, PROT_READ | PROT_WRITE);
        EXPECT_EQ(flags, MAP_SHARED);
        EXPECT_EQ(offset, 0);
        return __real_mmap(nullptr, size, protection, flags, fd, offset);
    };
    trace_anchor_t *anchor = anchor_for(file, 131072);
    EXPECT_EQ(start(anchor), 0);
    EXPECT_EQ(mapped, 131072U);
    stop(anchor);
}

TEST_F(FailingStart, KeepsNoDescriptorWhenItSucceeds)
{
    trace_anchor_t *anchor = anchor_for(file);
    const int descriptors = open_descriptors();
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(open_descriptors(), descriptors);
    EXPECT_EQ(anchor->mapFd, -1);
    stop(anchor);
}

TEST_F(FailingStart, GivesRegistrationItsCodeAndKeepsTheComponent)
{
    ASSERT_EQ(tr_set_filename_1((folder / "missing/f").c_str()), 0);
    client program("ABCD");
    EXPECT_EQ(program.register_now(), 18);
    EXPECT_EQ(last_error().message_number, 18);
    EXPECT_EQ(program.levels[0], 1);
    EXPECT_EQ(tr_record_id_1("ABCD", 1), 0) << "records are dropped";
}
} // namespace
