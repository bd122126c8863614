// Starting one trace file: open, check, size, map, continue or initialise, head.
//
// Anchor set lock, held by the caller.
#include <cerrno>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <sys/vfs.h>
#include <unistd.h>

#include "platform/common/descriptors.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/mapped_files.h"
#include "trace/files/text.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

namespace
{
using namespace qn::tr;

// The trace file that is being opened as `fd`. Pages are not looked at: without their lock they may be freed meanwhile.
trace_anchor_t *anchor_being_opened(int fd)
{
    trace_anchor_t *anchor = &anchors;
    while (anchor != nullptr && anchor->mapFd != fd) anchor = load_acquire(anchor->next);
    return anchor;
}

// Undoes what there is of a start: the mapping of the anchor, if any, and the descriptor. The anchor lets go of the
// number first, which another thread may be given as soon as it is closed. Descriptor 0 is left open: it may be the
// client's own standard input.
void give_up_start(trace_anchor_t *anchor, int fd)
{
    if (anchor != nullptr) {
        if (anchor->pMap != nullptr) unmap_page(anchor);
        anchor->mapFd = -1;
    }
    if (fd != -1 && fd != 0) qn::platform::close_for_sure(fd);
}

// Undoes everything unless the start came to its end: on a failure as on a cancellation, the descriptor is closed and
// the anchor stays unmapped. Only a cancellation leaves descriptor 0 open. Other traces are not looked at: a writer who
// starts its damaged trace afresh holds no lock of theirs.
class start_in_progress
{
public:
    explicit start_in_progress(trace_anchor_t *anchor) : anchor_(anchor) {}
    start_in_progress(const start_in_progress &) = delete;
    start_in_progress &operator=(const start_in_progress &) = delete;
    ~start_in_progress()
    {
        if (done_) return;
        give_up_start(anchor_, fd_);
        release_file(anchor_);
    }

    int fd() const { return fd_; }
    void opened(int fd) { anchor_->mapFd = fd_ = fd; }
    void close_descriptor()
    {
        const int fd = fd_;
        anchor_->mapFd = fd_ = -1;
        if (fd != -1) qn::platform::close_for_sure(fd);
    }
    qn_int32_t failed(qn_int32_t status)
    {
        close_descriptor();
        return status;
    }
    void done() { done_ = true; }

private:
    trace_anchor_t *anchor_;
    int fd_ = -1;
    bool done_ = false;
};

qn_int32_t open_file(trace_anchor_t *anchor, start_in_progress &start)
{
    const int fd = qn::platform::open_file(anchor->fileName, O_RDWR | O_CREAT, 0600, qn::platform::standard_output);
    if (fd != -1) {
        start.opened(fd);
        return 0;
    }
    switch (errno) {
    case EFAULT:
    case EINVAL: return set_error_str(QN_TR_EFILENAME, 17, anchor->fileName);
    case ENOSPC: return set_error_int(QN_TR_ENOSPACE, 36, errno);
    default: return set_error_int(QN_TR_EOPEN, 18, errno);
    }
}

// Refuses what cannot hold a trace; tells the size of what can.
qn_int32_t check_file(trace_anchor_t *anchor, int fd, qn_uint64_t &current_size)
{
    struct statfs fs;
    if (fstatfs(fd, &fs) == 0 && fs.f_type == 0) return set_error(QN_TR_EFSTAT, 35);

    struct stat file;
    const int result = fstat(fd, &file);
    if (result != 0) return set_error_int(QN_TR_EFSTAT, 19, result);
    if (!S_ISREG(file.st_mode)) return set_error_str(QN_TR_ENOTREG, 20, anchor->fileName);
    if (!claim_file(anchor, file)) return set_error_int(QN_TR_EOPEN, 18, EBUSY);
    current_size = static_cast<qn_uint64_t>(file.st_size);
    return 0;
}

// The administrative group may read and write traces. What is not permitted is left.
void give_to_administrators(int fd)
{
    gid_t group = 0;
    if (cu_getadmin_group_id_1(&group) != 0) return;
    const int changed_group = fchown(fd, static_cast<uid_t>(-1), group);
    const int changed_mode = fchmod(fd, 0660);
    (void)changed_group;
    (void)changed_mode;
}

qn_int32_t map_file_at_size(trace_anchor_t *anchor, start_in_progress &start, qn_uint32_t size)
{
    void *map = MAP_FAILED;
    if (size < smallest_file_bytes)
        errno = EINVAL;
    else
        map = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, start.fd(), 0);
    if (map == MAP_FAILED) {
        anchor->pMap = nullptr;
        return set_error_int(QN_TR_EMMAP, 21, errno);
    }
    {
        const mutex_lock queue(spq.mutex);
        anchor->pMap = static_cast<unsigned char *>(map);
        anchor->pMapEnd = anchor->pMap + size;
        anchor->uActualFileSize = size;
    }
    start.close_descriptor();
    return 0;
}

// The first records of a fresh file would each wait for the kernel to map the memory page they lie in. The pages are in
// its cache, just written: mapping them all now is cheap. A kernel that cannot is as good, only slower.
void map_every_page_now(const trace_anchor_t *anchor)
{
    madvise(anchor->pMap, anchor->uActualFileSize, MADV_POPULATE_WRITE);
}

program_names names_of_this_program()
{
    program_names names{};
    char arguments[512];
    if (cu_get_proc_args_1(getpid(), arguments, sizeof arguments) != 0) return names;
    const char *slash = std::strrchr(arguments, '/');
    if (slash != nullptr) debug("baseName: %s\n", slash + 1);
    copy_cut(names.base_name, slash != nullptr ? slash + 1 : arguments);
    copy_cut(names.program, arguments);
    return names;
}

void log_start(const trace_anchor_t *anchor)
{
    if (!debug_level_above(7)) return;
    timeval now{};
    gettimeofday(&now, nullptr);
    tm local{};
    char text[64] = "";
    if (qn::platform::local_time(now.tv_sec, local)) strftime(text, sizeof text, "%F %T", &local);
    debug(" +++ %s (%u) started at %s.%ld\n", anchor->fileName, anchor->uActualFileSize, text,
          static_cast<long>(now.tv_usec));
}
} // namespace

void cancel_start_trace(void *pArg)
{
    const int fd = *static_cast<int *>(pArg);
    if (fd != -1) give_up_start(anchor_being_opened(fd), fd);
}

qn_int32_t start_trace_page(trace_anchor_t *anchor)
{
    if (anchor->pMap != nullptr) return 0;
    start_in_progress start(anchor);

    qn_int32_t status = open_file(anchor, start);
    if (status != 0) return start.failed(status);
    qn_uint64_t current_size = 0;
    status = check_file(anchor, start.fd(), current_size);
    if (status != 0) return start.failed(status);

    const auto page_size = static_cast<qn_uint32_t>(anchor->pageSize);
    qn_uint32_t size = page_size * ((anchor->uRequestedFileSize + page_size - 1) / page_size);
    const bool resized = size != current_size;
    if (resized) {
        debug("\ttrace: uSize(%llu) != statData.st_size(%llu) for %s\n", static_cast<unsigned long long>(size),
              static_cast<unsigned long long>(current_size), anchor->fileName);
        status = extend_trace_file(start.fd(), current_size, page_size, size);
        if (status != 0) return start.failed(status);
        debug("\ttrace: reInit for %s due to size\n", anchor->fileName);
    }

    give_to_administrators(start.fd());
    status = map_file_at_size(anchor, start, size);
    if (status != 0) return start.failed(status);

    if (resized) map_every_page_now(anchor);

    const program_names names = names_of_this_program();
    if (resized || !reuse_ring(anchor, names)) {
        debug("\ttrace: reInit block for %s\n", anchor->fileName);
        init_trace_header(anchor);
        init_ring(anchor);
    }
    store_relaxed(anchor->uMaxSize,
                  static_cast<qn_uint32_t>(anchor->pMapEnd - reinterpret_cast<unsigned char *>(anchor->pWrap)) / 2 &
                      ~3U);

    trace_file_header_t *header = header_of(anchor);
    store_relaxed(header->uPid, static_cast<qn_uint32_t>(getpid()));
    std::memcpy(header->program, names.program, sizeof header->program);
    std::memcpy(header->baseProgName, names.base_name, sizeof header->baseProgName);
    debug("baseProgName in header: %s\n", names.base_name);
    log_start(anchor);

    if (!is_spooled_page(anchor)) int_record_start(anchor);
    debug("<<start_trace exit for %s\n\n", anchor->fileName);
    start.done();
    return 0;
}

namespace qn::tr
{
void unmap_page(trace_anchor_t *anchor)
{
    const mutex_lock queue(spq.mutex);
    munmap(anchor->pMap, anchor->uActualFileSize);
    anchor->pMap = nullptr;
    anchor->pMapEnd = nullptr;
    store_relaxed(anchor->uMaxSize, 0);
    anchor->pWrap = nullptr;
    anchor->pRing = nullptr;
    anchor->pNextFree = nullptr;
    anchor->uActualFileSize = 0;
    release_file(anchor);
}
} // namespace qn::tr
