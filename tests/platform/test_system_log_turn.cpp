// Lines for the system log at a fork, in signal handlers and when a thread is cancelled: against the shared libraries,
// with a system log of the test's own in place of the C library's.
#include <atomic>
#include <csignal>
#include <cstdarg>
#include <functional>
#include <string>
#include <thread>

#include <pthread.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>
#include <qn_ffdc.h>
#include <qn_tr.h>

#include "support/scratch.h"

namespace
{
std::function<void()> while_writing; // what happens while the first line is written
std::atomic<int> inside{0};          // threads that are writing a line
std::atomic<int> most_inside{0};
std::atomic<int> lines{0};

void write_line()
{
    struct visit {
        visit()
        {
            if (++inside > most_inside) most_inside = inside.load();
        }
        ~visit() { --inside; }
    } const here;
    if (lines++ == 0 && while_writing) while_writing();
}
} // namespace

#pragma GCC visibility push(default)
extern "C" {
void syslog(int, const char *, ...) { write_line(); }
void __syslog_chk(int, int, const char *, ...) { write_line(); }
void vsyslog(int, const char *, va_list) { write_line(); }
void __vsyslog_chk(int, int, const char *, va_list) { write_line(); }
void openlog(const char *, int, int) {}
}
#pragma GCC visibility pop

namespace
{
void report_failure()
{
    fc_eid_t id;
    fc_log_error_1(id, 0, "trace", nullptr, nullptr, nullptr, 0, 0, FC_EVENT_ERROR, 1, nullptr, 0, nullptr, "text");
}

void write_debug_lines() { tr_flush_1(); }

// The status that a forked child ends with, which is what `body` returns; -1 when it was killed.
int status_of_child(const std::function<int()> &body)
{
    const pid_t child = fork();
    if (child == 0) {
        alarm(10);
        _exit(body());
    }
    int status = 0;
    return waitpid(child, &status, 0) == child && WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// With a library that writes lines: the one that reports failures, or the tracing library with its debug lines.
class SystemLogTurn : public testing::TestWithParam<const char *>
{
protected:
    void SetUp() override
    {
        alarm(15); // in place of hanging
        traces_ = GetParam() == std::string("tracing");
        if (traces_) {
            ASSERT_EQ(setenv("QN_TR_DEBUG_LEVEL", "9", 1), 0);
            ASSERT_EQ(tr_set_filename_1((folder_ / "t").c_str()), 0);
        }
        lines = 0;
        most_inside = 0;
    }
    void write() const { traces_ ? write_debug_lines() : report_failure(); }

    // Runs `body` while a thread writes a line, which it has written when `done` is set.
    void with_writer(const std::function<void()> &body)
    {
        while_writing = [this] {
            reached = true;
            while (!done) usleep(1000);
        };
        std::thread writer([this] { write(); });
        while (!reached) std::this_thread::yield();
        body();
        done = true;
        writer.join();
    }

    std::atomic<bool> reached{false}, done{false};

private:
    const qn::test::scratch folder_;
    bool traces_ = false;
};

INSTANTIATE_TEST_SUITE_P(Of, SystemLogTurn, testing::Values("reporting", "tracing"),
                         [](const auto &info) { return std::string(info.param); });

TEST_P(SystemLogTurn, IsOverBeforeAFork)
{
    with_writer([this] {
        std::thread later([this] {
            usleep(200000);
            done = true;
        });
        EXPECT_EQ(status_of_child([] { return inside.load(); }), 0) << "the child has a thread that left it in the log";
        later.join();
    });
}

TEST_P(SystemLogTurn, LetsAChildWriteThatIsForkedAmongWriters)
{
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "its allocator, unlike malloc(), may be locked in the child for good";
#endif
    std::thread writers[2];
    for (std::thread &writer : writers)
        writer = std::thread([this] {
            while (!done) write();
        });
    while (lines == 0) std::this_thread::yield();
    for (int i = 0; i < 50; ++i)
        EXPECT_EQ(status_of_child([this] {
                      const int before = lines;
                      write();
                      return lines > before && most_inside == 1 ? 0 : 1;
                  }),
                  0);
    done = true;
    for (std::thread &writer : writers) writer.join();
}

TEST(SystemLogTurnOfAThread, IsNotWaitedForInASignalHandlerThatInterruptedIt)
{
    alarm(15);
    std::signal(SIGUSR1, [](int) { report_failure(); });
    while_writing = [] { raise(SIGUSR1); };
    report_failure();
    EXPECT_EQ(most_inside, 1) << "the C library would wait for itself";
    EXPECT_EQ(lines, 1);
    report_failure();
    EXPECT_EQ(lines, 2) << "later lines are written";
}

TEST_P(SystemLogTurn, GoesOnInBothProcessesWhenItForks)
{
    pid_t child = -1;
    while_writing = [&child] { child = fork(); };
    write();
    const int before = lines;
    write();
    const bool written = lines > before;
    if (child == 0) _exit(written ? 0 : 1);
    EXPECT_TRUE(written);
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

TEST_P(SystemLogTurn, IsNotWaitedForByAForkWhenTheLogHangs)
{
    with_writer([this] {
        EXPECT_EQ(status_of_child([this] {
                      const int before = lines;
                      write();
                      return lines - before;
                  }),
                  0)
            << "the child's line would wait for the log that hangs";
    });
}

TEST(SystemLogTurnOfACancelledThread, IsGivenBack)
{
    alarm(15);
    const qn::test::scratch folder;
    ASSERT_EQ(setenv("QN_TR_DEBUG_LEVEL", "9", 1), 0);
    ASSERT_EQ(tr_set_filename_1((folder / "t").c_str()), 0);
    lines = 0;
    static std::atomic<bool> reached{false};
    while_writing = [] {
        reached = true;
        for (;;) {
            pthread_testcancel();
            usleep(1000);
        }
    };
    pthread_t thread;
    ASSERT_EQ(pthread_create(
                  &thread, nullptr, [](void *) -> void * { return write_debug_lines(), nullptr; }, nullptr),
              0);
    while (!reached) std::this_thread::yield();
    ASSERT_EQ(pthread_cancel(thread), 0);
    ASSERT_EQ(pthread_join(thread, nullptr), 0);
    write_debug_lines();
    EXPECT_GT(lines, 1);
}
} // namespace
