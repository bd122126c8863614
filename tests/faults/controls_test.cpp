// Harm that was planted, so that it is known that the campaign's instruments find harm.
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <sys/wait.h>
#include <unistd.h>

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
    void expect_found(const std::function<qn_int32_t()> &harm, const std::string &text)
    {
        static aftermath told;
        static aftermath undisturbed;
        static attacked_call call;
        call = {"Planted", nothing, [=](const std::string &) { return harm(); }, nothing, {14}, false};
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
        [] {
            void *volatile lost = std::malloc(1);
            return lost != nullptr ? 0 : 14;
        },
        "memory is lost");
}

TEST_F(Planted, OpenDescriptorIsFound)
{
    expect_found([] { return open("/dev/null", O_RDONLY | O_CLOEXEC) < 0; }, "descriptors are left open");
}

TEST_F(Planted, HeldLockIsFound)
{
    expect_found([] { return lockGlobalMutex(); }, "is held behind the call");
}

TEST_F(Planted, UnknownCodeIsFound)
{
    expect_found(
        [] {
            static int calls = 0;
            return calls++ == 0 ? 15 : 0;
        },
        "returned 15");
}

TEST_F(Planted, CallThatDoesNotWorkAgainIsFound)
{
    expect_found(
        [] {
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
