// A file that a command writes beside its output.
#pragma once

#include <cstdio>
#include <memory>
#include <string>
#include <string_view>

namespace qn::dump
{

// Written under another name in the same folder, and given its own when it is complete: until then the file that had
// the name is as it was, and goes on being so when the command does not come to its end. What is there and no regular
// file (a link like /dev/stdout, a pipe, a terminal) is written as it is.
class output_file
{
public:
    // Throws output_error, as write() and finish() do.
    explicit output_file(const std::string &path);
    ~output_file(); // takes away what is not complete
    output_file(const output_file &) = delete;
    output_file &operator=(const output_file &) = delete;

    void write(std::string_view text);
    void finish();

private:
    [[noreturn]] void fail() const;

    struct close_file {
        void operator()(std::FILE *file) const { std::fclose(file); }
    };

    std::string path_;
    std::string written_path_; // the same for what is no regular file
    std::unique_ptr<std::FILE, close_file> file_;
};

} // namespace qn::dump
