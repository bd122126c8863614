// What a process can ask about itself and others.
#include <cerrno>
#include <csignal>
#include <grp.h>
#include <sched.h>
#include <spawn.h>
#include <string>
#include <sys/mount.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "support/private_var.h"
#include "support/scratch.h"

namespace
{
// A process with known arguments, ended when it goes out of scope.
class sleeper
{
public:
    sleeper()
    {
        const char *arguments[] = {"my-sleep", "600", nullptr};
        EXPECT_EQ(posix_spawn(&pid_, "/bin/sleep", nullptr, nullptr, const_cast<char **>(arguments), environ), 0);
        // The call may return a moment before the kernel shows the new program's arguments.
        while (qn::test::file_bytes("/proc/" + std::to_string(pid_) + "/cmdline").rfind("my-sleep", 0) != 0)
            sched_yield();
    }
    sleeper(const sleeper &) = delete;
    sleeper &operator=(const sleeper &) = delete;
    ~sleeper()
    {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
    pid_t pid() const { return pid_; }

private:
    pid_t pid_ = -1;
};

TEST(ProcessArguments, AreThoseOfTheProcessEachWithItsNul)
{
    const sleeper process;
    char buffer[100];
    std::fill(std::begin(buffer), std::end(buffer), 'x');
    ASSERT_EQ(cu_get_proc_args_1(process.pid(), buffer, sizeof buffer), 0);
    EXPECT_STREQ(buffer, "my-sleep");
    EXPECT_EQ(std::string(buffer, 14), std::string("my-sleep\0"
                                                   "600\0"
                                                   "\0",
                                                   14));
}

TEST(ProcessArguments, AreCutToTheBuffer)
{
    const sleeper process;
    for (size_t size = 1; size <= 9; ++size) {
        std::vector<char> buffer(size, 'x');
        ASSERT_EQ(cu_get_proc_args_1(process.pid(), buffer.data(), size), 0);
        EXPECT_STREQ(buffer.data(), std::string("my-sleep").substr(0, size - 1).c_str());
    }
}

TEST(ProcessArguments, OfTheProcessItselfAreFound)
{
    char buffer[4096];
    ASSERT_EQ(cu_get_proc_args_1(getpid(), buffer, sizeof buffer), 0);
    EXPECT_NE(std::string(buffer).find("test_platform"), std::string::npos) << buffer;
}

TEST(ProcessArguments, OfNoProcessAreAnErrorAndAnEmptyString)
{
    char buffer[10] = "before";
    EXPECT_EQ(cu_get_proc_args_1(-1, buffer, sizeof buffer), ENOENT);
    EXPECT_STREQ(buffer, "");
}

TEST(ProcessArguments, NeedABuffer)
{
    char buffer[1] = {'x'};
    EXPECT_EQ(cu_get_proc_args_1(getpid(), buffer, 0), EINVAL);
    EXPECT_EQ(buffer[0], 'x');
    EXPECT_EQ(cu_get_proc_args_1(getpid(), nullptr, 10), EINVAL);
}

// Runs `body` where /etc/group is `text`. The name service may go on to ask others; these groups nobody else has.
bool with_groups(const std::string &text, void (*body)())
{
    return qn::test::in_private_var([&] {
        qn::test::write_file("/var/group", text);
        if (mount("/var/group", "/etc/group", nullptr, MS_BIND, nullptr) != 0) return false;
        body();
        return true;
    });
}

TEST(AdministrativeGroup, IsFoundByItsName)
{
    EXPECT_TRUE(with_groups("root:x:0:\nqnadm:x:4711:\n", [] {
        gid_t gid = 0;
        EXPECT_EQ(cu_getadmin_group_id_1(&gid), 0);
        EXPECT_EQ(gid, 4711U);
    }));
}

TEST(AdministrativeGroup, MayHaveMoreMembersThanFitASmallBuffer)
{
    std::string line = "qnadm:x:4712:";
    for (int i = 0; i < 2000; ++i) line += "member" + std::to_string(i) + ",";
    EXPECT_TRUE(with_groups(line + "last\n", [] {
        gid_t gid = 0;
        EXPECT_EQ(cu_getadmin_group_id_1(&gid), 0);
        EXPECT_EQ(gid, 4712U);
    }));
}

TEST(AdministrativeGroup, IsMissedWhereThereIsNone)
{
    EXPECT_TRUE(with_groups("root:x:0:\n", [] {
        gid_t gid = 77;
        EXPECT_EQ(cu_getadmin_group_id_1(&gid), ENOENT);
        EXPECT_EQ(gid, 77U);
    }));
}

TEST(AdministrativeGroup, IsNoGroupWhoseLineIsMalformedOrWhoseNameOnlyBeginsLikeIt)
{
    EXPECT_TRUE(with_groups("qnadm2:x:1:\n2qnadm:x:2:\nqnadm\nqnadm:x\nqnadm:x::\nqnadm:x:no:\nqnadm:x:99999999999:\n"
                            "qnadm:x:4713:\n",
                            [] {
                                gid_t gid = 0;
                                EXPECT_EQ(cu_getadmin_group_id_1(&gid), 0);
                                EXPECT_EQ(gid, 4713U);
                            }));
}

TEST(AdministrativeGroup, HasNoNumberThatMeansNoGroup)
{
    EXPECT_TRUE(with_groups("qnadm:x:4294967295:\n", [] {
        gid_t gid = 77;
        EXPECT_EQ(cu_getadmin_group_id_1(&gid), ENOENT);
        EXPECT_EQ(gid, 77U);
    }));
    EXPECT_TRUE(with_groups("qnadm:x:4294967294:\n", [] {
        gid_t gid = 77;
        EXPECT_EQ(cu_getadmin_group_id_1(&gid), 0);
        EXPECT_EQ(gid, 4294967294U);
    }));
}

// A name in the middle of a line that is longer than what is read at a time is none.
TEST(AdministrativeGroup, IsFoundAtTheStartOfALineOnly)
{
    for (size_t padding = 500; padding < 520; ++padding) {
        EXPECT_TRUE(with_groups("g:x:1:" + std::string(padding, 'm') + "qnadm:x:3:\n", [] {
            gid_t gid = 0;
            EXPECT_EQ(cu_getadmin_group_id_1(&gid), ENOENT);
        }));
    }
}

TEST(AdministrativeGroup, NeedsAPlaceForItsNumber) { EXPECT_EQ(cu_getadmin_group_id_1(nullptr), EINVAL); }

TEST(SignalMask, BlocksAllButWhatAThreadBringsUponItself)
{
    sigset_t blocked;
    sigemptyset(&blocked);
    std::thread([&] {
        EXPECT_EQ(cu_block_thread_allsig_except_syncsig_1(), 0);
        pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    }).join();
    for (const int open : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS, SIGABRT})
        EXPECT_EQ(sigismember(&blocked, open), 0) << open;
    for (const int closed : {SIGTERM, SIGINT, SIGHUP, SIGUSR1, SIGUSR2, SIGCHLD, SIGALRM, SIGPIPE, SIGQUIT, SIGRTMAX})
        EXPECT_EQ(sigismember(&blocked, closed), 1) << closed;
}

TEST(SignalMask, OfOtherThreadsStays)
{
    std::thread([] { cu_block_thread_allsig_except_syncsig_1(); }).join();
    sigset_t mine;
    pthread_sigmask(SIG_BLOCK, nullptr, &mine);
    EXPECT_EQ(sigismember(&mine, SIGUSR1), 0);
}
} // namespace
