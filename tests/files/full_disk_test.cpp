// Starting a trace when the disk, or the process's file size limit, leaves it less room than it wants.
#include <algorithm>
#include <cerrno>
#include <csignal>

#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"
#include "support/private_var.h"

namespace
{
using namespace qn::test;

struct disk {
    unsigned long block_bytes;
    unsigned long free_blocks;
    unsigned long blocks;
    qn_uint32_t requested;
    qn_uint32_t size;
};

void PrintTo(const disk &given, std::ostream *out)
{
    *out << given.free_blocks << " of " << given.blocks << " blocks free, " << given.requested << " requested";
}

void pretend(const disk &given)
{
    calls().fstatvfs = [given](int, struct statvfs *fs) {
        *fs = {};
        fs->f_bsize = given.block_bytes;
        fs->f_bfree = given.free_blocks;
        fs->f_blocks = given.blocks;
        return 0;
    };
}

class DiskWithRoom : public testing::TestWithParam<disk>
{
};

TEST_P(DiskWithRoom, BoundsTheFile)
{
    const scratch folder;
    pretend(GetParam());
    trace_anchor_t *anchor = anchor_for(folder / "f", GetParam().requested);
    ASSERT_EQ(start(anchor), 0);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.size(), GetParam().size);
    EXPECT_EQ(image.file_size(), GetParam().size);
    image.ring();
    stop(anchor);
}

// One percent is held back. The arithmetic is unsigned: where less than that is free, the bound vanishes.
INSTANTIATE_TEST_SUITE_P(OfItsOwn, DiskWithRoom,
                         testing::Values(disk{1024, 100, 1000, 1048576, 92160}, disk{4096, 1000, 100, 65536, 65536},
                                         disk{4096, 17, 100, 65536, 65536}, disk{4096, 16, 100, 65536, 61440},
                                         disk{4096, 16, 99, 65536, 65536}, disk{4096, 1, 1, 65536, 4096},
                                         disk{1, 4095, 0, 65536, 4096}, disk{1, 4096, 0, 65536, 4096},
                                         disk{1, 4100, 0, 65536, 4100}, disk{4096, 10, 1000, 65536, 4096},
                                         disk{4096, 9, 1000, 65536, 65536}, disk{4096, 1UL << 40, 1, 65536, 65536}));

TEST(DiskWithoutRoom, LeavesALargerFileAtItsSize)
{
    const scratch folder;
    write_file(folder / "f", std::string(8192, 'x'));
    pretend({1, 100, 0, 65536, 0});
    start_without_record(folder / "f", 65536);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.size(), 8192U);
    EXPECT_EQ(image.ring().size(), 1U);
}

// Lets `room` bytes through, then fails.
void fail_writes_after(size_t room, int error)
{
    calls().write = [room, error](int fd, const void *bytes, size_t count) mutable {
        if (room == 0) return static_cast<ssize_t>(fail_with(error));
        const ssize_t written = __real_write(fd, bytes, std::min(room, count));
        room -= static_cast<size_t>(written);
        return written;
    };
}

class DiskThatGetsFull : public testing::TestWithParam<int>
{
};

TEST_P(DiskThatGetsFull, CutsTheFileToWholeMemoryPages)
{
    const scratch folder;
    fail_writes_after(10000, GetParam());
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.size(), 8192U);
    EXPECT_EQ(image.file_size(), 8192U);
    EXPECT_EQ(image.ring().size(), 2U);
    stop(anchor);
}

TEST_P(DiskThatGetsFull, IsEnoughForAFileOfOnePage)
{
    const scratch folder;
    fail_writes_after(4096, GetParam());
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(trace_image::of_file(folder / "f").size(), 4096U);
    stop(anchor);
}

TEST_P(DiskThatGetsFull, IsAnErrorBelowOnePage)
{
    const scratch folder;
    fail_writes_after(4095, GetParam());
    trace_anchor_t *anchor = anchor_for(folder / "f");
    EXPECT_EQ(start(anchor), 35);
    EXPECT_EQ(last_error().message_number, 36);
    EXPECT_EQ(last_error().text, "2625-035 There is insufficient free space in file system to create trace file.\n");
    EXPECT_EQ(anchor->pMap, nullptr);
}

TEST_P(DiskThatGetsFull, IsAnErrorWhenTheFileCannotBeCut)
{
    const scratch folder;
    fail_writes_after(10000, GetParam());
    calls().ftruncate = [](int, off_t size) {
        EXPECT_EQ(size, 8192);
        return fail_with(EPERM);
    };
    trace_anchor_t *anchor = anchor_for(folder / "f");
    EXPECT_EQ(start(anchor), 22);
    EXPECT_EQ(last_error().text, "2625-021 Error " + std::to_string(EPERM) +
                                     " was returned when attempting to change the size of the trace file.\n");
    EXPECT_EQ(anchor->pMap, nullptr);
}

INSTANTIATE_TEST_SUITE_P(Errors, DiskThatGetsFull, testing::Values(ENOSPC, EDQUOT));

TEST(DiskWithoutRoom, LeavesAnExistingFileItsOwnPages)
{
    const scratch folder;
    write_file(folder / "f", std::string(8192, 'x'));
    fail_writes_after(0, ENOSPC);
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(trace_image::of_file(folder / "f").size(), 8192U);
    stop(anchor);
}

// A file system of its own of 1 MiB: 256 blocks, of which 2 are held back.
class SmallDisk : public testing::Test
{
protected:
    static constexpr const char *place = "/var/small";

    // Runs the body with the small disk mounted and all but `blocks_free` of its blocks taken.
    static bool with_blocks_free(long blocks_free, const std::function<void()> &body)
    {
        return in_private_var([&] {
            mkdir(place, 0755);
            if (mount("tmpfs", place, "tmpfs", 0, "size=1m,mode=0755") != 0) return false;
            struct statvfs fs;
            EXPECT_EQ(::statvfs(place, &fs), 0);
            EXPECT_EQ(fs.f_bsize, 4096U);
            EXPECT_EQ(fs.f_blocks, 256U);
            write_file("/var/small/fill", std::string((fs.f_bfree - static_cast<size_t>(blocks_free)) * 4096, 'x'));
            EXPECT_EQ(::statvfs(place, &fs), 0);
            EXPECT_EQ(fs.f_bfree, static_cast<fsblkcnt_t>(blocks_free));
            body();
            return !HasFailure();
        });
    }

    // The file is started at that size, and every byte of its ring can be written.
    static void expect_usable(size_t size)
    {
        trace_anchor_t *anchor = anchor_for("/var/small/f", 4194304);
        ASSERT_EQ(start(anchor), 0) << last_error().text;
        EXPECT_EQ(trace_image::of_file("/var/small/f").size(), size);
        write_ids(anchor, static_cast<qn_uint32_t>(size / 16));
        EXPECT_EQ(ids_in("/var/small/f").back(), size / 16);
        stop(anchor);
    }
};

TEST_F(SmallDisk, TakesTheFileButForOnePercent)
{
    EXPECT_TRUE(with_blocks_free(100, [] { expect_usable(98 * 4096); }));
}

TEST_F(SmallDisk, TakesTheSmallestFileWhenAlmostFull)
{
    EXPECT_TRUE(with_blocks_free(3, [] { expect_usable(4096); }));
}

TEST_F(SmallDisk, TakesWhatIsLeftWhenTheBoundVanishes)
{
    EXPECT_TRUE(with_blocks_free(1, [] { expect_usable(4096); }));
}

TEST_F(SmallDisk, RefusesTheFileWhenFull)
{
    EXPECT_TRUE(with_blocks_free(0, [] {
        trace_anchor_t *anchor = anchor_for("/var/small/f");
        EXPECT_EQ(start(anchor), 35);
        EXPECT_EQ(last_error().message_number, 36);
        EXPECT_EQ(anchor->pMap, nullptr);
    }));
}

TEST_F(SmallDisk, IsFoundFullWhenAComponentRegisters)
{
    EXPECT_TRUE(with_blocks_free(0, [] {
        EXPECT_EQ(tr_set_filename_1("/var/small/f"), 0);
        client program("ABCD");
        EXPECT_EQ(program.register_now(), 35);
        EXPECT_EQ(last_error().code, 35);
        EXPECT_EQ(program.levels[0], 1) << "it is registered all the same";
        EXPECT_EQ(tr_record_id_1("ABCD", 1), 0);
    }));
}

// The limit for as long as the object lives.
class file_size_limit
{
public:
    explicit file_size_limit(rlim_t bytes)
    {
        getrlimit(RLIMIT_FSIZE, &before_);
        rlimit limit = before_;
        limit.rlim_cur = bytes;
        EXPECT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    }
    file_size_limit(const file_size_limit &) = delete;
    file_size_limit &operator=(const file_size_limit &) = delete;
    ~file_size_limit() { setrlimit(RLIMIT_FSIZE, &before_); }

private:
    rlimit before_{};
};

TEST(FileSizeLimit, IsAnErrorAndNotTheDeathOfTheProgram)
{
    const scratch folder;
    ASSERT_EQ(signal(SIGXFSZ, SIG_DFL), SIG_DFL) << "nobody handles the signal here";
    trace_anchor_t *anchor = anchor_for(folder / "f");
    const file_size_limit limit(32768);
    EXPECT_EQ(start(anchor), 23);
    EXPECT_EQ(last_error().text, "2625-022 Error " + std::to_string(EFBIG) +
                                     " was returned when attempting to clear the contents of the trace file.\n");
    EXPECT_EQ(anchor->pMap, nullptr);
}

TEST(FileSizeLimit, IsTheSameErrorWhereTheSignalIsIgnored)
{
    const scratch folder;
    signal(SIGXFSZ, SIG_IGN);
    trace_anchor_t *anchor = anchor_for(folder / "f");
    const file_size_limit limit(32768);
    EXPECT_EQ(start(anchor), 23);
    EXPECT_EQ(last_error().message_number, 23);
}

TEST(FileSizeLimit, AllowsAFileOfExactlyThatSize)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    const file_size_limit limit(65536);
    EXPECT_EQ(start(anchor), 0);
    stop(anchor);
}

TEST(FileSizeLimit, IsNoMatterForAFileThatIsNotExtended)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    const file_size_limit limit(4096);
    EXPECT_EQ(start(anchor), 0);
    stop(anchor);
}
} // namespace
