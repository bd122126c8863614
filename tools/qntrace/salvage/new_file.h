// A file that is there complete or not at all: it is written beside its place under another name, and takes its place
// when it is done.
#pragma once

#include <cstdio>
#include <memory>
#include <string>

#include <sys/types.h>

namespace qn::dump
{

class new_file
{
public:
    // Throws output_error, also when the file is there already and may not be replaced.
    new_file(std::string path, mode_t mode, bool may_replace);
    ~new_file();
    new_file(const new_file &) = delete;
    new_file &operator=(const new_file &) = delete;

    std::FILE *stream() { return stream_.get(); }
    // Puts what was written in its place. Throws output_error, also for what could not be written before.
    void put_in_place();

private:
    [[noreturn]] void fail(const char *what) const;

    struct closer {
        void operator()(std::FILE *stream) const { std::fclose(stream); }
    };

    std::string path_;
    std::string temporary_; // empty once there is no file of that name
    bool may_replace_;
    std::unique_ptr<std::FILE, closer> stream_;
};

} // namespace qn::dump
