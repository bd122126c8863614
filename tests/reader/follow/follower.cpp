#include "reader/follow/follower.h"

#include <chrono>
#include <csignal>
#include <filesystem>
#include <memory>
#include <numeric>
#include <thread>
#include <utility>

#include <fcntl.h>
#include <fmt/format.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "reader/spool_directory.h"
#include "reader/trace_set_files.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;

void write_to(int descriptor, const std::string &path)
{
    const int opened = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_APPEND, 0666);
    if (opened < 0 || dup2(opened, descriptor) < 0) _exit(126);
    close(opened);
}

} // namespace

follower::follower(const std::vector<std::string> &arguments, int out) : folder_(std::make_unique<scratch_folder>())
{
    child_ = fork();
    if (child_ != 0) return;
    if (out < 0)
        write_to(STDOUT_FILENO, folder_->path("out"));
    else
        dup2(out, STDOUT_FILENO);
    write_to(STDERR_FILENO, folder_->path("err"));
    std::vector<char *> pointers = {const_cast<char *>(QNTRACE_PROGRAM)};
    for (const auto &argument : arguments) pointers.push_back(const_cast<char *>(argument.c_str()));
    pointers.push_back(nullptr);
    setenv("LC_ALL", "C", 1);
    execv(QNTRACE_PROGRAM, pointers.data());
    _exit(127);
}

follower follower::of(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), {"follow", "--json", "--utc"});
    follower started(arguments);
    started.wait_for_out("\"header\"");
    return started;
}

follower::~follower()
{
    if (child_ <= 0) return;
    kill(child_, SIGKILL);
    waitpid(child_, nullptr, 0);
}

follower::follower(follower &&other) noexcept
    : folder_(std::move(other.folder_)), child_(std::exchange(other.child_, -1))
{
}

std::string follower::out() const { return contents_of(folder_->path("out")); }
std::string follower::err() const { return contents_of(folder_->path("err")); }

void follower::wait_until(const std::string &what, const std::function<bool()> &holds) const
{
    using namespace std::chrono_literals;
    const auto latest = std::chrono::steady_clock::now() + 60s;
    for (;;) {
        const bool last = has_ended() || std::chrono::steady_clock::now() > latest;
        if (holds()) return;
        if (last) throw std::runtime_error(fmt::format("never came: {}\n{}", what, err()));
        std::this_thread::sleep_for(1ms);
    }
}

bool follower::has_ended() const
{
    siginfo_t ended = {};
    return waitid(P_PID, static_cast<id_t>(child_), &ended, WEXITED | WNOHANG | WNOWAIT) == 0 && ended.si_pid != 0;
}

void follower::wait_for_out(const std::string &text) const
{
    wait_until(text, [&] { return fs::exists(folder_->path("out")) && out().find(text) != std::string::npos; });
}

void follower::wait_for_err(const std::string &text) const
{
    wait_until(text, [&] { return fs::exists(folder_->path("err")) && err().find(text) != std::string::npos; });
}

void follower::wait_for_value(std::uint64_t value) const { wait_for_out(fmt::format("\"values\":[\"{}\"]", value)); }

void follower::wait_until_open(const std::string &path) const
{
    wait_until("that it opens " + path, [&] {
        for (const auto &entry : fs::directory_iterator(fmt::format("/proc/{}/fd", child_))) {
            std::error_code gone;
            if (fs::read_symlink(entry.path(), gone) == fs::path(path)) return true;
        }
        return false;
    });
}

void follower::wait_until_stopped() const
{
    int status = 0;
    EXPECT_EQ(waitpid(child_, &status, WUNTRACED), child_);
    EXPECT_TRUE(WIFSTOPPED(status));
}

void follower::send(int signal) const { EXPECT_EQ(kill(child_, signal), 0); }

outcome follower::ended()
{
    int status = 0;
    EXPECT_GT(waitpid(std::exchange(child_, -1), &status, 0), 0);
    outcome result;
    if (WIFEXITED(status)) result.status = WEXITSTATUS(status);
    if (WIFSIGNALED(status)) result.signal = WTERMSIG(status);
    if (fs::exists(folder_->path("out"))) result.out = out();
    result.err = err();
    return result;
}

outcome follower::interrupted()
{
    send(SIGINT);
    return ended();
}

std::vector<std::uint64_t> follower::values() const
{
    auto objects = rows({.out = out()});
    std::erase_if(objects, [](const auto &object) { return object.at("type") != "record"; });
    return written_values(objects);
}

std::vector<std::uint64_t> counted(std::uint64_t first, std::uint64_t count)
{
    std::vector<std::uint64_t> values(count);
    std::iota(values.begin(), values.end(), first);
    return values;
}

} // namespace qn::test
