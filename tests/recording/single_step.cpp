#include "recording/single_step.h"

#include <csignal>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace qn::test
{
stepped single_step(const std::function<void()> &prepare, const std::function<int32_t()> &call,
                    const std::function<void()> &begins, const std::function<void()> &behind_each)
{
    constexpr int not_possible = 77;
    stepped seen;
    const pid_t child = fork();
    if (child == 0) {
        prepare();
        if (ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) _exit(not_possible);
        raise(SIGSTOP);
        _exit(call());
    }
    if (waitpid(child, &seen.ended_by, 0) != child) return seen;
    seen.possible = !WIFEXITED(seen.ended_by) || WEXITSTATUS(seen.ended_by) != not_possible;
    if (!WIFSTOPPED(seen.ended_by) || WSTOPSIG(seen.ended_by) != SIGSTOP) return seen;
    begins();
    while (ptrace(PTRACE_SINGLESTEP, child, nullptr, nullptr) == 0 && waitpid(child, &seen.ended_by, 0) == child &&
           WIFSTOPPED(seen.ended_by)) {
        ++seen.instructions;
        behind_each();
    }
    return seen;
}
} // namespace qn::test
