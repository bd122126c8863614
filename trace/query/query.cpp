// Query handles: who wrote a trace file, read from its header. No lock is taken.
#include "trace/query/query.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include "platform/common/descriptors.h"
#include "trace/files/error_report.h"
#include "trace/files/format.h"
#include "trace/files/shared_words.h"

namespace
{
using qn::platform::close_for_sure;
using qn::tr::load_relaxed;

constexpr char valid_id[4] = {'_', 'T', 'R', '_'};

bool is_valid(const trace_query_anchor_t *handle)
{
    return handle != nullptr && std::memcmp(handle->id, valid_id, sizeof valid_id) == 0;
}

const trace_file_header_t *header_of(const trace_query_anchor_t *handle)
{
    return reinterpret_cast<const trace_file_header_t *>(handle->pMap);
}

// Releases a handle unless it was given away.
class query_handle
{
public:
    explicit query_handle(trace_query_anchor_t *handle) : handle_(handle) {}
    query_handle(const query_handle &) = delete;
    query_handle &operator=(const query_handle &) = delete;
    ~query_handle()
    {
        if (handle_ != nullptr) cancel_open_query(handle_);
    }
    trace_query_anchor_t *operator->() const { return handle_; }
    trace_query_anchor_t *give_away()
    {
        trace_query_anchor_t *handle = handle_;
        handle_ = nullptr;
        return handle;
    }

private:
    trace_query_anchor_t *handle_;
};

qn_int32_t open_file(const char *file_name, qn_int32_t &fd)
{
    fd = qn::platform::open_file(file_name, O_RDONLY | O_NONBLOCK, 0, qn::platform::standard_output);
    if (fd != -1) return 0;
    if (errno == EFAULT || errno == EINVAL) return set_error_str(QN_TR_EFILENAME, 17, file_name);
    return set_error_int(QN_TR_EOPEN, 18, errno);
}

qn_int32_t check_file(const char *file_name, trace_query_anchor_t *handle, long page_size)
{
    struct statfs fs;
    if (fstatfs(handle->fd, &fs) == 0 && fs.f_type == 0) return set_error(QN_TR_EFSTAT, 35);
    struct stat file;
    const int result = fstat(handle->fd, &file);
    if (result != 0) return set_error_int(QN_TR_EFSTAT, 19, result);
    if (!S_ISREG(file.st_mode)) return set_error_str(QN_TR_ENOTREG, 20, file_name);
    handle->uSize = static_cast<qn_int32_t>(file.st_size);
    if (file.st_size < page_size) return set_error_str(QN_TR_ENOTTRACE, 37, file_name);
    return 0;
}
} // namespace

void cancel_open_query(void *pArg)
{
    auto *handle = static_cast<trace_query_anchor_t *>(pArg);
    std::memset(handle->id, ' ', sizeof handle->id);
    const int fd = handle->fd;
    if (handle->pMap != nullptr) munmap(handle->pMap, static_cast<size_t>(handle->pMapEnd - handle->pMap));
    std::free(handle);
    // Descriptor 0 is never closed: it may be the client's own standard input.
    if (fd != 0 && fd != -1) close_for_sure(fd);
}

qn_int32_t tr_open_query_1(const qn_char_t *file_name, tr_query_handle_t *handle_p)
{
    auto *memory = static_cast<trace_query_anchor_t *>(std::calloc(1, sizeof(trace_query_anchor_t)));
    if (memory == nullptr) return set_error(QN_TR_ENOMEM, 14);
    memory->fd = -1;
    std::memcpy(memory->id, valid_id, sizeof valid_id);
    query_handle handle(memory);

    if (file_name == nullptr || file_name[0] == '\0') return set_error(QN_TR_EFILENAME, 17);
    qn_int32_t status = open_file(file_name, handle->fd);
    if (status != 0) return status;
    const long page_size = sysconf(_SC_PAGESIZE);
    status = check_file(file_name, memory, page_size);
    if (status != 0) return status;

    void *map = mmap(nullptr, static_cast<size_t>(page_size), PROT_READ, MAP_SHARED, handle->fd, 0);
    if (map == MAP_FAILED) return set_error_int(QN_TR_EMMAP, 21, errno);
    handle->pMap = static_cast<char *>(map);
    handle->pMapEnd = handle->pMap + page_size;
    const int fd = handle->fd;
    handle->fd = -1;
    close_for_sure(fd);
    *handle_p = handle.give_away();
    return cu_set_no_error_1();
}

qn_int32_t tr_close_query_1(tr_query_handle_t handle)
{
    if (!is_valid(handle)) return set_error(QN_TR_EHANDLE, 38);
    cancel_open_query(handle);
    return cu_set_no_error_1();
}

qn_int32_t tr_query_pid_1(tr_query_handle_t handle, pid_t *pid_p)
{
    if (!is_valid(handle)) return set_error(QN_TR_EHANDLE, 38);
    *pid_p = static_cast<pid_t>(load_relaxed(header_of(handle)->uPid));
    return cu_set_no_error_1();
}

qn_int32_t tr_query_prog_1(tr_query_handle_t handle, qn_char_t **program_name_p)
{
    if (!is_valid(handle)) return set_error(QN_TR_EHANDLE, 38);
    const char *program = header_of(handle)->program;
    *program_name_p = strndup(program, sizeof(trace_file_header_t::program));
    if (*program_name_p == nullptr) return set_error(QN_TR_ENOMEM, 14);
    return cu_set_no_error_1();
}

qn_int32_t tr_query_platform_1(tr_query_handle_t handle, qn_uint32_t *platform_p)
{
    if (!is_valid(handle)) return set_error(QN_TR_EHANDLE, 38);
    *platform_p = header_of(handle)->uPlatform;
    return cu_set_no_error_1();
}
