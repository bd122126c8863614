// How large a trace file gets, and how it is brought to its size: written, never sparse.
#include <algorithm>
#include <cerrno>

#include <fcntl.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

struct rounding {
    qn_uint32_t requested;
    qn_uint32_t size;
};

void PrintTo(const rounding &given, std::ostream *out) { *out << given.requested << " bytes"; }

class FileSize : public testing::TestWithParam<rounding>
{
};

TEST_P(FileSize, IsTheRequestRoundedUpToMemoryPages)
{
    ASSERT_EQ(sysconf(_SC_PAGESIZE), 4096);
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f", GetParam().requested);
    ASSERT_EQ(start(anchor), 0);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.size(), GetParam().size);
    EXPECT_EQ(image.file_size(), GetParam().size);
    image.ring();
    EXPECT_EQ(anchor->uActualFileSize, GetParam().size);
    EXPECT_EQ(anchor->pMapEnd, anchor->pMap + GetParam().size);
    EXPECT_EQ(anchor->uMaxSize, (GetParam().size - 200) / 2 / 4 * 4);
    stop(anchor);
}

INSTANTIATE_TEST_SUITE_P(Requests, FileSize,
                         testing::Values(rounding{65536, 65536}, rounding{65537, 69632}, rounding{69632, 69632},
                                         rounding{4096, 4096}, rounding{4097, 8192}, rounding{1, 4096},
                                         rounding{1048576, 1048576}));

TEST(FileSizeOfZero, CannotBeMapped)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f", 0);
    EXPECT_EQ(start(anchor), 21);
    EXPECT_EQ(anchor->pMap, nullptr);
}

TEST(LargerFile, IsKeptAtItsSizeWithItsRingInitialised)
{
    const scratch folder;
    trace_anchor_t *large = anchor_for(folder / "f", 1048576);
    ASSERT_EQ(start(large), 0);
    write_ids(large, 3);
    stop(large);

    large->uRequestedFileSize = 65536;
    ASSERT_EQ(start(large), 0);
    const trace_image image = trace_image::of_file(folder / "f");
    EXPECT_EQ(image.size(), 1048576U);
    EXPECT_EQ(image.file_size(), 1048576U);
    EXPECT_EQ(image.records().size(), 1U) << "only the new start record";
    EXPECT_EQ(large->uActualFileSize, 1048576U);
    stop(large);
}

TEST(LargerFile, IsNotRewritten)
{
    const scratch folder;
    write_file(folder / "f", std::string(131072, '\x77'));
    start_without_record(folder / "f", 65536);
    EXPECT_EQ(file_bytes(folder / "f").substr(228), std::string(131072 - 228, '\x77'));
}

// What every write of a start is given.
struct watched_writes {
    watched_writes()
    {
        calls().write = [this](int fd, const void *bytes, size_t count) {
            counts.push_back(count);
            chunks.emplace_back(static_cast<const char *>(bytes), count);
            const size_t most = shortened_to.size() >= counts.size() ? shortened_to[counts.size() - 1] : count;
            const ssize_t written = __real_write(fd, bytes, std::min(most, count));
            total += static_cast<size_t>(written);
            return written;
        };
    }
    std::vector<size_t> counts;
    std::vector<std::string> chunks;
    std::vector<size_t> shortened_to; // what the first writes take at most
    size_t total = 0;
};

std::string pattern(size_t bytes)
{
    std::string text(bytes, '\0');
    for (size_t i = 0; i < bytes; ++i) text[i] = static_cast<char>(i % 256);
    return text;
}

TEST(Extension, WritesTheWholeFileManyChunksAtATime)
{
    const scratch folder;
    watched_writes writes;
    start_without_record(folder / "f", 135168);
    EXPECT_EQ(writes.counts, (std::vector<size_t>{65536, 65536, 4096}));
    EXPECT_EQ(writes.total, 135168U);
}

TEST(Extension, WritesThePatternOfAllByteValues)
{
    const scratch folder;
    watched_writes writes;
    start_without_record(folder / "f", 8192);
    for (const std::string &chunk : writes.chunks) EXPECT_EQ(chunk, pattern(chunk.size()));
    const std::string bytes = file_bytes(folder / "f");
    EXPECT_EQ(bytes.substr(512, 512), pattern(512));
    EXPECT_EQ(bytes.substr(8192 - 512), pattern(512));
}

TEST(Extension, StartsThePatternWhereTheFileEnded)
{
    const scratch folder;
    write_file(folder / "f", std::string(1000, '\x77'));
    watched_writes writes;
    start_without_record(folder / "f", 4096);
    EXPECT_EQ(writes.counts, (std::vector<size_t>{3096}));
    const std::string bytes = file_bytes(folder / "f");
    EXPECT_EQ(bytes.size(), 4096U);
    EXPECT_EQ(bytes.substr(228, 772), std::string(772, '\x77'));
    EXPECT_EQ(bytes.substr(1000, 512), pattern(512));
    EXPECT_EQ(bytes.substr(1000 + 6 * 512), pattern(24));
}

TEST(Extension, CompletesTheChunkFromThePatternsFirstByteAfterAShortWrite)
{
    const scratch folder;
    watched_writes writes;
    writes.shortened_to = {512, 100, 300};
    start_without_record(folder / "f", 4096);
    EXPECT_EQ(writes.counts, (std::vector<size_t>{4096, 3584, 412, 112, 3072}));
    for (const std::string &chunk : writes.chunks) EXPECT_EQ(chunk, pattern(chunk.size()));
    const std::string bytes = file_bytes(folder / "f");
    EXPECT_EQ(bytes.size(), 4096U);
    EXPECT_EQ(bytes.substr(512, 512), pattern(100) + pattern(300) + pattern(112));
    EXPECT_EQ(bytes.substr(1024, 512), pattern(512));
}

TEST(Extension, CompletesTheLastChunkToo)
{
    const scratch folder;
    write_file(folder / "f", std::string(1000, '\x77'));
    watched_writes writes;
    writes.shortened_to = {3082};
    start_without_record(folder / "f", 4096);
    EXPECT_EQ(writes.counts, (std::vector<size_t>{3096, 14}));
    EXPECT_EQ(file_bytes(folder / "f").substr(1000 + 6 * 512), pattern(10) + pattern(14));
}

TEST(Extension, GoesOnAfterAnInterruption)
{
    const scratch folder;
    int interruptions = 3;
    calls().write = [&](int fd, const void *bytes, size_t count) {
        return interruptions-- > 0 ? fail_with(EINTR) : __real_write(fd, bytes, count);
    };
    trace_anchor_t *anchor = anchor_for(folder / "f");
    EXPECT_EQ(start(anchor), 0);
    EXPECT_LT(interruptions, 0);
    EXPECT_EQ(trace_image::of_file(folder / "f").size(), 65536U);
    stop(anchor);
}

TEST(Extension, LeavesNoHole)
{
    const scratch folder;
    start_without_record(folder / "f", 1048576);
    const int fd = ::open((folder / "f").c_str(), O_RDONLY);
    ASSERT_NE(fd, -1);
    EXPECT_EQ(lseek(fd, 0, SEEK_HOLE), 1048576);
    close(fd);
}

TEST(Extension, IsSyncedBeforeTheFileIsMapped)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    int synced = 0;
    calls().fsync = [&](int fd) {
        ++synced;
        struct stat file;
        EXPECT_EQ(__real_fstat(fd, &file), 0);
        EXPECT_EQ(file.st_size, 65536);
        EXPECT_EQ(anchor->pMap, nullptr);
        return fail_with(EIO); // nobody looks at it
    };
    EXPECT_EQ(start(anchor), 0);
    EXPECT_EQ(synced, 1);
    stop(anchor);
}

TEST(FileOfTheRightSize, IsNeitherWrittenNorSynced)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    int touched = 0;
    calls().write = [&](int, const void *, size_t) { return ++touched; };
    calls().fsync = [&](int) { return ++touched; };
    calls().fstatvfs = [&](int, struct statvfs *) { return ++touched; };
    EXPECT_EQ(start(anchor), 0);
    EXPECT_EQ(touched, 0);
    stop(anchor);
}

TEST(MappedFile, IsNotStartedTwice)
{
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f");
    ASSERT_EQ(start(anchor), 0);
    const unsigned char *map = anchor->pMap;
    calls().open = [](const char *, int, mode_t) { return fail_with(EIO); };
    EXPECT_EQ(start_trace_page(anchor), 0);
    EXPECT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->pMap, map);
    EXPECT_EQ(trace_image::of_file(folder / "f").records_of(16).size(), 1U);
    stop(anchor);
}
} // namespace
