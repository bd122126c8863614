#include "tools/qntrace/console/output_file.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include <fcntl.h>
#include <fmt/format.h>
#include <unistd.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t buffer_bytes = 256 * 1024;

} // namespace

output_file::output_file(const std::string &path, std::unique_ptr<packer> packing)
    : path_(path), descriptor_(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666)),
      packer_(std::move(packing))
{
    if (descriptor_ < 0) fail(errno);
    buffer_.reserve(buffer_bytes);
}

output_file::~output_file()
{
    if (descriptor_ >= 0) ::close(descriptor_);
}

void output_file::write(std::string_view data)
{
    if (!buffer_.empty() && buffer_.size() + data.size() > buffer_bytes) {
        write_out(buffer_);
        buffer_.clear();
    }
    if (data.size() > buffer_bytes) {
        for (; !data.empty(); data.remove_prefix(std::min(data.size(), buffer_bytes)))
            write_out(data.substr(0, buffer_bytes));
    } else {
        buffer_ += data;
    }
}

void output_file::close()
{
    write_out(buffer_);
    buffer_.clear();
    if (packer_) {
        const auto last = std::move(packer_);
        packed_.clear();
        last->pack({}, true, packed_);
        write_out(packed_);
    }
    const int descriptor = descriptor_;
    descriptor_ = -1;
    if (::close(descriptor) != 0) fail(errno);
}

void output_file::write_out(std::string_view data)
{
    if (packer_) {
        packed_.clear();
        packer_->pack(data, false, packed_);
        data = packed_;
    }
    while (!data.empty()) {
        const ssize_t written = ::write(descriptor_, data.data(), data.size());
        if (written < 0 && errno != EINTR) fail(errno);
        if (written > 0) data.remove_prefix(static_cast<std::size_t>(written));
    }
}

void output_file::fail(int error) const
{
    throw output_error(fmt::format("{}: cannot be written: {}", printable_name(path_), std::strerror(error)));
}

} // namespace qn::dump
