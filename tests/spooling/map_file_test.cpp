// Mapping a whole file for reading.
#include <cerrno>

#include <sys/mman.h>
#include <sys/syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class MappedFile : public testing::Test
{
protected:
    void SetUp() override
    {
        write_file(file, contents);
        descriptors = open_descriptors();
    }
    qn_int32_t map_it() { return map_file(file.c_str(), &size, &map, &fd); }
    void expect_nothing_left()
    {
        calls() = {};
        EXPECT_EQ(size, 0U);
        EXPECT_EQ(map, nullptr);
        EXPECT_EQ(fd, -1);
        EXPECT_EQ(open_descriptors(), descriptors);
    }

    scratch folder;
    std::string file = folder / "f";
    std::string contents = std::string(5000, 'c');
    // What is there before the call is of no account.
    size_t size = 99;
    void *map = this;
    int fd = 99;
    int descriptors = 0;
};

TEST_F(MappedFile, IsThereAsAWhole)
{
    ASSERT_EQ(map_it(), 0);
    EXPECT_EQ(size, contents.size());
    EXPECT_EQ(std::string(static_cast<const char *>(map), size), contents);
    munmap(map, size);
    close(fd);
}

TEST_F(MappedFile, StaysOpen)
{
    ASSERT_EQ(map_it(), 0);
    char first = 0;
    EXPECT_EQ(pread(fd, &first, 1, 0), 1);
    EXPECT_EQ(first, 'c');
    EXPECT_EQ(write(fd, "x", 1), -1) << "for reading only";
    munmap(map, size);
    close(fd);
}

TEST_F(MappedFile, IsSharedAndReadOnly)
{
    calls().mmap = [](size_t bytes, int protection, int flags, int of, off_t offset) {
        EXPECT_EQ(bytes, 5000U);
        EXPECT_EQ(protection, PROT_READ);
        EXPECT_EQ(flags, MAP_SHARED);
        EXPECT_EQ(offset, 0);
        return __real_mmap(nullptr, bytes, protection, flags, of, offset);
    };
    ASSERT_EQ(map_it(), 0);
    munmap(map, size);
    close(fd);
}

TEST_F(MappedFile, IsOpenedDespiteInterruptions)
{
    int interruptions = 3;
    calls().open = [&](const char *name, int flags, mode_t mode) {
        return interruptions-- > 0 ? fail_with(EINTR) : __real_open(name, flags, mode);
    };
    ASSERT_EQ(map_it(), 0);
    munmap(map, size);
    close(fd);
}

TEST_F(MappedFile, HasAValidName)
{
    for (const int error : {EFAULT, EINVAL}) {
        calls().open = [=](const char *, int, mode_t) { return fail_with(error); };
        EXPECT_EQ(map_it(), 17);
        EXPECT_EQ(last_error().text, "2625-016 Trace filename \"" + file + "\" is invalid.\n");
        expect_nothing_left();
    }
}

TEST_F(MappedFile, Exists)
{
    file = folder / "missing";
    EXPECT_EQ(map_it(), 18);
    EXPECT_EQ(last_error().code, 18);
    EXPECT_EQ(last_error().text, "2625-017 Error " + std::to_string(ENOENT) + " opening trace file.\n");
    expect_nothing_left();
}

// Only a file that is written can want for space.
TEST_F(MappedFile, IsNotRefusedForLackOfSpace)
{
    calls().open = [](const char *, int, mode_t) { return fail_with(ENOSPC); };
    EXPECT_EQ(map_it(), 18);
    expect_nothing_left();
}

TEST_F(MappedFile, HasAStatus)
{
    calls().fstat = [](int, struct stat *) { return fail_with(EIO); };
    EXPECT_EQ(map_it(), 19);
    EXPECT_EQ(last_error().code, 19);
    EXPECT_EQ(last_error().message_number, 19);
    expect_nothing_left();
}

TEST_F(MappedFile, CanBeMapped)
{
    calls().mmap = [](size_t, int, int, int, off_t) {
        errno = ENOMEM;
        return MAP_FAILED;
    };
    EXPECT_EQ(map_it(), 21);
    EXPECT_EQ(last_error().code, 21);
    EXPECT_EQ(last_error().text,
              "2625-020 Error " + std::to_string(ENOMEM) + " was returned when attempting to mmap() trace file.\n");
    expect_nothing_left();
}

TEST_F(MappedFile, IsNotEmpty)
{
    write_file(file, "");
    EXPECT_EQ(map_it(), 21);
    expect_nothing_left();
}

TEST_F(MappedFile, TellsItsSize)
{
    debug_on();
    ASSERT_EQ(map_it(), 0);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "map_file: " + file + " - 5000 bytes\n"));
    munmap(map, size);
    close(fd);
}
} // namespace
