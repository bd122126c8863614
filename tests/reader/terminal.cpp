#include "reader/terminal.h"

#include <stdexcept>
#include <string_view>

#include <fcntl.h>
#include <poll.h>
#include <pty.h>
#include <sys/wait.h>
#include <unistd.h>

namespace qn::test
{
namespace
{

std::vector<char *> pointers_to(const std::vector<std::string> &strings)
{
    std::vector<char *> result;
    for (const auto &string : strings) result.push_back(const_cast<char *>(string.c_str()));
    result.push_back(nullptr);
    return result;
}

class program_on_terminal
{
public:
    // `out` becomes its standard output, unless it is negative.
    program_on_terminal(std::vector<std::string> arguments, std::vector<std::string> environment, int out = -1)
    {
        arguments.insert(arguments.begin(), QNTRACE_PROGRAM);
        for (const auto *usual : {"LC_ALL=C", "TZ=UTC", "TERM=xterm"}) environment.emplace_back(usual);
        process_ = forkpty(&terminal_, nullptr, nullptr, nullptr);
        if (process_ < 0) throw std::runtime_error("there is no pseudo-terminal");
        if (process_ == 0) {
            if (out >= 0) dup2(out, STDOUT_FILENO);
            execve(QNTRACE_PROGRAM, pointers_to(arguments).data(), pointers_to(environment).data());
            _exit(127);
        }
    }
    ~program_on_terminal() { close(terminal_); }
    program_on_terminal(const program_on_terminal &) = delete;
    program_on_terminal &operator=(const program_on_terminal &) = delete;

    screening see_to_its_end()
    {
        screening seen;
        char buffer[4096];
        // Reading fails when all have closed the terminal.
        for (ssize_t got = 0; (got = read(terminal_, buffer, sizeof buffer)) > 0;)
            for (const char c : std::string_view(buffer, static_cast<std::size_t>(got)))
                if (c == '\n' && seen.screen.ends_with('\r'))
                    seen.screen.back() = '\n';
                else
                    seen.screen += c;
        int status = 0;
        waitpid(process_, &status, 0);
        if (WIFEXITED(status)) seen.status = WEXITSTATUS(status);
        if (WIFSIGNALED(status)) seen.signal = WTERMSIG(status);
        return seen;
    }

private:
    int terminal_ = -1;
    pid_t process_ = -1;
};

} // namespace

screening run_on_terminal(const std::vector<std::string> &arguments, const std::vector<std::string> &environment)
{
    return program_on_terminal(arguments, environment).see_to_its_end();
}

screening run_beside_terminal(const std::vector<std::string> &arguments, int milliseconds)
{
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) throw std::runtime_error("pipe2() failed");
    program_on_terminal program(arguments, {}, ends[1]);
    close(ends[1]);
    poll(nullptr, 0, milliseconds);
    char buffer[65536];
    while (read(ends[0], buffer, sizeof buffer) > 0) {
    }
    close(ends[0]);
    return program.see_to_its_end();
}

} // namespace qn::test
