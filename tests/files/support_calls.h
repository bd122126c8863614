// The calls that the library makes, in the hands of a test: each goes to the test's function when there is one, else to
// the real call. The linker leads the library's calls here; those inside other shared libraries stay as they are.
#pragma once

#include <functional>
#include <nl_types.h>
#include <string>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/types.h>
#include <sys/vfs.h>

#include <pthread.h>

#include <qn_cu.h>
#include <qn_ffdc.h>

namespace qn::test
{
// What a first-failure record is filed with.
struct failure_filing {
    int reserved0;
    std::string component;
    std::string subsystem;
    std::string file;
    std::string version;
    int line;
    int reserved1;
    int log_event;
    int error_id;
    const void *detail_data;
    int detail_data_len;
    std::string detail_data_file;
    const char *text;
};

struct call_hooks {
    std::function<int(const char *name, int flags, mode_t mode)> open;
    std::function<int(int fd, struct stat *)> fstat;
    std::function<int(int fd, struct statfs *)> fstatfs;
    std::function<int(int fd, struct statvfs *)> fstatvfs;
    std::function<ssize_t(int fd, const void *bytes, size_t count)> write;
    std::function<int(int fd, off_t size)> ftruncate;
    std::function<int(int fd)> fsync;
    std::function<int(int fd, uid_t owner, gid_t group)> fchown;
    std::function<int(int fd, mode_t mode)> fchmod;
    std::function<void *(size_t size, int protection, int flags, int fd, off_t offset)> mmap;
    std::function<int(void *map, size_t size, int flags)> msync;
    std::function<int(useconds_t)> usleep;
    std::function<void *(size_t size)> malloc;
    std::function<void *(size_t count, size_t size)> calloc;
    std::function<void(void *memory)> free;
    std::function<nl_catd(const char *name, int flag)> catopen;
    std::function<int(nl_catd)> catclose;
    std::function<int(pthread_cond_t *)> cond_signal;
    std::function<int(pid_t, char *buffer, size_t size)> proc_args;
    std::function<int(gid_t *)> admin_group;
    std::function<int(qn_uint64_t *)> node_id;
    std::function<int(cu_cluster_info_t *)> cluster_info;
    std::function<int(cu_timeinfo_t *)> procspeed;
    std::function<int(const fc_err_tbl_t *, const void *, int, char *, int, nl_catd)> failure_text;
    std::function<int(const failure_filing &)> failure_filed;
};

// The hooks, empty before and after each test. Set them while no other thread is inside the library.
call_hooks &calls();
} // namespace qn::test

// The real calls, for a hook that passes some calls on.
extern "C" {
int __real_open(const char *name, int flags, ...);
int __real_fstat(int fd, struct stat *status);
int __real_fstatvfs(int fd, struct statvfs *status);
ssize_t __real_write(int fd, const void *bytes, size_t count);
int __real_fsync(int fd);
int __real_fchown(int fd, uid_t owner, gid_t group);
int __real_fchmod(int fd, mode_t mode);
void *__real_mmap(void *place, size_t size, int protection, int flags, int fd, off_t offset);
int __real_msync(void *map, size_t size, int flags);
void *__real_calloc(size_t count, size_t size);
void __real_free(void *memory);
nl_catd __real_catopen(const char *name, int flag);
int __real_catclose(nl_catd catalogue);
}

namespace qn::test
{
// The status of a hook that fails like a system call.
int fail_with(int error);
} // namespace qn::test
