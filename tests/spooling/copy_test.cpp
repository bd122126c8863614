// What a copy holds, and how it is written.
#include <cerrno>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "spooling/copy_fixture.h"

namespace
{
using namespace qn::test;

std::string pattern_of(size_t bytes)
{
    std::string text(bytes, '\0');
    for (size_t i = 0; i < bytes; ++i) text[i] = static_cast<char>(i * 31 + i / 251);
    return text;
}

TEST_F(Copying, CopiesTheWholePage)
{
    write_ids(head, 100);
    ASSERT_EQ(copy_page(1), 0);
    EXPECT_EQ(file_bytes(copies + "/" + only_copy()), file_bytes(page(1)->fileName));
    EXPECT_EQ(ids_in(copies + "/" + only_copy()).size(), 100U);
}

TEST_F(Copying, CopiesTheMappingAndNotTheFileOfThatName)
{
    const std::string mapped = file_bytes(page(2)->fileName);
    std::filesystem::remove(page(2)->fileName);
    ASSERT_EQ(copy_page(2), 0);
    EXPECT_EQ(file_bytes(copies + "/" + only_copy()), mapped);
}

TEST_F(Copying, LeavesTheStateOfThePageAlone)
{
    page(2)->pMap[192] = 8;
    ASSERT_EQ(copy_page(2), 0);
    EXPECT_EQ(page(2)->pMap[192], 8);
}

TEST_F(Copying, MakesACopyForItsOwnerAlone)
{
    umask(0);
    ASSERT_EQ(copy_page(1), 0);
    struct stat status {
    };
    ASSERT_EQ(stat((copies + "/" + only_copy()).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0600U);
}

class CopiedSize : public Copying, public testing::WithParamInterface<size_t>
{
};

TEST_P(CopiedSize, IsThatOfTheFile)
{
    const std::string contents = pattern_of(GetParam());
    write_file(folder / "f", contents);
    ASSERT_EQ(copy_file(folder / "f", copies), 0);
    EXPECT_TRUE(file_bytes(copies + "/" + only_copy()) == contents);
}

INSTANTIATE_TEST_SUITE_P(Bytes, CopiedSize, testing::Values(0, 1, 262143, 262144, 262145, 600000));

TEST_F(Copying, CopiesNothingToDevNull)
{
    int opened = 0;
    calls().open = [&](const char *name, int flags, mode_t mode) {
        ++opened;
        return __real_open(name, flags, mode);
    };
    std::strcpy(spool.dest, "/dev/null");
    EXPECT_EQ(copy_page(1), 0);
    EXPECT_EQ(copy_file("/no/such/file", "/dev/null"), 0);
    EXPECT_EQ(opened, 0);
    EXPECT_TRUE(copied().empty());
}

TEST_F(Copying, TellsNothingOfWhatGoesToDevNull)
{
    std::strcpy(spool.dest, "/dev/null");
    debug_on();
    copy_page(1);
    EXPECT_TRUE(system_log().empty());
}

TEST_F(Copying, SyncsAPageFirstWhenThatIsAskedFor)
{
    use_msync_enabled_except_flush = 1;
    int syncs = 0;
    calls().msync = [&](void *map, size_t size, int flags) {
        EXPECT_EQ(map, page(2)->pMap);
        EXPECT_EQ(size, 65536U);
        EXPECT_EQ(flags, MS_ASYNC);
        EXPECT_TRUE(copied().empty());
        ++syncs;
        return 0;
    };
    ASSERT_EQ(copy_page(2), 0);
    EXPECT_EQ(syncs, 1);
    calls() = {};
}

TEST_F(Copying, SyncsNoPageUnlessThatIsAskedFor)
{
    calls().msync = [](void *, size_t, int) {
        ADD_FAILURE() << "nobody asked";
        return 0;
    };
    ASSERT_EQ(copy_page(2), 0);
    calls() = {};
}

TEST_F(Copying, SyncsNoFile)
{
    use_msync_enabled_except_flush = 1;
    calls().msync = [](void *, size_t, int) {
        ADD_FAILURE() << "it is not mapped";
        return 0;
    };
    write_file(folder / "f", "x");
    ASSERT_EQ(copy_file(folder / "f", copies), 0);
    calls() = {};
}

TEST_F(Copying, DoesNotForceTheCopyToTheDisk)
{
    calls().fsync = [](int) {
        ADD_FAILURE() << "that would keep writers waiting";
        return 0;
    };
    ASSERT_EQ(copy_page(1), 0);
    calls() = {};
}

TEST_F(Copying, LeavesNoDescriptorOpen)
{
    write_file(folder / "f", "x");
    const int before = open_descriptors();
    ASSERT_EQ(copy_page(1), 0);
    ASSERT_EQ(copy_file(folder / "f", copies), 0);
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(Copying, TellsOfAPage)
{
    be_at(13, 45, 7, 123456);
    debug_on();
    copy_page(2);
    const std::string name = page(2)->fileName;
    const std::string path = copies + "/app.trc.2.sp.2024_05_01_13_45_07.123456";
    EXPECT_TRUE(system_log_has(LOG_WARNING, "do_spool: " + path + "\n"));
    EXPECT_TRUE(system_log_has(LOG_WARNING, "cp_mapped_file: " + path + " - 65536 bytes\n"));
    EXPECT_TRUE(system_log_has(LOG_WARNING, name + " copied to " + path + "\n"));
}

TEST_F(Copying, TellsOfAFile)
{
    be_at(13, 45, 7, 123456);
    write_file(folder / "f", "x");
    debug_on();
    copy_file(folder / "f", copies);
    const std::string path = copies + "/f.2024_05_01_13_45_07.123456";
    EXPECT_TRUE(system_log_has(LOG_WARNING, "cp_mapped_file: " + path + " - from " + folder / "f" + "\n"));
    EXPECT_TRUE(system_log_has(LOG_WARNING, folder / "f" + " copied to " + path + "\n"));
}

TEST_F(Copying, TellsThatItCopiedEvenIfItCouldNot)
{
    be_at(13, 45, 7, 123456);
    std::filesystem::remove(copies);
    debug_on();
    EXPECT_NE(copy_page(2), 0);
    EXPECT_TRUE(system_log_has(page(2)->fileName + std::string(" copied to ") + copies +
                               "/app.trc.2.sp.2024_05_01_13_45_07.123456\n"));
}

// ---- Writing a buffer as a whole.

class WholeBuffer : public testing::Test
{
protected:
    WholeBuffer() : fd(open((folder / "f").c_str(), O_RDWR | O_CREAT, 0600)) {}
    ~WholeBuffer() override { close(fd); }
    qn_int32_t write_all() { return write_buffer_to_file(fd, bytes.data(), bytes.size(), &written); }

    scratch folder;
    std::string bytes = pattern_of(1000);
    size_t written = 4711;
    int fd;
};

TEST_F(WholeBuffer, IsWrittenAtOnce)
{
    EXPECT_EQ(write_all(), 0);
    EXPECT_EQ(written, 1000U);
    EXPECT_EQ(file_bytes(folder / "f"), bytes);
}

TEST_F(WholeBuffer, IsWrittenInPieces)
{
    calls().write = [](int to, const void *from, size_t count) {
        return __real_write(to, from, count > 7 ? 7 : count);
    };
    EXPECT_EQ(write_all(), 0);
    EXPECT_EQ(written, 1000U);
    EXPECT_EQ(file_bytes(folder / "f"), bytes);
}

TEST_F(WholeBuffer, IsWrittenDespiteInterruptions)
{
    int call = 0;
    calls().write = [&](int to, const void *from, size_t count) -> ssize_t {
        return ++call % 2 == 1 ? fail_with(EINTR) : __real_write(to, from, count > 400 ? 400 : count);
    };
    EXPECT_EQ(write_all(), 0);
    EXPECT_EQ(written, 1000U);
    EXPECT_EQ(file_bytes(folder / "f"), bytes);
}

TEST_F(WholeBuffer, MayBeEmpty)
{
    bytes.clear();
    EXPECT_EQ(write_all(), 0);
    EXPECT_EQ(written, 0U);
}

TEST_F(WholeBuffer, TellsHowMuchWasWrittenBeforeAFailure)
{
    int call = 0;
    calls().write = [&](int to, const void *from, size_t) -> ssize_t {
        return ++call == 1 ? __real_write(to, from, 300) : fail_with(EIO);
    };
    EXPECT_EQ(write_all(), 49);
    EXPECT_EQ(written, 300U);
    EXPECT_EQ(last_error().code, 49);
    EXPECT_EQ(last_error().text, "2625-039 The write() system call failed, errno(" + std::to_string(EIO) + ").\n");
}
} // namespace
