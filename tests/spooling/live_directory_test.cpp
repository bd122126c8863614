// A spool directory that is removed, read-only, full or slow while writers write: copies fail and pages are recycled,
// or writers wait; they never crash, hang, or get an error, and when the directory is well again, copying goes on.
#include <filesystem>
#include <functional>
#include <system_error>

#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include "spooling/live_slow_disk.h"
#include "spooling/live_writers.h"
#include "spooling/soak_trace.h"
#include "support/private_var.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;
namespace fs = std::filesystem;

constexpr uint32_t pages = 4;
constexpr int longest_queue = static_cast<int>(pages) - 2;
constexpr uint64_t some_rings = 3 * pages * (soak_trace::usual_page_bytes / 32); // records that fill it three times
constexpr const char *mounted = "/var/spool";

// Mounts a file system of so many bytes for spooling, in a /var of its own.
void on_a_disk_of(const std::string &bytes, const std::function<void()> &body)
{
    EXPECT_TRUE(in_private_var([&] {
        fs::create_directory(mounted);
        EXPECT_EQ(mount("tmpfs", mounted, "tmpfs", 0, ("size=" + bytes).c_str()), 0);
        body();
        return !testing::Test::HasFailure();
    }));
}

// The directory that the copies go to.
std::string spool_directory() { return anchors.pFirstSpoolSpec->dest; }

// Also while copies are made in it: a folder may get one between its emptying and its removal.
void remove_whole(const fs::path &directory)
{
    std::error_code error;
    do fs::remove_all(directory, error);
    while (error == std::errc::directory_not_empty);
    EXPECT_FALSE(error) << error.message();
}

TEST(SpoolDirectory, ThatIsRemovedAndMadeAgainHarmsNoWriter)
{
    const soak_trace trace(pages);
    const std::string directory = spool_directory();
    live_writers writers;
    for (int turn = 0; turn < 50; ++turn) {
        writers.wait_for(some_rings / 10);
        remove_whole(trace.spool_folder());
        writers.wait_for(some_rings / 10);
        fs::create_directories(directory);
    }
    const auto written = writers.end();
    wait_for_queue(0);
    expect_sound(trace.pages());
    expect_next_batch(written, longest_queue, trace.live_folder(), trace.spool_folder());
}

TEST(SpoolDirectory, ThatIsGoneHasThePagesRecycledWithoutANotice)
{
    const soak_trace trace(pages);
    remove_whole(trace.spool_folder());
    live_writers writers(longest_queue);
    writers.wait_for(some_rings);
    writers.end();
    wait_for_queue(0);
    EXPECT_TRUE(copies_in(trace.spool_folder()).empty());
    const auto live = trace.pages();
    ASSERT_EQ(live.size(), 1U) << "all other pages are ready to be written again";
    EXPECT_EQ(overwritten_before(live[0], live[0].image()), 0U);
}

// Where a file system becomes read-only while a file is made in it, the kernel may make the file and then refuse to open
// it: it stays behind empty, and nobody can remove it before the file system can be written to again.
void remove_what_the_kernel_left(const std::string &directory)
{
    for (const auto &copy : copies_in(directory))
        if (fs::file_size(copy) == 0) fs::remove(copy);
}

TEST(SpoolDirectory, OnAReadOnlyFileSystemHarmsNoWriter)
{
    on_a_disk_of("1g", [] {
        const soak_trace trace(pages, soak_trace::usual_page_bytes, mounted);
        live_writers writers;
        for (int turn = 0; turn < 20; ++turn) {
            writers.wait_for(some_rings / 10);
            const bool read_only = turn % 2 == 0;
            // Refused while a copy is being written.
            while (mount(nullptr, mounted, nullptr, MS_REMOUNT | (read_only ? MS_RDONLY : 0), nullptr) != 0)
                ASSERT_EQ(errno, EBUSY);
        }
        const auto written = writers.end();
        wait_for_queue(0);
        remove_what_the_kernel_left(trace.spool_folder());
        expect_sound(trace.pages());
        expect_next_batch(written, longest_queue, trace.live_folder(), trace.spool_folder());
    });
}

TEST(SpoolDirectory, OnAFullFileSystemGetsNoPartOfACopy)
{
    on_a_disk_of("1m", [] {
        const soak_trace trace(pages, soak_trace::usual_page_bytes, mounted);
        live_writers writers(longest_queue); // every page is tried to be copied
        writers.wait_for(some_rings);
        const auto written = writers.end();
        wait_for_queue(0);
        const auto copies = copies_in(mounted);
        EXPECT_GT(copies.size(), 10U);
        EXPECT_LE(copies.size(), 16U) << "as many as there is room for";
        for (const std::string &copy : copies) EXPECT_EQ(fs::file_size(copy), soak_trace::usual_page_bytes) << copy;
        expect_sound(trace.pages());

        EXPECT_EQ(mount(nullptr, mounted, nullptr, MS_REMOUNT, "size=1g"), 0);
        expect_next_batch(written, longest_queue, trace.live_folder(), mounted);
    });
}

TEST(SpoolDirectory, OnASlowFileSystemMakesWritersWaitAndLosesNothing)
{
    const soak_trace trace(pages);
    const slow_disk slow;
    live_writers writers(longest_queue);
    writers.wait_for(some_rings);
    const auto written = writers.end();
    wait_for_queue(0);
    expect_all(trace.pages(), written);
}
} // namespace
