#include "tools/qntrace/export/compression.h"

#include <array>
#include <new>
#include <stdexcept>

#include <zlib.h>
#include <zstd.h>

namespace qn::dump
{
namespace
{

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

} // namespace

std::unique_ptr<output_file::packer> make_packer(compression packed)
{
    if (packed == compression::gzip) return std::make_unique<gzip_packer>();
    if (packed == compression::zstd) return std::make_unique<zstd_packer>();
    return nullptr;
}

} // namespace qn::dump
