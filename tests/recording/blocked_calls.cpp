#include "recording/blocked_calls.h"

#include <atomic>
#include <cstdarg>
#include <fcntl.h>
#include <pthread.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/syslog.h>
#include <unistd.h>

namespace
{
// Where the calling thread is to hang; null for every thread but the one that is to be cancelled.
struct trap {
    std::string call;
    int count;
    const std::function<void()> *body;
    std::atomic<bool> reached{false};
    std::atomic<bool> ended{false};
};
thread_local trap *armed = nullptr;

bool may_be_cancelled()
{
    int state = 0;
    pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &state);
    pthread_setcancelstate(state, nullptr);
    return state == PTHREAD_CANCEL_ENABLE;
}

void pass(const char *call)
{
    trap *here = armed;
    if (here == nullptr || (here->call != call && here->call != qn::test::any_call) || !may_be_cancelled()) return;
    if (--here->count != 0) return;
    here->reached = true;
    for (;;) {
        pthread_testcancel();
        sched_yield();
    }
}

void *run(void *argument)
{
    armed = static_cast<trap *>(argument);
    // Also run when the thread is cancelled.
    struct at_end {
        trap *here;
        ~at_end() { here->ended = true; }
    } const end{armed};
    (*end.here->body)();
    armed = nullptr;
    return nullptr;
}
} // namespace

extern "C" {
int usleep(useconds_t)
{
    pass("usleep");
    return 0;
}

int open(const char *name, int flags, ...)
{
    pass("open");
    mode_t mode = 0;
    if ((flags & O_CREAT) != 0) {
        va_list args;
        va_start(args, flags);
        mode = va_arg(args, mode_t);
        va_end(args);
    }
    return static_cast<int>(syscall(SYS_openat, AT_FDCWD, name, flags, mode));
}

ssize_t write(int fd, const void *bytes, size_t count)
{
    pass("write");
    return syscall(SYS_write, fd, bytes, count);
}

ssize_t read(int fd, void *bytes, size_t count)
{
    pass("read");
    return syscall(SYS_read, fd, bytes, count);
}

int close(int fd)
{
    pass("close");
    return static_cast<int>(syscall(SYS_close, fd));
}

int fsync(int fd)
{
    pass("fsync");
    return static_cast<int>(syscall(SYS_fsync, fd));
}

int msync(void *address, size_t length, int flags)
{
    pass("msync");
    return static_cast<int>(syscall(SYS_msync, address, length, flags));
}

void syslog(int, const char *, ...) { pass("syslog"); }
void __syslog_chk(int, int, const char *, ...) { pass("syslog"); }
void vsyslog(int, const char *, va_list) { pass("vsyslog"); }
void __vsyslog_chk(int, int, const char *, va_list) { pass("vsyslog"); }
}

namespace qn::test
{
bool cancelled_in(const std::string &call, const std::function<void()> &body, int count)
{
    trap here{call, count, &body};
    pthread_t thread{};
    if (pthread_create(&thread, nullptr, run, &here) != 0) return false;
    while (!here.reached && !here.ended) sched_yield();
    if (here.reached) pthread_cancel(thread);
    void *result = nullptr;
    pthread_join(thread, &result);
    return here.reached && result == PTHREAD_CANCELED;
}
} // namespace qn::test
