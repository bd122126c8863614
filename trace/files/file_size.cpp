// Bringing a trace file to its size.
//
// The file is extended by writing, never by seeking: a mapped file with holes would find a full disk only when a record
// is stored into a hole, and the program would die of the signal.
#include <algorithm>
#include <array>
#include <cerrno>
#include <sys/statvfs.h>
#include <unistd.h>

#include "platform/common/file_size_limit.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/trace_file.h"

namespace
{
using qn::tr::smallest_file_bytes;

// What a file is made of before its ring is: chunks of 512 bytes that count up. Many of them go into one call.
constexpr size_t chunk_bytes = 512;
using chunks = std::array<unsigned char, 128 * chunk_bytes>;

constexpr chunks make_pattern()
{
    chunks pattern{};
    for (size_t i = 0; i < pattern.size(); ++i) pattern[i] = static_cast<unsigned char>(i);
    return pattern;
}

constexpr chunks pattern = make_pattern();

// What the file system lets the trace take of it: one percent is held back. Unsigned on purpose: where less than one
// percent is free the bound vanishes, and the writes below find out.
bool free_bytes(int fd, qn_uint64_t &bytes)
{
    struct statvfs fs;
    if (fstatvfs(fd, &fs) != 0) return false;
    bytes = qn_uint64_t{fs.f_bsize} * (qn_uint64_t{fs.f_bfree} - qn_uint64_t{fs.f_blocks} / 100);
    return true;
}

// The disk is full: keeps what was written, in whole memory pages.
qn_int32_t settle_for_less(int fd, qn_uint32_t page_size, int write_errno, qn_uint32_t &size)
{
    const auto written = static_cast<qn_uint64_t>(lseek(fd, 0, SEEK_CUR));
    const qn_uint64_t kept = written - written % page_size;
    if (kept < smallest_file_bytes) return set_error_int(QN_TR_ENOSPACE, 36, write_errno);
    if (ftruncate(fd, static_cast<off_t>(kept)) != 0) return set_error_int(QN_TR_ERESIZE, 22, errno);
    size = static_cast<qn_uint32_t>(kept);
    return 0;
}

// Writes pattern bytes from the end of the file until it has `size` bytes. Every write starts at the pattern's first
// byte, also the one that completes a chunk after a short write.
qn_int32_t write_pattern(int fd, qn_uint64_t current_size, qn_uint32_t page_size, qn_uint32_t &size)
{
    if (qn::platform::exceeds_file_size_limit(size)) return set_error_int(QN_TR_ECLEAR, 23, EFBIG);
    qn_uint64_t remaining = size - current_size;
    size_t rest_of_chunk = 0;
    while (remaining > 0) {
        const size_t most = rest_of_chunk != 0 ? rest_of_chunk : pattern.size();
        const ssize_t written = write(fd, pattern.data(), std::min<qn_uint64_t>(remaining, most));
        if (written >= 0) {
            const auto bytes = static_cast<size_t>(written);
            remaining -= bytes;
            rest_of_chunk = (rest_of_chunk + chunk_bytes - bytes % chunk_bytes) % chunk_bytes;
        } else if (errno == ENOSPC || errno == EDQUOT) {
            return settle_for_less(fd, page_size, errno, size);
        } else if (errno != EINTR) {
            return set_error_int(QN_TR_ECLEAR, 23, errno);
        }
    }
    return 0;
}
} // namespace

namespace qn::tr
{
qn_int32_t extend_trace_file(int fd, qn_uint64_t current_size, qn_uint32_t page_size, qn_uint32_t &size)
{
    lseek(fd, 0, SEEK_END);
    qn_uint64_t free = 0;
    if (!free_bytes(fd, free)) return set_error_int(QN_TR_ERESIZE, 22, errno);
    if (free < smallest_file_bytes)
        size = smallest_file_bytes;
    else if (size > free)
        size = static_cast<qn_uint32_t>(free);

    if (size > current_size) {
        const qn_int32_t status = write_pattern(fd, current_size, page_size, size);
        if (status != 0) return status;
    } else {
        // A larger file is kept as it is; of one beyond what a ring can address, the first 4 GiB less a page.
        size = static_cast<qn_uint32_t>(std::min<qn_uint64_t>(current_size, UINT32_MAX - (page_size - 1)));
    }
    fsync(fd);
    return 0;
}
} // namespace qn::tr
