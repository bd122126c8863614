// The file itself: the system's one, a missing one, and that nothing stays open.
#include <filesystem>
#include <thread>

#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/stat.h>
#include <unistd.h>

#include "support/last_error.h"
#include "support/private_var.h"
#include "support/scratch.h"
#include "traceutils/conf_seen.h"

namespace
{
using namespace qn::test;

long open_descriptors()
{
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return std::distance(begin(all), end(all));
}

TEST(ConfFile, TheSystemsFileIsRead)
{
    EXPECT_TRUE(in_private_var([] {
        std::filesystem::create_directories("/var/qn/cfg");
        write_file("/var/qn/cfg/trace.conf", "t:\npat = /x\n");
        trace_raw_config_t *config = nullptr;
        EXPECT_EQ(tr_read_conf_file_1(&config), 0);
        if (config == nullptr) return false;
        EXPECT_EQ(chunks_of(*config), (std::vector{good("t", {{"pat", "/x"}}, "t:\npat = /x\n")}));
        tr_free_trace_raw_config_1(config);
        return true;
    }));
}

TEST(ConfFile, AMissingSystemsFileIs48AndStoresNothing)
{
    EXPECT_TRUE(in_private_var([] {
        char place;
        auto *const untouched = reinterpret_cast<trace_raw_config_t *>(&place);
        trace_raw_config_t *config = untouched;
        EXPECT_EQ(tr_read_conf_file_1(&config), 48);
        EXPECT_EQ(config, untouched);
        return true;
    }));
}

TEST(ConfFile, NoErrorIsRecordedWhetherItIsThereOrNot)
{
    const scratch files;
    write_file(files / "trace.conf", "nonsense\nt:\npat = /x\n");
    leave_marker();
    EXPECT_EQ(read_conf_of(files / "trace.conf").status, 0);
    EXPECT_TRUE(marker_is_there());
    EXPECT_EQ(read_conf_of(files / "missing.conf").status, 48);
    EXPECT_TRUE(marker_is_there());
}

// Half of a file would look like a configuration without the other half.
TEST(ConfFile, AFileThatCannotBeReadToItsEndIs48)
{
    const scratch files;
    EXPECT_EQ(read_conf_of(files.folder()).status, 48);
}

TEST(ConfFile, APipeWithoutAWriterIsEmpty)
{
    const scratch files;
    ASSERT_EQ(mkfifo((files / "pipe").c_str(), 0600), 0);
    alarm(20); // ends the test that hangs
    const conf_seen seen = read_conf_of(files / "pipe");
    EXPECT_EQ(seen.status, 0);
    EXPECT_TRUE(seen.chunks.empty());
    alarm(0);
}

TEST(ConfFile, NothingStaysOpen)
{
    const scratch files;
    write_file(files / "trace.conf", "t:\npat = /x\n");
    const long before = open_descriptors();
    EXPECT_EQ(read_conf_of(files / "trace.conf").status, 0);
    EXPECT_EQ(read_conf_of(files / "missing.conf").status, 48);
    EXPECT_EQ(open_descriptors(), before);
}

TEST(ConfFile, AThreadThatIsCancelledMeanwhileFinishesItsReading)
{
    const text_file file("t:\npat = /x\n");
    conf_seen seen;
    std::thread reader([&] {
        pthread_cancel(pthread_self());
        seen = read_conf_of(file.name());
        pthread_testcancel();
        ADD_FAILURE() << "the cancellation is lost";
    });
    reader.join();
    EXPECT_EQ(seen.status, 0);
    EXPECT_EQ(seen.chunks, (std::vector{good("t", {{"pat", "/x"}}, "t:\npat = /x\n")}));
}

TEST(ConfFile, FreeingNothingIsAllowed)
{
    tr_free_trace_raw_config_1(nullptr);
    tr_free_trace_conf_data_1(nullptr);
}
} // namespace
