// Copying a full page, or a file, into a spool directory. Queue mutex, held by the caller of do_spool: the page stays
// mapped and nobody writes it meanwhile.
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <memory>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include "platform/common/descriptors.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/releases.h"
#include "trace/spooling/spool_list.h"

namespace
{
using namespace qn::tr;

constexpr size_t copy_chunk_bytes = 262144;
constexpr mode_t copy_mode = 0600;

// Closes with its scope.
class descriptor
{
public:
    explicit descriptor(int fd) : fd_(fd) {}
    descriptor(const descriptor &) = delete;
    descriptor &operator=(const descriptor &) = delete;
    ~descriptor()
    {
        if (fd_ != -1) qn::platform::close_for_sure(fd_);
    }
    int get() const { return fd_; }
    int release()
    {
        const int fd = fd_;
        fd_ = -1;
        return fd;
    }

private:
    int fd_;
};

// Records why a file could not be opened.
qn_int32_t open_failed(const char *file_name, bool for_writing)
{
    if (errno == EFAULT || errno == EINVAL) return set_error_str(QN_TR_EFILENAME, 17, file_name);
    if (errno == ENOSPC && for_writing) return set_error_int(QN_TR_ENOSPACE, 36, errno);
    return set_error_int(QN_TR_EOPEN, 18, errno);
}

// Nobody is waited for, who might write into a pipe some day: full pages wait for the queue meanwhile.
qn_int32_t copy_contents(const char *from_name, int to)
{
    const descriptor from(qn::platform::open_file(from_name, O_RDONLY | O_NONBLOCK));
    if (from.get() == -1) return open_failed(from_name, false);
    const std::unique_ptr<void, releases<std::free>> buffer(std::malloc(copy_chunk_bytes));
    if (buffer == nullptr) return set_error(QN_TR_ENOMEM, 14);
    for (;;) {
        const ssize_t length = read(from.get(), buffer.get(), copy_chunk_bytes);
        if (length == 0) return 0;
        if (length == -1 && errno == EINTR) continue;
        if (length == -1) return set_error_int(QN_TR_EOPEN, 18, errno);
        size_t written = 0;
        const qn_int32_t status = write_buffer_to_file(to, buffer.get(), static_cast<size_t>(length), &written);
        if (status != 0) return status;
    }
}

// What is copied, and where to.
struct copy_job {
    const char *file_name;
    const char *directory;
    const void *map; // of a page; null: the file is read
    qn_uint32_t map_bytes;
};

copy_job job_for(const sp_q_element_t *element)
{
    const trace_anchor_t *page = element->pAnchor;
    if (page == nullptr) return {element->fileName, element->dest, nullptr, 0};
    return {page->fileName, page->spool != nullptr ? page->spool->dest : recycle_only, page->pMap,
            page->uActualFileSize};
}

// Directory, base name, local time, microseconds. The last are not padded with zeros: readers know the names so.
template <size_t size>
void name_copy(std::array<char, size> &path, const copy_job &job)
{
    timeval now{};
    gettimeofday(&now, nullptr);
    tm local{};
    std::array<char, 256> time_text{};
    if (qn::platform::local_time(now.tv_sec, local))
        strftime(time_text.data(), time_text.size(), "%Y_%m_%d_%H_%M_%S", &local);
    const char *slash = std::strrchr(job.file_name, '/');
    std::snprintf(path.data(), path.size(), "%s/%s.%s.%2d", job.directory, slash != nullptr ? slash + 1 : job.file_name,
                  time_text.data(), static_cast<int>(now.tv_usec));
}
} // namespace

qn_int32_t do_spool(sp_q_element_t *elem)
{
    const copy_job job = job_for(elem);
    const bool is_page = elem->pAnchor != nullptr;
    if (std::strcmp(job.directory, recycle_only) == 0 || (is_page && job.map == nullptr)) return 0;

    std::array<char, 2 * trace_file_name_bytes + 300> path;
    name_copy(path, job);
    debug("do_spool: %s\n", path.data());
    if (is_page && use_msync_enabled_except_flush != 0)
        msync(elem->pAnchor->pMap, elem->pAnchor->uActualFileSize, MS_ASYNC);
    const qn_int32_t status = cp_mapped_file(path.data(), is_page ? nullptr : job.file_name, job.map, job.map_bytes);
    debug("%s copied to %s\n", job.file_name, path.data());
    return status;
}

qn_int32_t cp_mapped_file(const char *dest, const char *fname_in, const void *map, qn_uint32_t size)
{
    if (fname_in == nullptr)
        debug("cp_mapped_file: %s - %u bytes\n", dest, size);
    else
        debug("cp_mapped_file: %s - from %s\n", dest, fname_in);

    const descriptor to(qn::platform::open_file(dest, O_RDWR | O_CREAT | O_TRUNC, copy_mode));
    if (to.get() == -1) return open_failed(dest, true);
    size_t written = 0;
    const qn_int32_t status =
        fname_in == nullptr ? write_buffer_to_file(to.get(), map, size, &written) : copy_contents(fname_in, to.get());
    if (status != 0) unlink(dest);
    return status;
}

qn_int32_t write_buffer_to_file(int fd, const void *buffer, size_t in_size, size_t *bytesWritten)
{
    const auto *bytes = static_cast<const char *>(buffer);
    *bytesWritten = 0;
    while (*bytesWritten < in_size) {
        const ssize_t length = write(fd, bytes + *bytesWritten, in_size - *bytesWritten);
        if (length == -1 && errno == EINTR) continue;
        if (length == -1) return set_error_int(QN_TR_EWRITE, 40, errno);
        *bytesWritten += static_cast<size_t>(length);
    }
    return 0;
}

qn_int32_t map_file(const char *fileName, size_t *size, void **map, int *fd)
{
    *size = 0;
    *map = nullptr;
    *fd = -1;
    descriptor file(qn::platform::open_file(fileName, O_RDONLY));
    if (file.get() == -1) return open_failed(fileName, false);
    struct stat status;
    if (fstat(file.get(), &status) != 0) return set_error_int(QN_TR_EFSTAT, 19, errno);
    void *address = mmap(nullptr, static_cast<size_t>(status.st_size), PROT_READ, MAP_SHARED, file.get(), 0);
    if (address == MAP_FAILED) return set_error_int(QN_TR_EMMAP, 21, errno);
    *size = static_cast<size_t>(status.st_size);
    *map = address;
    *fd = file.release();
    debug("map_file: %s - %u bytes\n", fileName, static_cast<unsigned>(*size));
    return 0;
}
