// What a process can ask about itself and others: arguments, the administrative group, the signal mask. No
// state.
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <grp.h>
#include <memory>
#include <new>
#include <span>

#include <qn_cu.h>

#include "platform/common/files.h"

namespace qn::cu
{
namespace
{
constexpr const char *admin_group = "qnadm";
constexpr size_t first_group_bytes = 1024;
constexpr size_t most_group_bytes = 16 << 20; // a group with a great many members

int find_group(const char *name, std::span<char> scratch, gid_t *gid)
{
    group entry;
    group *found = nullptr;
    int error;
    do error = getgrnam_r(name, &entry, scratch.data(), scratch.size(), &found);
    while (error == EINTR);
    if (error != 0) return error;
    if (found == nullptr) return ENOENT;
    *gid = found->gr_gid;
    return 0;
}
} // namespace
} // namespace qn::cu

int cu_get_proc_args_1(pid_t pid, char *buffer, size_t size)
{
    if (buffer == nullptr || size == 0) return EINVAL;
    buffer[0] = '\0';
    char path[64];
    std::snprintf(path, sizeof path, "/proc/%d/cmdline", static_cast<int>(pid));
    size_t length = 0;
    const int error = qn::platform::read_file(path, {buffer, size - 1}, &length);
    buffer[error == 0 ? length : 0] = '\0';
    return error;
}

int cu_getadmin_group_id_1(gid_t *gid)
{
    if (gid == nullptr) return EINVAL;
    const qn::platform::no_cancel whole;
    for (size_t bytes = qn::cu::first_group_bytes; bytes <= qn::cu::most_group_bytes; bytes *= 4) {
        const std::unique_ptr<char[]> scratch(new (std::nothrow) char[bytes]);
        if (!scratch) return ENOMEM;
        const int error = qn::cu::find_group(qn::cu::admin_group, {scratch.get(), bytes}, gid);
        if (error != ERANGE) return error;
    }
    return ERANGE;
}

int cu_block_thread_allsig_except_syncsig_1(void)
{
    sigset_t blocked;
    sigfillset(&blocked);
    for (const int synchronous : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS, SIGABRT})
        sigdelset(&blocked, synchronous);
    return pthread_sigmask(SIG_SETMASK, &blocked, nullptr);
}
