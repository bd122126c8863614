// A file that is followed: the bytes that it has now, whatever becomes of its name; and, for a follower that writers are
// to wait for, the word in its header by which they do.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/qntrace/reader/header.h"
#include "tools/qntrace/reader/source.h"

namespace qn::dump
{

class followed_file final : public reader::byte_source
{
public:
    // Throws io_error.
    explicit followed_file(const std::string &path) : file_(path) {}

    std::uint64_t size() const override { return static_cast<std::uint64_t>(file_.status().st_size); }
    std::size_t read_at(std::uint64_t offset, std::span<std::byte> into) override
    {
        return file_.read_at(offset, into);
    }
    // Whether the name stands for this file; nothing when it stands for none.
    std::optional<bool> is_at(const std::string &path) const;
    // Whether the process has the file mapped. When that cannot be seen, whether there is such a process.
    bool is_mapped_by(std::uint32_t pid) const;

private:
    reader::file_source file_;
};

// The right to make the writers of a file wait, which one process at a time has. While it names a record they wait
// before they overwrite it, for at most 2 s; then they take the right to that record back.
//
// The word is written with pwrite(), not into a mapping: a file that is cut meanwhile costs an error, not a signal.
class writer_hold
{
public:
    // Throws io_error.
    explicit writer_hold(const std::string &path);
    ~writer_hold();
    writer_hold(const writer_hold &) = delete;
    writer_hold &operator=(const writer_hold &) = delete;

    // The first record that was not read yet.
    void hold(std::uint32_t seq, reader::byte_order order);

private:
    void store(std::uint32_t value);

    int descriptor_ = -1;
    reader::byte_order order_ = reader::byte_order::little;
    std::optional<std::uint32_t> held_;
};

} // namespace qn::dump
