// Harm that was planted, so that it is known that the campaign's instruments find harm.
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include "faults/all_allocations.h"
#include "faults/attacked_calls.h"
#include "faults/campaign.h"
#include "faults/system_calls.h"
#include "support/scratch.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

void nothing(const std::string &) {}

// Calls something of its own instead of the library; under its attack, everything goes through.
aftermath play_planted(const attacked_call &planted)
{
    return play_in_child(planted, {[] {}, [] { return uint64_t{1}; }, live_allocations});
}

class Planted : public testing::Test
{
protected:
    // The harm is found, and what is said about it has that text.
    void expect_found(const std::function<qn_int32_t(const std::string &)> &harm, const std::string &text)
    {
        static aftermath told;
        static aftermath undisturbed;
        static attacked_call call;
        call = {"Planted", nothing, harm, nothing, {14}, false};
        told = play_planted(call);
        call.call = [](const std::string &) { return 0; };
        undisturbed = play_planted(call);
        ASSERT_EQ(undisturbed.stage, aftermath::ended) << undisturbed.how_it_ended();
        EXPECT_NONFATAL_FAILURE(expect_no_harm(call, told, undisturbed), text);
        count("Planted harm is found", "rounds", 1);
    }
};

TEST_F(Planted, LossOfMemoryIsFound)
{
    expect_found(
        [](const std::string &) {
            void *volatile lost = std::malloc(1);
            return lost != nullptr ? 0 : 14;
        },
        "memory is lost");
}

TEST_F(Planted, OpenDescriptorIsFound)
{
    expect_found([](const std::string &) { return open("/dev/null", O_RDONLY | O_CLOEXEC) < 0; },
                 "descriptors are left open");
}

TEST_F(Planted, MappedFileIsFound)
{
    expect_found(
        [](const std::string &folder) {
            const int fd = open((folder + "/file").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
            void *map = mmap(nullptr, 1, PROT_READ, MAP_SHARED, fd, 0);
            close(fd);
            return map != MAP_FAILED ? 0 : 14;
        },
        "files are left mapped");
}

TEST_F(Planted, HeldLockIsFound)
{
    expect_found([](const std::string &) { return lockGlobalMutex(); }, "is held behind the call");
}

TEST_F(Planted, UnknownCodeIsFound)
{
    expect_found(
        [](const std::string &) {
            static int calls = 0;
            return calls++ == 0 ? 15 : 0;
        },
        "returned 15");
}

TEST_F(Planted, CallThatDoesNotWorkAgainIsFound)
{
    expect_found(
        [](const std::string &) {
            static int calls = 0;
            return calls++ == 0 ? 0 : 14;
        },
        "the same call again returned 14");
}

TEST(PlantedEnd, OfTheProgramIsFound)
{
    const attacked_call dies = {
        "Planted", nothing, [](const std::string &) { return kill(getpid(), SIGKILL); }, nothing, {}};
    const aftermath told = play_planted(dies);
    EXPECT_EQ(told.stage, aftermath::prepared);
    EXPECT_TRUE(WIFSIGNALED(told.ended_by));
    count("Planted harm is found", "rounds", 1);
}

TEST(PlantedUse, OfMemoryThatRanOutIsFound)
{
    const attacked_call careless = {"Planted",
                                    nothing,
                                    [](const std::string &) {
                                        volatile char *block = static_cast<char *>(std::malloc(1));
                                        block[0] = 'x';
                                        std::free(const_cast<char *>(block));
                                        return 0;
                                    },
                                    nothing,
                                    {}};
    const aftermath told = play_in_child(
        careless, {[] { fail_allocations(1, running_out::once); }, stop_failing_allocations, live_allocations});
    EXPECT_EQ(told.stage, aftermath::prepared);
    EXPECT_TRUE(WIFSIGNALED(told.ended_by)) << told.how_it_ended();
    count("Planted harm is found", "rounds", 1);
}

// A call that opens a file, writes eight bytes and closes it, and does not look at the results.
class CarelessCall : public testing::Test
{
protected:
    ~CarelessCall() override { count("Planted harm is found", "rounds", 1); }

    static std::string file_in(const std::string &folder) { return folder + "/file"; }

    static qn_int32_t make(const std::string &folder)
    {
        const int fd = open(file_in(folder).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
        const ssize_t written = write(fd, "12345678", 8);
        close(fd);
        return written < 0 ? 15 : 0;
    }

    static std::string half_made(const std::string &folder)
    {
        std::error_code no_file;
        const uintmax_t bytes = std::filesystem::file_size(file_in(folder), no_file);
        return bytes == 8 ? "" : "of " + std::to_string(bytes) + " bytes";
    }

    // The aftermath with that intervention at the system call with that number, the first being openat().
    static aftermath played(const intervention &with)
    {
        watched process;
        const aftermath told = play_watched(call, with, process);
        EXPECT_TRUE(process.intervened || with.what == intervention::nothing);
        return told;
    }

    static inline const attacked_call call{"Planted", nothing, make, nothing, {14}, false, false, 0, false, half_made};
};

TEST_F(CarelessCall, IsFoundWhereASystemCallFails)
{
    static const aftermath undisturbed = played({});
    static const aftermath told = played({intervention::fails, 1, EMFILE});
    EXPECT_NONFATAL_FAILURE(expect_no_harm(call, told, undisturbed), "returned 15");
}

TEST_F(CarelessCall, IsFoundWhereAWriteIsCutShort)
{
    // Made once more, the call would mend what it left.
    static const attacked_call once = [] {
        attacked_call made_once = call;
        made_once.call = [made = false](const std::string &folder) mutable {
            return std::exchange(made, true) ? 0 : make(folder);
        };
        return made_once;
    }();
    watched process;
    static const aftermath undisturbed = play_watched(once, {}, process);
    static const aftermath told = play_watched(once, {intervention::is_cut_short, 2, 0}, process);
    EXPECT_NONFATAL_FAILURE(expect_no_harm(once, told, undisturbed), "is not whole");
}

TEST_F(CarelessCall, IsKilledAtTheSystemCallThatWasAskedFor)
{
    for (const auto kind : {intervention::kills_before, intervention::kills_behind}) {
        const scratch folder(memory_folder());
        const watched process = watch(
            [&] {
                begin_watching();
                make(folder.folder());
                end_watching();
            },
            {kind, 2, 0});
        EXPECT_TRUE(WIFSIGNALED(process.ended_by) && WTERMSIG(process.ended_by) == SIGKILL);
        EXPECT_EQ(std::filesystem::file_size(file_in(folder.folder())), kind == intervention::kills_before ? 0U : 8U);
    }
}

// How often each system call occurs between the marks in what strace wrote: lines like "123 [ 257] openat(...".
std::map<long, int> calls_in_strace_output(const std::string &file)
{
    std::map<long, int> calls;
    std::ifstream lines(file);
    bool watching = false;
    for (std::string line; std::getline(lines, line);) {
        const size_t bracket = line.find('[');
        if (bracket == std::string::npos || line.find("resumed>") != std::string::npos) continue;
        const long number = std::atol(line.c_str() + bracket + 1);
        if (number > 100000) watching = !watching;
        if (watching && is_watched(number)) ++calls[number];
    }
    return calls;
}

// The instrument that counts the system calls sees exactly those that strace sees.
TEST(SystemCallCount, IsThatOfStrace)
{
    if (std::system("strace -qqn -o /dev/null true 2>/dev/null") != 0) GTEST_SKIP() << "strace does not work here";
    const scratch folder;
    const std::string output = folder / "strace";
    const attacked_call &call = attacked_call_named("SetFileMap");
    const pid_t child = fork();
    if (child == 0) {
        const std::string self = std::filesystem::read_symlink("/proc/self/exe").string();
        setenv("QN_PLAY_UNDER_STRACE", call.name, 1);
        execlp("strace", "strace", "-fqqn", "-o", output.c_str(), self.c_str(), "--gtest_filter=Play.ForStrace",
               nullptr);
        _exit(1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_EQ(status, 0);

    watched process;
    play_watched(call, {}, process);
    std::map<long, int> counted;
    for (const long number : process.calls) ++counted[number];
    EXPECT_GT(counted.size(), 10U);
    EXPECT_EQ(counted, calls_in_strace_output(output));
    count("Planted harm is found", "rounds", 1);
}

// Not a test by itself: what the test above has strace look at.
TEST(Play, ForStrace)
{
    const char *name = std::getenv("QN_PLAY_UNDER_STRACE");
    if (name == nullptr) GTEST_SKIP() << "played by SystemCallCount.IsThatOfStrace";
    const scratch folder(memory_folder());
    const shared_aftermath told;
    play(attacked_call_named(name), watching(), folder.folder(), *told);
}
} // namespace
