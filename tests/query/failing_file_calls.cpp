#include "query/failing_file_calls.h"

#include <cerrno>
#include <cstdarg>
#include <optional>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/vfs.h>

namespace
{
struct failure {
    int result;
    int error;
};

std::vector<int> open_errors;
int opens = 0;
std::optional<failure> of_fstat;
std::optional<failure> of_fstatfs;
std::optional<long> file_system_type;
std::optional<failure> of_mmap;

int fail_with(const failure &how)
{
    errno = how.error;
    return how.result;
}
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
int __real_open(const char *name, int flags, ...);
int __real_fstat(int fd, struct stat *file);
int __real_fstatfs(int fd, struct statfs *fs);
void *__real_mmap(void *address, size_t bytes, int protection, int flags, int fd, off_t offset);

int __wrap_open(const char *name, int flags, ...)
{
    ++opens;
    if (!open_errors.empty()) {
        const int error = open_errors.front();
        open_errors.erase(open_errors.begin());
        return fail_with({-1, error});
    }
    va_list args;
    va_start(args, flags);
    const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(args, mode_t) : 0;
    va_end(args);
    return __real_open(name, flags, mode);
}

int __wrap_fstat(int fd, struct stat *file) { return of_fstat ? fail_with(*of_fstat) : __real_fstat(fd, file); }

int __wrap_fstatfs(int fd, struct statfs *fs)
{
    if (of_fstatfs) {
        fs->f_type = 0; // of no account in an answer that failed
        return fail_with(*of_fstatfs);
    }
    const int result = __real_fstatfs(fd, fs);
    if (file_system_type) fs->f_type = *file_system_type;
    return result;
}

void *__wrap_mmap(void *address, size_t bytes, int protection, int flags, int fd, off_t offset)
{
    if (!of_mmap) return __real_mmap(address, bytes, protection, flags, fd, offset);
    errno = of_mmap->error;
    return MAP_FAILED;
}
}
#pragma GCC visibility pop

namespace qn::test
{
void fail_opens(const std::vector<int> &errors) { open_errors = errors; }
int opens_made() { return opens; }
void fail_fstat(int result, int with_errno) { of_fstat = {result, with_errno}; }
void fail_fstatfs(int with_errno) { of_fstatfs = {-1, with_errno}; }
void answer_fstatfs_with_type(long type) { file_system_type = type; }
void fail_mmap(int with_errno) { of_mmap = {-1, with_errno}; }
} // namespace qn::test
