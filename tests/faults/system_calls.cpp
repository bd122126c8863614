#include "faults/system_calls.h"

#include <cerrno>
#include <csignal>
#include <map>
#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/user.h>
#include <sys/wait.h>
#include <unistd.h>

#include "support/scratch.h"

namespace
{
using namespace qn::test;

// System calls that no kernel has mark the watched stretch.
constexpr long begin_mark = 100001;
constexpr long end_mark = 100002;

constexpr int not_possible = 77; // exit status

class watcher
{
public:
    watcher(pid_t child, const intervention &with) : child_(child), with_(with) {}

    watched run()
    {
        int status = 0;
        waitpid(child_, &status, 0);
        if (!WIFSTOPPED(status)) {
            seen_.possible = false;
            return seen_;
        }
        ptrace(PTRACE_SETOPTIONS, child_, nullptr, PTRACE_O_TRACESYSGOOD | PTRACE_O_TRACECLONE | PTRACE_O_EXITKILL);
        go_on(child_, 0);
        for (;;) {
            const pid_t thread = waitpid(-1, &status, __WALL);
            if (thread == -1 && errno == EINTR) continue;
            if (thread == -1) return seen_;
            if (WIFSTOPPED(status))
                go_on(thread, at_stop(thread, status));
            else if (thread == child_)
                seen_.ended_by = status;
        }
    }

private:
    void go_on(pid_t thread, int signal) const
    {
        ptrace(over_ ? PTRACE_CONT : PTRACE_SYSCALL, thread, nullptr, static_cast<long>(signal));
    }

    // The signal to go on with.
    int at_stop(pid_t thread, int status)
    {
        const int signal = WSTOPSIG(status);
        if (signal == (SIGTRAP | 0x80)) {
            at_system_call(thread);
            return 0;
        }
        const bool of_tracing = signal == SIGTRAP || signal == SIGSTOP; // a thread was created, or begins
        return of_tracing ? 0 : signal;
    }

    void at_system_call(pid_t thread)
    {
        __ptrace_syscall_info info{};
        ptrace(PTRACE_GET_SYSCALL_INFO, thread, sizeof info, &info);
        if (info.op == PTRACE_SYSCALL_INFO_ENTRY)
            at_entry(thread, info);
        else if (info.op == PTRACE_SYSCALL_INFO_EXIT)
            at_return(thread, info.exit.rval);
    }

    void at_return(pid_t thread, int64_t result)
    {
        const auto entered = entered_.find(thread);
        if (entered == entered_.end()) return;
        seen_.returned.push_back(entered->second);
        seen_.returned.back().result = result;
        entered_.erase(entered);
        if (thread == target_) at_exit(thread);
    }

    void at_entry(pid_t thread, const __ptrace_syscall_info &info)
    {
        const auto number = static_cast<long>(info.entry.nr);
        if (number == begin_mark) watching_ = true;
        if (number == end_mark) {
            watching_ = false;
            over_ = target_ == 0;
        }
        if (!watching_) return;
        const auto &with = info.entry.args;
        entered_[thread] = {number, {with[0], with[1], with[2], with[3], with[4], with[5]}, 0};
        if (!is_watched(number)) return;
        seen_.calls.push_back(number);
        if (seen_.calls.size() == with_.number && with_.what != intervention::nothing) intervene(thread, number);
    }

    void intervene(pid_t thread, long number)
    {
        seen_.intervened = true;
        target_ = thread;
        if (with_.what == intervention::kills_before) kill(child_, SIGKILL);
        user_regs_struct registers{};
        ptrace(PTRACE_GETREGS, thread, nullptr, &registers);
        if (with_.what == intervention::is_cut_short) {
            registers.rdx = (registers.rdx + 1) / 2;
            ptrace(PTRACE_SETREGS, thread, nullptr, &registers);
        } else if (with_.what == intervention::fails && number != SYS_close) {
            // The call is not made. A descriptor is closed even where close() fails.
            registers.orig_rax = static_cast<unsigned long long>(-1);
            ptrace(PTRACE_SETREGS, thread, nullptr, &registers);
        }
    }

    void at_exit(pid_t thread)
    {
        target_ = 0;
        if (with_.what == intervention::kills_behind) kill(child_, SIGKILL);
        if (with_.what != intervention::fails) return;
        user_regs_struct registers{};
        ptrace(PTRACE_GETREGS, thread, nullptr, &registers);
        registers.rax = static_cast<unsigned long long>(-with_.error);
        ptrace(PTRACE_SETREGS, thread, nullptr, &registers);
    }

    pid_t child_;
    intervention with_;
    watched seen_;
    std::map<pid_t, returned_call> entered_; // calls that threads are inside of
    bool watching_ = false;
    bool over_ = false;
    pid_t target_ = 0; // the thread inside the system call that is intervened in
};
} // namespace

namespace qn::test
{
watched watch(const std::function<void()> &body, const intervention &with)
{
    const pid_t child = fork();
    if (child == 0) {
        if (ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) _exit(not_possible);
        raise(SIGSTOP);
        body();
        _exit(0);
    }
    return watcher(child, with).run();
}

void begin_watching() { syscall(begin_mark); }
void end_watching() { syscall(end_mark); }

bool is_watched(long number)
{
    switch (number) {
    case begin_mark:
    case SYS_futex:
    case SYS_rt_sigprocmask:
    case SYS_rt_sigaction:
    case SYS_rt_sigreturn:
    case SYS_restart_syscall:
    case SYS_nanosleep:
    case SYS_clock_nanosleep:
    case SYS_sched_yield:
    case SYS_brk:
    case SYS_munmap:
    case SYS_set_robust_list:
    case SYS_rseq:
    case SYS_exit:
    case SYS_exit_group: return false;
    default: return true;
    }
}

bool can_be_cut_short(long number)
{
    return number == SYS_read || number == SYS_write || number == SYS_pread64 || number == SYS_pwrite64;
}

attack watching()
{
    return {begin_watching, [] {
                end_watching();
                return uint64_t{0};
            }};
}

aftermath play_watched(const attacked_call &call, const intervention &with, watched &process)
{
    const scratch folder(memory_folder());
    const shared_aftermath told;
    process = watch([&] { play(call, watching(), folder.folder(), *told); }, with);
    told->ended_by = process.ended_by;
    told->faults = process.intervened ? 1 : 0;
    return *told;
}
} // namespace qn::test
