#include "tools/qntrace/follow/follow_wait.h"

#include <algorithm>
#include <cerrno>

#include <poll.h>
#include <unistd.h>

namespace qn::dump
{
namespace
{

using namespace std::chrono_literals;

volatile std::sig_atomic_t end_asked_for = 0;

void ask_for_end(int) { end_asked_for = 1; }

} // namespace

follow_wait::follow_wait(duration longest) : longest_(longest), next_(shortest())
{
    // They are let through only while nothing is half done.
    sigset_t ending;
    sigemptyset(&ending);
    sigaddset(&ending, SIGINT);
    sigaddset(&ending, SIGTERM);
    sigprocmask(SIG_BLOCK, &ending, &mask_before_);
    sigdelset(&mask_before_, SIGINT);
    sigdelset(&mask_before_, SIGTERM);
    struct sigaction action = {};
    action.sa_handler = ask_for_end;
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

follow_wait::~follow_wait() { sigprocmask(SIG_SETMASK, &mask_before_, nullptr); }

follow_wait::duration follow_wait::shortest() const { return std::min<duration>(longest_, 1ms); }

bool follow_wait::wait()
{
    const auto time = next_;
    next_ = std::min(2 * next_, longest_);
    return look(time);
}

bool follow_wait::may_go_on() { return look(duration::zero()); }

bool follow_wait::look(duration time)
{
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(time);
    const timespec timeout = {seconds.count(), (time - seconds).count()};
    pollfd out = {STDOUT_FILENO, 0, 0};
    // Ready without being asked for anything: a pipe that nobody reads any more, a terminal that was closed.
    return ppoll(&out, 1, &timeout, &mask_before_) <= 0 && end_asked_for == 0;
}

} // namespace qn::dump
