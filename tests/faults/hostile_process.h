// Another process that has trace files mapped and stores into them whatever it likes.
#pragma once

#include <string>
#include <vector>

#include <sys/types.h>

namespace qn::test
{
enum class hostility {
    header_words,   // any word of the header gets random and edge values
    held_records,   // the next record to be overwritten is held, and the writers are asked to wait
    record_headers, // lengths, kinds and sequence numbers in the ring
    everything
};

// At it from its construction to its destruction, as fast as it can, also on files that come into being meanwhile.
class hostile_process
{
public:
    hostile_process(const std::vector<std::string> &files, hostility how);
    hostile_process(const hostile_process &) = delete;
    hostile_process &operator=(const hostile_process &) = delete;
    ~hostile_process();

private:
    pid_t process_;
};
} // namespace qn::test
