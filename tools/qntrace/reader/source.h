// Where the bytes of a trace file come from, and the bounded window through which the reader looks at them.
//
// A trace file may be written, cut or removed by others at any time. So nothing is mapped: bytes are copied into the
// window with pread() and only the copy is looked at. A file that shrinks yields fewer bytes, never a signal.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <system_error>
#include <vector>

#include <fcntl.h>
#include <sys/stat.h>

namespace qn::reader
{

// A file that cannot be opened or read; what() is a sentence for the user without the file's name.
class io_error : public std::system_error
{
public:
    io_error(int error, const std::string &what) : std::system_error(error, std::generic_category(), what) {}
};

class byte_source
{
public:
    virtual ~byte_source() = default;
    // Bytes there were when the source was opened.
    virtual std::uint64_t size() const = 0;
    // Copies what there is from `offset` on; fewer bytes than asked for only at the end. Throws io_error.
    virtual std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) = 0;
};

// A regular file, opened read-only. Anything else (a directory, a FIFO, a device) is refused without waiting for it. A
// relative path counts from `folder`, so that files are in reach whose whole path is longer than one may be.
class file_source final : public byte_source
{
public:
    explicit file_source(const std::string &path, int folder = AT_FDCWD);
    ~file_source() override;
    file_source(const file_source &) = delete;
    file_source &operator=(const file_source &) = delete;

    std::uint64_t size() const override { return size_; }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override;
    // What the system says of the file now. Throws io_error.
    struct stat status() const;

private:
    int descriptor_ = -1;
    std::uint64_t size_ = 0;
};

// Bytes in memory that somebody else keeps.
class memory_source final : public byte_source
{
public:
    explicit memory_source(std::span<const std::byte> bytes) : bytes_(bytes) {}
    std::uint64_t size() const override { return bytes_.size(); }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override;

private:
    std::span<const std::byte> bytes_;
};

// A copy of one stretch of a source. It is as long as whoever makes it wants, or as the longest stretch ever asked for.
class window
{
public:
    static constexpr std::size_t window_bytes = 256 * 1024;

    explicit window(byte_source &source, std::size_t usual_bytes = window_bytes)
        : source_(source), usual_bytes_(usual_bytes)
    {
    }

    std::uint64_t source_size() const { return source_.size(); }
    // `count` bytes from `offset` on, fewer only where the source ends. Valid until the next call. Throws io_error, also
    // when there is no memory for that many.
    std::span<const std::byte> fetch(std::uint64_t offset, std::size_t count);
    // Forgets the copy, so that the next fetch() sees the source as it is then.
    void drop() { filled_ = 0; }

private:
    void make_room(std::size_t bytes);

    byte_source &source_;
    std::size_t usual_bytes_;
    std::vector<std::byte> buffer_;
    std::uint64_t start_ = 0;
    std::size_t filled_ = 0;
};

} // namespace qn::reader
