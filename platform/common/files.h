// Reading a small file and holding its descriptor, for both libraries. No state, no lock.
//
// Nothing here is interrupted half-way: a signal makes a call start over, and cancellation waits until a
// no_cancel guard goes (open, read and close would otherwise be places where the thread may end, close in a
// destructor even).
#pragma once

#include <cerrno>
#include <cstddef>
#include <fcntl.h>
#include <span>
#include <unistd.h>

#include "platform/common/descriptors.h"

namespace qn::platform
{
// An open file; closed when it goes out of scope. Used under a no_cancel guard only.
class file
{
public:
    file(const char *path, int flags, mode_t mode = 0)
        : fd_(open_file(path, flags, mode)), error_(fd_ == -1 ? errno : 0)
    {
    }
    file(const file &) = delete;
    file &operator=(const file &) = delete;
    ~file()
    {
        if (fd_ != -1) close(fd_);
    }

    int error() const { return error_; } // errno of the opening, 0 when it is open
    int fd() const { return fd_; }

private:
    int fd_;
    int error_;
};

// Fills `buffer` from the start of a file, up to its end or the buffer's. Returns 0 with *length set, or errno. Waits for
// nobody: a pipe without a writer is empty, one whose writer has written nothing yet gives EAGAIN.
inline int read_file(const char *path, std::span<char> buffer, size_t *length)
{
    const no_cancel whole;
    const file source(path, O_RDONLY | O_NONBLOCK);
    if (source.error() != 0) return source.error();
    size_t have = 0;
    while (have < buffer.size()) {
        const ssize_t got = read(source.fd(), buffer.data() + have, buffer.size() - have);
        if (got == 0) break;
        if (got > 0) {
            have += static_cast<size_t>(got);
        } else if (errno != EINTR) {
            return errno;
        }
    }
    *length = have;
    return 0;
}
} // namespace qn::platform
