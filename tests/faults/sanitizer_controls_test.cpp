// Harm that a sanitizer is there for, planted: the sanitizer that this program was built with reports it and ends the
// program. The harm is done in another process of this program: a report ends it, and ThreadSanitizer does not follow a
// forked child that makes threads.
#include <climits>
#include <cstdlib>
#include <filesystem>
#include <thread>

#include <sys/wait.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "support/scratch.h"

namespace
{
using namespace qn::test;

constexpr const char *played = "QN_PLANTED_HARM";

class Planted : public testing::Test
{
protected:
    // True in the other process, which is to do the harm.
    static bool is_played() { return std::getenv(played) != nullptr; }

    // Plays the test in another process, which is to fail with that report.
    static void expect_report(const std::string &report)
    {
        const scratch folder;
        const std::string output = folder / "output";
        const testing::TestInfo *test = testing::UnitTest::GetInstance()->current_test_info();
        const std::string command =
            std::string(played) + "=1 '" + std::filesystem::read_symlink("/proc/self/exe").string() +
            "' --gtest_filter=" + test->test_suite_name() + "." + test->name() + " >" + output + " 2>&1";
        const int status = std::system(command.c_str());
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) != 0) << status;
        EXPECT_NE(file_bytes(output).find(report), std::string::npos) << file_bytes(output);
        count("Planted harm is found", "rounds", 1);
    }
};

#ifdef __SANITIZE_ADDRESS__
TEST_F(Planted, ReadBehindABlockIsReported)
{
    if (!is_played()) return expect_report("heap-buffer-overflow");
    const auto *block = new char[8];
    const volatile size_t behind = 8;
    EXPECT_NE(block[behind], 'x');
    delete[] block;
}

TEST_F(Planted, UseOfFreedMemoryIsReported)
{
    if (!is_played()) return expect_report("heap-use-after-free");
    volatile char *block = new char[8];
    delete[] block;
    block[0] = 'x';
}

TEST_F(Planted, LostMemoryIsReported)
{
    if (!is_played()) return expect_report("LeakSanitizer: detected memory leaks");
    [[maybe_unused]] void *volatile lost = std::malloc(8);
    lost = nullptr;
}

TEST_F(Planted, OverflowOfANumberIsReported)
{
    if (!is_played()) return expect_report("runtime error: signed integer overflow");
    volatile int number = INT_MAX;
    number = number + 1;
}
#endif

#ifdef __SANITIZE_THREAD__
TEST_F(Planted, RaceOfTwoThreadsIsReported)
{
    if (!is_played()) return expect_report("ThreadSanitizer: data race");
    int number = 0;
    std::thread other([&] { number = 1; });
    number = 2;
    other.join();
    EXPECT_NE(number, 0);
}

// Two threads that take two locks in both orders, one after the other: no deadlock this time.
TEST_F(Planted, TwoOrdersOfTwoLocksAreReported)
{
    if (!is_played()) return expect_report("ThreadSanitizer: lock-order-inversion");
    pthread_mutex_t first = PTHREAD_MUTEX_INITIALIZER;
    pthread_mutex_t second = PTHREAD_MUTEX_INITIALIZER;
    const auto take = [](pthread_mutex_t &one, pthread_mutex_t &other) {
        pthread_mutex_lock(&one);
        pthread_mutex_lock(&other);
        pthread_mutex_unlock(&other);
        pthread_mutex_unlock(&one);
    };
    std::thread([&] { take(first, second); }).join();
    std::thread([&] { take(second, first); }).join();
}
#endif
} // namespace
