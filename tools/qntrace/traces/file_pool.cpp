#include "tools/qntrace/traces/file_pool.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include <sys/resource.h>
#include <sys/stat.h>

namespace qn::dump
{

std::size_t file_pool::usual_most_open()
{
    rlimit limit = {};
    constexpr rlim_t enough = 4096;
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return 1;
    return std::clamp<rlim_t>(limit.rlim_cur / 2, 1, enough);
}

void file_pool::touch(pooled_file &file)
{
    if (file.file_) {
        open_.splice(open_.end(), open_, file.place_);
        return;
    }
    while (open_.size() >= most_open_) forget(*open_.front());
    file.open();
    file.place_ = open_.insert(open_.end(), &file);
}

void file_pool::forget(pooled_file &file)
{
    if (!file.file_) return;
    file.file_.reset();
    open_.erase(file.place_);
}

pooled_file::pooled_file(file_pool &pool, std::string path) : pool_(pool), path_(std::move(path))
{
    pool_.touch(*this);
    size_ = file_->size();
}

std::size_t pooled_file::read_at(std::uint64_t offset, std::span<std::byte> into)
{
    pool_.touch(*this);
    return file_->read_at(offset, into);
}

void pooled_file::open()
{
    auto file = std::make_unique<reader::file_source>(path_);
    struct stat status = {};
    if (stat(path_.c_str(), &status) != 0) throw reader::io_error(errno, "cannot be examined");
    const bool opened_before = inode_ != 0;
    if (opened_before && (status.st_dev != device_ || status.st_ino != inode_))
        throw reader::io_error(ESTALE, "was replaced while it was read");
    device_ = status.st_dev;
    inode_ = status.st_ino;
    file_ = std::move(file);
}

} // namespace qn::dump
