#include "files/support_calls.h"

#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <string>

#include <gtest/gtest.h>

namespace
{
// A hook may use what belongs to its test; the library still makes calls when the program ends.
class hooks_end_with_their_test : public testing::EmptyTestEventListener
{
    void OnTestEnd(const testing::TestInfo &) override { qn::test::calls() = {}; }
};

[[maybe_unused]] const bool hooks_end = [] {
    testing::UnitTest::GetInstance()->listeners().Append(new hooks_end_with_their_test);
    return true;
}();
} // namespace

namespace qn::test
{
call_hooks &calls()
{
    static call_hooks hooks;
    return hooks;
}

int fail_with(int error)
{
    errno = error;
    return -1;
}
} // namespace qn::test

using qn::test::calls;

namespace
{
// A null string stays visible as such.
std::string text_of(const char *text) { return text != nullptr ? text : "(none)"; }
} // namespace

// The names are the linker's, which looks for them from shared libraries too.
#pragma GCC visibility push(default)
extern "C" {
int __real_fstatfs(int, struct statfs *);
int __real_ftruncate(int, off_t);
int __real_usleep(useconds_t);
void *__real_malloc(size_t);
int __real_pthread_cond_signal(pthread_cond_t *);
int __real_cu_get_proc_args_1(pid_t, char *, size_t);
int __real_cu_getadmin_group_id_1(gid_t *);
int __real_cu_get_node_id_1(qn_uint64_t *);
int __real_cu_get_cluster_info_1(cu_cluster_info_t *);
int __real_cu_get_procspeed_1(cu_timeinfo_t *);
int __real_fc_mk_syslog_msg_1(const fc_err_tbl_t *, const void *, int, char *, int, nl_catd);
int __real_fc_log_error_1(char *, int, const char *, const char *, const char *, const char *, int, int, int, int,
                          const void *, int, const char *, const char *);

int __wrap_open(const char *name, int flags, ...)
{
    va_list args;
    va_start(args, flags);
    const mode_t mode = (flags & 0100) != 0 ? va_arg(args, mode_t) : 0;
    va_end(args);
    return calls().open ? calls().open(name, flags, mode) : __real_open(name, flags, mode);
}

int __wrap_fstat(int fd, struct stat *status)
{
    return calls().fstat ? calls().fstat(fd, status) : __real_fstat(fd, status);
}

int __wrap_fstatfs(int fd, struct statfs *status)
{
    return calls().fstatfs ? calls().fstatfs(fd, status) : __real_fstatfs(fd, status);
}

int __wrap_fstatvfs(int fd, struct statvfs *status)
{
    return calls().fstatvfs ? calls().fstatvfs(fd, status) : __real_fstatvfs(fd, status);
}

ssize_t __wrap_write(int fd, const void *bytes, size_t count)
{
    return calls().write ? calls().write(fd, bytes, count) : __real_write(fd, bytes, count);
}

int __wrap_ftruncate(int fd, off_t size)
{
    return calls().ftruncate ? calls().ftruncate(fd, size) : __real_ftruncate(fd, size);
}

int __wrap_fsync(int fd) { return calls().fsync ? calls().fsync(fd) : __real_fsync(fd); }

int __wrap_fchown(int fd, uid_t owner, gid_t group)
{
    return calls().fchown ? calls().fchown(fd, owner, group) : __real_fchown(fd, owner, group);
}

int __wrap_fchmod(int fd, mode_t mode) { return calls().fchmod ? calls().fchmod(fd, mode) : __real_fchmod(fd, mode); }

void *__wrap_mmap(void *place, size_t size, int protection, int flags, int fd, off_t offset)
{
    return calls().mmap ? calls().mmap(size, protection, flags, fd, offset)
                        : __real_mmap(place, size, protection, flags, fd, offset);
}

int __wrap_msync(void *map, size_t size, int flags)
{
    return calls().msync ? calls().msync(map, size, flags) : __real_msync(map, size, flags);
}

int __wrap_usleep(useconds_t time) { return calls().usleep ? calls().usleep(time) : __real_usleep(time); }

void *__wrap_malloc(size_t size) { return calls().malloc ? calls().malloc(size) : __real_malloc(size); }

void *__wrap_calloc(size_t count, size_t size)
{
    return calls().calloc ? calls().calloc(count, size) : __real_calloc(count, size);
}

void __wrap_free(void *memory)
{
    if (calls().free) return calls().free(memory);
    __real_free(memory);
}

nl_catd __wrap_catopen(const char *name, int flag)
{
    return calls().catopen ? calls().catopen(name, flag) : __real_catopen(name, flag);
}

int __wrap_catclose(nl_catd catalogue)
{
    return calls().catclose ? calls().catclose(catalogue) : __real_catclose(catalogue);
}

int __wrap_pthread_cond_signal(pthread_cond_t *condition)
{
    return calls().cond_signal ? calls().cond_signal(condition) : __real_pthread_cond_signal(condition);
}

int __wrap_cu_get_proc_args_1(pid_t pid, char *buffer, size_t size)
{
    return calls().proc_args ? calls().proc_args(pid, buffer, size) : __real_cu_get_proc_args_1(pid, buffer, size);
}

int __wrap_cu_getadmin_group_id_1(gid_t *group)
{
    return calls().admin_group ? calls().admin_group(group) : __real_cu_getadmin_group_id_1(group);
}

int __wrap_cu_get_node_id_1(qn_uint64_t *node)
{
    return calls().node_id ? calls().node_id(node) : __real_cu_get_node_id_1(node);
}

int __wrap_cu_get_cluster_info_1(cu_cluster_info_t *info)
{
    return calls().cluster_info ? calls().cluster_info(info) : __real_cu_get_cluster_info_1(info);
}

int __wrap_cu_get_procspeed_1(cu_timeinfo_t *time)
{
    return calls().procspeed ? calls().procspeed(time) : __real_cu_get_procspeed_1(time);
}

int __wrap_fc_mk_syslog_msg_1(const fc_err_tbl_t *entry, const void *detail_data, int detail_data_len, char *buffer,
                              int buffer_size, nl_catd catalogue)
{
    if (calls().failure_text)
        return calls().failure_text(entry, detail_data, detail_data_len, buffer, buffer_size, catalogue);
    return __real_fc_mk_syslog_msg_1(entry, detail_data, detail_data_len, buffer, buffer_size, catalogue);
}

int __wrap_fc_log_error_1(char *id, int reserved0, const char *component, const char *subsystem, const char *file,
                          const char *vers, int line, int reserved1, int log_event, int error_id,
                          const void *detail_data, int detail_data_len, const char *detail_data_file,
                          const char *syslog_text)
{
    if (calls().failure_filed) {
        for (size_t i = 0; i < sizeof(fc_eid_t); ++i) id[i] = 'x'; // the whole of it is the callee's
        return calls().failure_filed({reserved0, text_of(component), text_of(subsystem), text_of(file), text_of(vers),
                                      line, reserved1, log_event, error_id, detail_data, detail_data_len,
                                      text_of(detail_data_file), syslog_text});
    }
    return __real_fc_log_error_1(id, reserved0, component, subsystem, file, vers, line, reserved1, log_event, error_id,
                                 detail_data, detail_data_len, detail_data_file, syslog_text);
}
}
#pragma GCC visibility pop
