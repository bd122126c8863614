#include "support/private_var.h"

#include <cstdio>
#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include "support/scratch.h"

namespace
{
constexpr int no_namespace = 77;

void write_text(const char *file, const char *text, size_t length)
{
    const int fd = open(file, O_WRONLY | O_CLOEXEC);
    if (fd == -1) return;
    if (write(fd, text, length) < 0) std::perror(file);
    close(fd);
}

bool enter_namespace()
{
    const uid_t user = getuid();
    const gid_t group = getgid();
    if (unshare(user == 0 ? CLONE_NEWNS : CLONE_NEWNS | CLONE_NEWUSER) != 0) return false;
    if (user != 0) {
        char map[64];
        write_text("/proc/self/setgroups", "deny", 4);
        write_text("/proc/self/uid_map", map, static_cast<size_t>(std::snprintf(map, sizeof map, "0 %u 1", user)));
        write_text("/proc/self/gid_map", map, static_cast<size_t>(std::snprintf(map, sizeof map, "0 %u 1", group)));
    }
    return mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
           mount("tmpfs", "/var", "tmpfs", 0, "mode=0755") == 0;
}
} // namespace

namespace qn::test
{
bool in_private_var(const std::function<bool()> &body)
{
    const pid_t child = fork();
    if (child == 0) {
        if (!enter_namespace()) _exit(no_namespace);
        const bool passed = body() && !::testing::Test::HasFailure();
        std::fflush(nullptr);
        _exit(passed ? 0 : 1);
    }
    int status = 0;
    if (child < 0 || waitpid(child, &status, 0) != child) return false;
    if (WIFEXITED(status) && WEXITSTATUS(status) == no_namespace) {
        [] { GTEST_SKIP() << "this kernel allows no private mount namespace"; }();
        return true;
    }
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

void use_machine_id(const std::string &text)
{
    const bool first_time = mkdir("/var/etc", 0755) == 0;
    write_file("/var/etc/machine-id", text);
    if (!first_time) return;
    EXPECT_EQ(mount("/var/etc", "/etc", nullptr, MS_BIND, nullptr), 0);
}
} // namespace qn::test
