// A program that traces in a process of its own, as much at a time as it is told.
#pragma once

#include <cstdint>
#include <string>

#include <sys/types.h>

namespace qn::test
{

// Its records are those of a writing_program: of the component WRIT, with the values `first`, `first` + 1, ...
class live_writer
{
public:
    // Starts it, and waits until it traces. Without a spool directory it traces to a single file.
    explicit live_writer(const std::string &file, std::uint64_t first = 0, const std::string &spool_directory = "");
    ~live_writer(); // ends it
    live_writer(const live_writer &) = delete;
    live_writer &operator=(const live_writer &) = delete;

    // Comes back when they are written.
    void write(std::uint64_t count);
    // Comes back at once.
    void begin_to_write(std::uint64_t count);
    // Ends tracing and the process, and fails the test when that does not go well.
    void end();
    // SIGKILL.
    void kill();

private:
    void wait_until_done();

    pid_t child_ = -1;
    int channel_ = -1; // numbers of records in one direction, a byte for each of them in the other
};

} // namespace qn::test
