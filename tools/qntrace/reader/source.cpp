#include "tools/qntrace/reader/source.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <new>

#include <fmt/format.h>
#include <unistd.h>

namespace qn::reader
{

file_source::file_source(const std::string &path, int folder)
{
    // O_NONBLOCK: opening a FIFO must not wait for its writer; on a regular file it means nothing.
    descriptor_ = openat(folder, path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK);
    if (descriptor_ < 0) throw io_error(errno, "cannot be opened");
    struct stat status = {};
    const bool known = fstat(descriptor_, &status) == 0;
    if (known && S_ISREG(status.st_mode)) {
        size_ = static_cast<std::uint64_t>(status.st_size);
        return;
    }
    const int error = known ? (S_ISDIR(status.st_mode) ? EISDIR : EINVAL) : errno;
    close(descriptor_);
    throw io_error(error, known ? "is not a regular file" : "cannot be examined");
}

struct stat file_source::status() const
{
    struct stat status = {};
    if (fstat(descriptor_, &status) != 0) throw io_error(errno, "cannot be examined");
    return status;
}

file_source::~file_source() { close(descriptor_); }

std::size_t file_source::read_at(std::uint64_t offset, std::span<std::byte> into)
{
    std::size_t done = 0;
    while (done < into.size()) {
        const ssize_t count =
            pread(descriptor_, into.data() + done, into.size() - done, static_cast<off_t>(offset + done));
        if (count < 0) {
            if (errno == EINTR) continue;
            throw io_error(errno, "cannot be read");
        }
        if (count == 0) break;
        done += static_cast<std::size_t>(count);
    }
    return done;
}

std::size_t memory_source::read_at(std::uint64_t offset, std::span<std::byte> into)
{
    if (offset >= bytes_.size()) return 0;
    const std::size_t count = std::min<std::uint64_t>(into.size(), bytes_.size() - offset);
    if (count != 0) std::memcpy(into.data(), bytes_.data() + offset, count);
    return count;
}

std::span<const std::byte> window::fetch(std::uint64_t offset, std::size_t count)
{
    const bool inside = offset >= start_ && offset - start_ <= filled_ && count <= filled_ - (offset - start_);
    if (!inside) {
        filled_ = 0; // read_at() may throw and leave the buffer half written
        const std::size_t usual = std::min<std::uint64_t>(usual_bytes_, source_.size());
        make_room(std::max(usual, count));
        filled_ = source_.read_at(offset, buffer_);
        start_ = offset;
    }
    const std::size_t skipped = static_cast<std::size_t>(offset - start_);
    return std::span<const std::byte>(buffer_).subspan(skipped, std::min(count, filled_ - skipped));
}

// What was in the buffer is not kept, so that there are not two of them at a time.
void window::make_room(std::size_t bytes)
{
    if (bytes <= buffer_.size()) return;
    std::vector<std::byte>().swap(buffer_);
    try {
        buffer_.resize(bytes);
    } catch (const std::bad_alloc &) {
        throw io_error(ENOMEM, fmt::format("{} bytes cannot be read at once", bytes));
    }
}

} // namespace qn::reader
