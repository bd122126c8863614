#include "tools/qntrace/console/pager.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tools/qntrace/console/terminal.h"

namespace qn::dump
{
namespace
{

bool is_program(std::string_view name)
{
    const char *path = std::getenv("PATH");
    std::string_view folders = path == nullptr ? "/usr/bin:/bin" : path;
    while (!folders.empty()) {
        const auto folder = folders.substr(0, folders.find(':'));
        if (access((std::string(folder) + "/" + std::string(name)).c_str(), X_OK) == 0) return true;
        folders.remove_prefix(folder.size() == folders.size() ? folder.size() : folder.size() + 1);
    }
    return false;
}

// Empty: none.
std::string pager_command()
{
    for (const char *variable : {"QNTRACE_PAGER", "PAGER"}) {
        const char *command = std::getenv(variable);
        if (command != nullptr) return std::string_view(command) == "cat" ? "" : command;
    }
    return is_program("less") && !is_dumb_terminal() ? "less" : "";
}

// Reads from `input`, and has nothing else of the pipe. -1: it cannot be started.
pid_t start(const std::string &command, const int (&ends)[2])
{
    // Text that fits the screen is left there, colours are passed; a user with other wishes has set it.
    setenv("LESS", "FRX", 0);
    posix_spawn_file_actions_t actions;
    if (posix_spawn_file_actions_init(&actions) != 0) return -1;
    posix_spawn_file_actions_adddup2(&actions, ends[0], STDIN_FILENO);
    std::string shell = "sh", option = "-c", argument = command;
    char *const arguments[] = {shell.data(), option.data(), argument.data(), nullptr};
    pid_t process = -1;
    if (posix_spawn(&process, "/bin/sh", &actions, nullptr, arguments, environ) != 0) process = -1;
    posix_spawn_file_actions_destroy(&actions);
    return process;
}

} // namespace

pager::pager(bool wanted)
{
    if (!wanted || isatty(STDOUT_FILENO) == 0) return;
    const auto command = pager_command();
    int ends[2];
    if (command.empty() || pipe2(ends, O_CLOEXEC) != 0) return;
    process_ = start(command, ends);
    if (process_ > 0) {
        // Ctrl-C is for the pager: it interrupts a search there, and must not take the text away.
        std::signal(SIGINT, SIG_IGN);
        take_over(STDOUT_FILENO, ends[1]);
        if (isatty(STDERR_FILENO) != 0) take_over(STDERR_FILENO, ends[1]);
    }
    close(ends[0]);
    close(ends[1]);
}

void pager::take_over(int descriptor, int end)
{
    terminals_.push_back({descriptor, fcntl(descriptor, F_DUPFD_CLOEXEC, 0)});
    dup2(end, descriptor);
}

pager::~pager()
{
    if (process_ <= 0) return;
    std::fflush(stdout);
    for (const auto &[descriptor, saved] : terminals_) {
        dup2(saved, descriptor);
        close(saved);
    }
    while (waitpid(process_, nullptr, 0) < 0 && errno == EINTR) {
    }
}

} // namespace qn::dump
