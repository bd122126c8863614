// What a process can ask about itself and others: arguments, the administrative group, the signal mask. No
// state.
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <memory>
#include <string_view>

#include <qn_cu.h>

#include "platform/common/files.h"

namespace qn::cu
{
namespace
{
// The machine's own groups, and not getgrnam_r(): that loads the modules of /etc/nsswitch.conf into the program, may
// wait for a server on the network, and kills the program where memory runs out in it.
constexpr const char *group_file = "/etc/group";
constexpr std::string_view admin_group = "qnadm:"; // how its line begins

// No group has this number; chown() and its kin take it for "leave it as it is".
constexpr gid_t no_group = std::numeric_limits<gid_t>::max();

struct close_stream {
    void operator()(FILE *stream) const { std::fclose(stream); }
};

// Reads the number behind "name:password:".
bool number_in(const char *line, gid_t *gid)
{
    const char *number = std::strchr(line + admin_group.size(), ':');
    if (number == nullptr) return false;
    char *end = nullptr;
    const unsigned long value = std::strtoul(++number, &end, 10);
    if (end == number || *end != ':' || value >= no_group) return false;
    *gid = static_cast<gid_t>(value);
    return true;
}

int find_admin_group(gid_t *gid)
{
    const std::unique_ptr<FILE, close_stream> groups(platform::open_text(group_file));
    if (groups == nullptr) return errno;
    char piece[512]; // of a line: that of a group with many members comes in several
    bool at_line_start = true;
    while (std::fgets(piece, sizeof piece, groups.get()) != nullptr) {
        const std::string_view text(piece);
        if (at_line_start && text.starts_with(admin_group) && number_in(piece, gid)) return 0;
        at_line_start = text.ends_with('\n');
    }
    return std::ferror(groups.get()) != 0 ? EIO : ENOENT;
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
    return qn::cu::find_admin_group(gid);
}

int cu_block_thread_allsig_except_syncsig_1(void)
{
    sigset_t blocked;
    sigfillset(&blocked);
    for (const int synchronous : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS, SIGABRT})
        sigdelset(&blocked, synchronous);
    return pthread_sigmask(SIG_SETMASK, &blocked, nullptr);
}
