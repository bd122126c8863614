#include "tools/qntrace/follow/followed_file.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fstream>
#include <sstream>

#include <fmt/format.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

} // namespace

std::optional<bool> followed_file::is_at(const std::string &path) const
{
    struct stat named = {};
    if (stat(path.c_str(), &named) != 0) return std::nullopt;
    const auto mine = file_.status();
    return named.st_dev == mine.st_dev && named.st_ino == mine.st_ino;
}

// A number alone may belong to another process by now.
bool followed_file::is_mapped_by(std::uint32_t pid) const
{
    const auto signalled = static_cast<pid_t>(pid);
    if (signalled <= 0 || (kill(signalled, 0) != 0 && errno == ESRCH)) return false;
    std::ifstream mappings(fmt::format("/proc/{}/maps", pid));
    if (!mappings) return true;
    const auto mine = file_.status().st_ino;
    for (std::string line; std::getline(mappings, line);) {
        // address permissions offset device inode
        std::istringstream fields(line);
        std::string skipped;
        ino_t inode = 0;
        if (fields >> skipped >> skipped >> skipped >> skipped >> inode && inode == mine) return true;
    }
    return false;
}

writer_hold::writer_hold(const std::string &path)
    : descriptor_(open(path.c_str(), O_RDWR | O_CLOEXEC | O_NOCTTY | O_NONBLOCK))
{
    if (descriptor_ < 0) throw reader::io_error(errno, "cannot be opened for writing, which --coordinate needs");
    if (flock(descriptor_, LOCK_EX | LOCK_NB) == 0) return;
    const int error = errno;
    close(descriptor_);
    if (error == EWOULDBLOCK) throw reader::io_error(error, "another qntrace follows with --coordinate");
    throw reader::io_error(error, "cannot be locked, which --coordinate needs");
}

writer_hold::~writer_hold()
{
    if (held_) store(format::seq_lock_none);
    close(descriptor_);
}

// Written again even when it was there before: a writer may have taken it back.
void writer_hold::hold(std::uint32_t seq, reader::byte_order order)
{
    order_ = order;
    held_ = seq;
    store(seq);
}

void writer_hold::store(std::uint32_t value)
{
    std::array<unsigned char, 4> word;
    for (std::size_t i = 0; i < word.size(); ++i) {
        const std::size_t place = order_ == reader::byte_order::little ? i : word.size() - 1 - i;
        word[place] = static_cast<unsigned char>(value >> (8 * i));
    }
    struct stat status = {};
    const bool has_header = fstat(descriptor_, &status) == 0 && status.st_size >= off_t{format::header_bytes};
    if (!has_header || pwrite(descriptor_, word.data(), word.size(), offsetof(trace_file_header_t, uSeqLock)) < 0)
        held_.reset();
}

} // namespace qn::dump
