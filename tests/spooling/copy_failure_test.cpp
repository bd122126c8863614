// Copies that fail: the error that is recorded, and that nothing is left of them.
#include <algorithm>
#include <cerrno>
#include <filesystem>

#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class FailedCopy : public testing::Test
{
protected:
    void SetUp() override
    {
        write_file(source, std::string(600000, 's'));
        descriptors = open_descriptors();
        leave_marker();
    }
    void expect_nothing_left()
    {
        calls() = {};
        spool_calls() = {};
        EXPECT_FALSE(exists(dest));
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_TRUE(exists(source));
    }

    qn_int32_t copy_memory() { return cp_mapped_file(dest.c_str(), nullptr, memory.data(), 5000); }
    qn_int32_t copy_source() { return cp_mapped_file(dest.c_str(), source.c_str(), nullptr, 0); }

    // Opening that file fails, once or for good; the other opens.
    static void fail_open(const std::string &file, int error, int times = 1'000'000)
    {
        calls().open = [=](const char *name, int flags, mode_t mode) mutable {
            return name == file && times-- > 0 ? fail_with(error) : __real_open(name, flags, mode);
        };
    }

    scratch folder;
    std::string dest = folder / "copy";
    std::string source = folder / "source";
    std::string memory = std::string(5000, 'm');
    int descriptors = 0;
};

struct open_error {
    int number;
    int code;
    std::string text; // NAME stands for the file's
};

void PrintTo(const open_error &error, std::ostream *out) { *out << "errno " << error.number; }

std::string with_name(std::string text, const std::string &name)
{
    const size_t place = text.find("NAME");
    return place == std::string::npos ? text : text.replace(place, 4, name);
}

const std::string invalid_name = "2625-016 Trace filename \"NAME\" is invalid.\n";
std::string open_failed(int number) { return "2625-017 Error " + std::to_string(number) + " opening trace file.\n"; }

class UnopenedCopy : public FailedCopy, public testing::WithParamInterface<open_error>
{
};

TEST_P(UnopenedCopy, IsReported)
{
    fail_open(dest, GetParam().number);
    EXPECT_EQ(copy_memory(), GetParam().code);
    EXPECT_EQ(last_error().code, GetParam().code);
    EXPECT_EQ(last_error().text, with_name(GetParam().text, dest));
    expect_nothing_left();
}

INSTANTIATE_TEST_SUITE_P(
    Errors, UnopenedCopy,
    testing::Values(open_error{EFAULT, 17, invalid_name}, open_error{EINVAL, 17, invalid_name},
                    open_error{ENOSPC, 35,
                               "2625-035 There is insufficient free space in file system to create trace file.\n"},
                    open_error{ENOENT, 18, open_failed(ENOENT)}, open_error{EACCES, 18, open_failed(EACCES)},
                    open_error{EMFILE, 18, open_failed(EMFILE)}, open_error{EROFS, 18, open_failed(EROFS)},
                    open_error{EDQUOT, 18, open_failed(EDQUOT)}));

class UnopenedSource : public FailedCopy, public testing::WithParamInterface<open_error>
{
};

TEST_P(UnopenedSource, IsReported)
{
    fail_open(source, GetParam().number);
    EXPECT_EQ(copy_source(), GetParam().code);
    EXPECT_EQ(last_error().code, GetParam().code);
    EXPECT_EQ(last_error().text, with_name(GetParam().text, source));
    expect_nothing_left();
}

INSTANTIATE_TEST_SUITE_P(Errors, UnopenedSource,
                         testing::Values(open_error{EFAULT, 17, invalid_name}, open_error{EINVAL, 17, invalid_name},
                                         open_error{ENOSPC, 18, open_failed(ENOSPC)},
                                         open_error{ENOENT, 18, open_failed(ENOENT)},
                                         open_error{EACCES, 18, open_failed(EACCES)}));

TEST_F(FailedCopy, IsNoneBecauseOfInterruptions)
{
    fail_open(dest, EINTR, 3);
    EXPECT_EQ(copy_memory(), 0);
    EXPECT_EQ(file_bytes(dest), memory);
    fail_open(source, EINTR, 3);
    EXPECT_EQ(copy_source(), 0);
    EXPECT_EQ(file_bytes(dest).size(), 600000U);
    EXPECT_TRUE(marker_is_there());
}

TEST_F(FailedCopy, IsOpenedForReadingAndWriting)
{
    int opened = 0;
    calls().open = [&](const char *name, int flags, mode_t mode) {
        if (name == dest) {
            ++opened;
            EXPECT_EQ(flags & O_ACCMODE, O_RDWR);
            EXPECT_NE(flags & O_CREAT, 0);
            EXPECT_EQ(mode, 0600U);
        } else {
            EXPECT_EQ(flags & O_ACCMODE, O_RDONLY);
        }
        return __real_open(name, flags, mode);
    };
    EXPECT_EQ(copy_source(), 0);
    EXPECT_EQ(opened, 1);
}

TEST_F(FailedCopy, OfMemoryIsRemovedWhenItCannotBeWritten)
{
    int call = 0;
    calls().write = [&](int fd, const void *bytes, size_t) -> ssize_t {
        return ++call == 1 ? __real_write(fd, bytes, 100) : fail_with(ENOSPC);
    };
    EXPECT_EQ(copy_memory(), 49);
    EXPECT_EQ(last_error().code, 49);
    EXPECT_EQ(last_error().text, "2625-039 The write() system call failed, errno(" + std::to_string(ENOSPC) + ").\n");
    expect_nothing_left();
}

TEST_F(FailedCopy, OfAFileIsRemovedWhenItCannotBeWritten)
{
    int call = 0;
    calls().write = [&](int fd, const void *bytes, size_t count) -> ssize_t {
        return ++call == 1 ? __real_write(fd, bytes, count) : fail_with(EIO);
    };
    EXPECT_EQ(copy_source(), 49);
    EXPECT_EQ(last_error().code, 49);
    expect_nothing_left();
}

TEST_F(FailedCopy, IsRemovedWhenTheSourceCannotBeRead)
{
    int call = 0;
    spool_calls().read = [&](int fd, void *bytes, size_t count) -> ssize_t {
        return ++call == 1 ? __real_read(fd, bytes, count) : fail_with(EIO);
    };
    EXPECT_EQ(copy_source(), 18);
    spool_calls() = {};
    EXPECT_EQ(last_error().code, 18);
    EXPECT_EQ(last_error().text, open_failed(EIO));
    expect_nothing_left();
}

TEST_F(FailedCopy, IsNoneWhenReadingIsInterruptedOrComesInPieces)
{
    int call = 0;
    size_t most = 0;
    spool_calls().read = [&](int fd, void *bytes, size_t count) -> ssize_t {
        most = std::max(most, count);
        return ++call % 2 == 1 ? fail_with(EINTR) : __real_read(fd, bytes, std::min<size_t>(count, 99999));
    };
    EXPECT_EQ(copy_source(), 0);
    spool_calls() = {};
    EXPECT_TRUE(file_bytes(dest) == file_bytes(source));
    EXPECT_EQ(most, 262144U);
}

TEST_F(FailedCopy, OfAFileNeedsMemory)
{
    calls().malloc = [](size_t) -> void * { return nullptr; };
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    EXPECT_EQ(copy_source(), 14);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    expect_nothing_left();
}

TEST_F(FailedCopy, OfADirectoryIsRemoved)
{
    source = folder.folder();
    EXPECT_EQ(copy_source(), 18);
    EXPECT_EQ(last_error().text, open_failed(EISDIR));
    expect_nothing_left();
}

// ---- Pipes: who opens one for reading would wait for a writer.

class CopyOfAPipe : public FailedCopy
{
protected:
    void SetUp() override
    {
        FailedCopy::SetUp();
        ASSERT_EQ(unlink(source.c_str()), 0);
        ASSERT_EQ(mkfifo(source.c_str(), 0600), 0);
        calls().open = [this](const char *name, int flags, mode_t mode) {
            if (name != source || (flags & O_NONBLOCK) != 0) return __real_open(name, flags, mode);
            ADD_FAILURE() << "this would wait";
            return fail_with(ENXIO);
        };
    }
};

TEST_F(CopyOfAPipe, IsEmptyWhenNobodyWritesIt)
{
    EXPECT_EQ(copy_source(), 0);
    EXPECT_EQ(file_bytes(dest), "");
    EXPECT_EQ(open_descriptors(), descriptors);
}

TEST_F(CopyOfAPipe, IsRemovedWhenItsWriterHasNothingToSay)
{
    const int writer = __real_open(source.c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_NE(writer, -1);
    EXPECT_EQ(copy_source(), 18);
    EXPECT_EQ(last_error().text, open_failed(EAGAIN));
    close(writer);
    expect_nothing_left();
}

// ---- Full file systems, real ones. One without a free entry refuses the file, one without free space the contents.

TEST_F(FailedCopy, IntoAFileSystemWithoutEntriesIsReportedAsSuch)
{
    expect_in_private_var([this] {
        std::filesystem::create_directory("/var/d");
        ASSERT_EQ(mount("tmpfs", "/var/d", "tmpfs", 0, "nr_inodes=1"), 0);
        dest = "/var/d/copy";
        EXPECT_EQ(copy_memory(), 35);
        EXPECT_EQ(last_error().code, 35);
        EXPECT_EQ(last_error().message_number, 36);
        EXPECT_TRUE(entries_of("/var/d").empty());
    });
}

TEST_F(FailedCopy, IntoAFileSystemWithoutSpaceIsRemoved)
{
    expect_in_private_var([this] {
        std::filesystem::create_directory("/var/d");
        ASSERT_EQ(mount("tmpfs", "/var/d", "tmpfs", 0, "size=131072"), 0);
        dest = "/var/d/copy";
        EXPECT_EQ(copy_source(), 49);
        EXPECT_EQ(last_error().code, 49);
        EXPECT_TRUE(entries_of("/var/d").empty());
    });
}
} // namespace
