#include "tools/qntrace/export/output_file.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <new>
#include <stdexcept>

#include <fcntl.h>
#include <fmt/format.h>
#include <unistd.h>
#include <zlib.h>
#include <zstd.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t buffer_bytes = 256 * 1024;

class gzip_packer final : public output_file::packer
{
public:
    gzip_packer()
    {
        constexpr int largest_window = 15;
        constexpr int as_gzip = 16;
        constexpr int usual_memory = 8;
        if (deflateInit2(&stream_, Z_DEFAULT_COMPRESSION, Z_DEFLATED, largest_window + as_gzip, usual_memory,
                         Z_DEFAULT_STRATEGY) != Z_OK) {
            throw std::bad_alloc();
        }
    }
    ~gzip_packer() override { deflateEnd(&stream_); }

    void pack(std::string_view data, bool is_last, std::string &out) override
    {
        stream_.next_in = reinterpret_cast<Bytef *>(const_cast<char *>(data.data())); // only read
        stream_.avail_in = static_cast<uInt>(data.size());
        do {
            stream_.next_out = room_.data();
            stream_.avail_out = static_cast<uInt>(room_.size());
            deflate(&stream_, is_last ? Z_FINISH : Z_NO_FLUSH);
            out.append(reinterpret_cast<const char *>(room_.data()), room_.size() - stream_.avail_out);
        } while (stream_.avail_out == 0);
    }

private:
    z_stream stream_ = {};
    std::array<Bytef, 64 * 1024> room_ = {};
};

class zstd_packer final : public output_file::packer
{
public:
    zstd_packer() : context_(ZSTD_createCCtx())
    {
        if (!context_) throw std::bad_alloc();
    }

    void pack(std::string_view data, bool is_last, std::string &out) override
    {
        ZSTD_inBuffer in = {data.data(), data.size(), 0};
        for (bool done = false; !done;) {
            ZSTD_outBuffer packed = {room_.data(), room_.size(), 0};
            const std::size_t left =
                ZSTD_compressStream2(context_.get(), &packed, &in, is_last ? ZSTD_e_end : ZSTD_e_continue);
            if (ZSTD_isError(left) != 0) throw std::runtime_error(ZSTD_getErrorName(left));
            out.append(room_.data(), packed.pos);
            done = is_last ? left == 0 : in.pos == in.size;
        }
    }

private:
    struct release {
        void operator()(ZSTD_CCtx *context) const { ZSTD_freeCCtx(context); }
    };
    std::unique_ptr<ZSTD_CCtx, release> context_;
    std::array<char, 64 * 1024> room_ = {};
};

std::unique_ptr<output_file::packer> make_packer(compression packed)
{
    if (packed == compression::gzip) return std::make_unique<gzip_packer>();
    if (packed == compression::zstd) return std::make_unique<zstd_packer>();
    return nullptr;
}

} // namespace

output_file::output_file(const std::string &path, compression packed)
    : path_(path), descriptor_(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666)),
      packer_(make_packer(packed))
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
