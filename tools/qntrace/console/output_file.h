// Files that the command makes: written from their beginning to their end, through a buffer, packed when that is asked
// for.
#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace qn::dump
{

// Whatever fails is thrown as an output_error that names the file.
class output_file
{
public:
    // Packs what it is given.
    class packer
    {
    public:
        virtual ~packer() = default;
        // Appends what there is to be written to `out`.
        virtual void pack(std::string_view data, bool is_last, std::string &out) = 0;
    };

    // Makes the file, or empties it.
    explicit output_file(const std::string &path, std::unique_ptr<packer> packing = nullptr);
    // Without close() the file is not complete.
    ~output_file();
    output_file(const output_file &) = delete;
    output_file &operator=(const output_file &) = delete;

    void write(std::string_view data);
    void close();

private:
    void write_out(std::string_view data);
    [[noreturn]] void fail(int error) const;

    std::string path_;
    int descriptor_ = -1;
    std::string buffer_;
    std::unique_ptr<packer> packer_; // or none
    std::string packed_;
};

} // namespace qn::dump
