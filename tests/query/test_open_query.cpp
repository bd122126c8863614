// Opening a query handle: what is accepted, what is refused with which code and message, and that nothing is left open.
#include <cerrno>
#include <cstring>
#include <filesystem>

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "components/mutexes.h"
#include "components/outcome.h"
#include "query/failing_file_calls.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

outcome bad_name(const std::string &name)
{
    return failure(17, 17, "2625-016 Trace filename \"" + name + "\" is invalid.\n");
}

outcome open_failure(int error)
{
    return failure(18, 18, "2625-017 Error " + std::to_string(error) + " opening trace file.\n");
}

outcome not_a_trace(const std::string &name)
{
    return failure(36, 37, "2625-036 The specified file \"" + name + "\" is not a valid trace file.\n");
}

size_t open_descriptors()
{
    const std::filesystem::directory_iterator all("/proc/self/fd");
    return static_cast<size_t>(std::distance(begin(all), end(all)));
}

// A file of one memory page, and the outcome of opening what a test makes of it. Every failure must leave the handle
// variable and the table of descriptors as they were.
class OpenQuery : public ::testing::Test
{
protected:
    void SetUp() override { write_file(file, std::string(page_bytes, '\0')); }

    outcome open_of(const char *name)
    {
        tr_query_handle_t handle = untouched;
        const size_t before = open_descriptors();
        const outcome seen = after(tr_open_query_1(name, &handle));
        EXPECT_EQ(open_descriptors(), before) << "a descriptor stayed open";
        if (seen.status != 0) {
            EXPECT_EQ(handle, untouched);
        } else if (handle != untouched) {
            EXPECT_EQ(tr_close_query_1(handle), 0);
        }
        return seen;
    }
    outcome open_file() { return open_of(file.c_str()); }

    const scratch files;
    const std::string file = files / "t.trc";
    const size_t page_bytes = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    char place[16] = "";
    const tr_query_handle_t untouched = reinterpret_cast<tr_query_handle_t>(place);
};

TEST_F(OpenQuery, AcceptsARegularFileOfOneMemoryPageWhateverItHolds)
{
    leave_marker();
    EXPECT_EQ(open_file(), success());
    write_file(file, std::string(page_bytes, 'x'));
    EXPECT_EQ(open_file(), success());
    write_file(file, std::string(3 * page_bytes + 1, 'x'));
    EXPECT_EQ(open_file(), success());
}

TEST_F(OpenQuery, RefusesAFileShorterThanAMemoryPage)
{
    std::filesystem::resize_file(file, page_bytes - 1);
    EXPECT_EQ(open_file(), not_a_trace(file));
    std::filesystem::resize_file(file, 0);
    EXPECT_EQ(open_file(), not_a_trace(file));
}

TEST_F(OpenQuery, RefusesAMissingName)
{
    EXPECT_EQ(open_of(nullptr), bad_name(""));
    EXPECT_EQ(open_of(""), bad_name(""));
}

TEST_F(OpenQuery, RefusesAMissingFile) { EXPECT_EQ(open_of((files / "missing.trc").c_str()), open_failure(ENOENT)); }

TEST_F(OpenQuery, ReportsTheErrnoOfAnOpenThatFails)
{
    for (const int error : {EACCES, EMFILE, ELOOP, ENAMETOOLONG}) {
        fail_opens({error});
        EXPECT_EQ(open_file(), open_failure(error));
    }
}

TEST_F(OpenQuery, BlamesTheNameWhenTheSystemDoes)
{
    for (const int error : {EFAULT, EINVAL}) {
        fail_opens({error});
        EXPECT_EQ(open_file(), bad_name(file));
    }
}

TEST_F(OpenQuery, TriesAgainAsOftenAsItIsInterrupted)
{
    fail_opens(std::vector<int>(1000, EINTR));
    EXPECT_EQ(open_file(), success());
    EXPECT_EQ(opens_made(), 1001);
    fail_opens({EINTR, EINTR, ENOENT});
    EXPECT_EQ(open_file(), open_failure(ENOENT));
}

TEST_F(OpenQuery, RefusesAFileSystemWithoutAType)
{
    answer_fstatfs_with_type(0);
    EXPECT_EQ(open_file(), failure(19, 35, "2625-034 Trace file cannot be put in AFS file system on linux.\n"));
}

TEST_F(OpenQuery, GoesOnWhenTheFileSystemsTypeCannotBeHad)
{
    fail_fstatfs(ENOSYS);
    EXPECT_EQ(open_file(), success());
}

TEST_F(OpenQuery, ReportsWhatFstatReturnedNotTheErrno)
{
    fail_fstat(-1, EOVERFLOW);
    EXPECT_EQ(open_file(), failure(19, 19, "2625-018 Error -1 returned from fstat() on trace file.\n"));
}

TEST_F(OpenQuery, RefusesWhatIsNoRegularFile)
{
    EXPECT_EQ(open_of(files.folder().c_str()),
              failure(20, 20, "2625-019 Trace file \"" + files.folder() + "\" is not a regular file.\n"));
    EXPECT_EQ(open_of("/dev/null"), failure(20, 20, "2625-019 Trace file \"/dev/null\" is not a regular file.\n"));
}

TEST_F(OpenQuery, RefusesAPipeWithoutWaitingForItsWriter)
{
    const std::string pipe = files / "pipe";
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    EXPECT_EQ(open_of(pipe.c_str()), failure(20, 20, "2625-019 Trace file \"" + pipe + "\" is not a regular file.\n"));
}

TEST_F(OpenQuery, ReportsTheErrnoOfAMappingThatFails)
{
    fail_mmap(ENOMEM);
    EXPECT_EQ(open_file(), failure(21, 21, "2625-020 Error 12 was returned when attempting to mmap() trace file.\n"));
}

TEST_F(OpenQuery, FailsWhenThereIsNoMemoryForTheHandle)
{
    tr_query_handle_t handle = untouched;
    qn_int32_t status = 0;
    {
        const failing_allocation out_of_memory(1);
        status = tr_open_query_1(file.c_str(), &handle);
    }
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(handle, untouched);
    EXPECT_EQ(opens_made(), 0);
}

TEST_F(OpenQuery, LooksForMemoryBeforeItLooksAtTheName)
{
    const failing_allocation out_of_memory(1);
    tr_query_handle_t handle = untouched;
    const qn_int32_t status = tr_open_query_1(nullptr, &handle);
    ASSERT_TRUE(out_of_memory.happened());
    EXPECT_EQ(after(status), no_memory());
}

TEST_F(OpenQuery, HoldsTheMappingOfOnePageAndNoDescriptor)
{
    std::filesystem::resize_file(file, 3 * page_bytes);
    const size_t before = open_descriptors();
    tr_query_handle_t handle = nullptr;
    ASSERT_EQ(tr_open_query_1(file.c_str(), &handle), 0);
    EXPECT_EQ(open_descriptors(), before);
    EXPECT_EQ(std::memcmp(handle->id, "_TR_", 4), 0);
    EXPECT_EQ(handle->fd, -1);
    EXPECT_EQ(handle->uSize, static_cast<qn_int32_t>(3 * page_bytes));
    EXPECT_EQ(handle->pMapEnd - handle->pMap, static_cast<std::ptrdiff_t>(page_bytes));
    EXPECT_EQ(tr_close_query_1(handle), 0);
}

TEST_F(OpenQuery, GivesTheHandleUpWhenTheThreadIsCancelled)
{
    tr_query_handle_t handle = untouched;
    const size_t before = open_descriptors();
    ASSERT_TRUE(is_cancelled_in([&] { tr_open_query_1(file.c_str(), &handle); }));
    EXPECT_EQ(handle, untouched);
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(OpenQuery, LeavesTheTracingOfItsOwnProcessAlone)
{
    EXPECT_EQ(open_file(), success());
    EXPECT_EQ(anchors.bInitialized, 0);
    EXPECT_EQ(anchors.numAnchors, 1U);
}

TEST_F(OpenQuery, NeverClosesDescriptorZero)
{
    const int saved = dup(0);
    close(0);
    tr_query_handle_t handle = untouched;
    const qn_int32_t status = tr_open_query_1(files.folder().c_str(), &handle); // becomes descriptor 0, and is refused
    const bool still_open = fcntl(0, F_GETFD) != -1;
    close(0);
    if (saved != -1) {
        dup2(saved, 0);
        close(saved);
    }
    EXPECT_EQ(status, 20);
    EXPECT_TRUE(still_open);
}
} // namespace
