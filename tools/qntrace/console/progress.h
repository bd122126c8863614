// How far a long run has come, on a line of a terminal's standard error that is written over and over.
#pragma once

#include <chrono>
#include <cstdint>

namespace qn::dump
{

class progress_line
{
public:
    // Shows nothing unless standard error is a terminal, and standard output another file when there goes the data.
    explicit progress_line(std::uint64_t total_bytes, bool data_to_stdout = true);
    ~progress_line() { clear(); }
    progress_line(const progress_line &) = delete;
    progress_line &operator=(const progress_line &) = delete;

    // Called with every record; now and then it is shown.
    void show(std::uint64_t records, std::uint64_t bytes_done);
    // Makes room for a message.
    void clear();

private:
    std::uint64_t total_bytes_;
    bool enabled_;
    bool shown_ = false;
    std::chrono::steady_clock::time_point due_;
};

} // namespace qn::dump
