// Many files read at the same time, with fewer descriptors than files.
//
// A file is opened when it is read, and of those that are open the one that was not read for the longest time is closed
// when there are too many. One that was closed is opened again by its name, and has to be the same file then.
#pragma once

#include <list>
#include <memory>
#include <string>

#include <sys/types.h>

#include "tools/qntrace/reader/source.h"

namespace qn::dump
{

class pooled_file;

class file_pool
{
public:
    explicit file_pool(std::size_t most_open) : most_open_(most_open) {}
    file_pool(const file_pool &) = delete;
    file_pool &operator=(const file_pool &) = delete;

    // As many as half of the descriptors that the process may have.
    static std::size_t usual_most_open();

private:
    friend class pooled_file;
    void touch(pooled_file &file); // opens it, or makes it the last to be closed
    void forget(pooled_file &file);

    std::size_t most_open_;
    std::list<pooled_file *> open_; // the one to be closed next comes first
};

class pooled_file final : public reader::byte_source
{
public:
    // Opens the file. The pool must outlive it.
    pooled_file(file_pool &pool, std::string path);
    ~pooled_file() override { pool_.forget(*this); }
    pooled_file(const pooled_file &) = delete;
    pooled_file &operator=(const pooled_file &) = delete;

    std::uint64_t size() const override { return size_; }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override;

private:
    friend class file_pool;
    void open();

    file_pool &pool_;
    std::string path_;
    std::uint64_t size_ = 0;
    dev_t device_ = 0;
    ino_t inode_ = 0;
    std::unique_ptr<reader::file_source> file_; // while it is open
    std::list<pooled_file *>::iterator place_;  // in the pool, while it is open
};

} // namespace qn::dump
