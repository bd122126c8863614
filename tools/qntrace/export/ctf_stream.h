// One stream of a CTF trace: a file of packets, in the order of time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tools/qntrace/console/output_file.h"

namespace qn::dump
{

class ctf_stream
{
public:
    // The first event is at `ns` or later.
    ctf_stream(const std::string &path, std::uint64_t ns) : file_(path), newest_(ns) {}

    // Time of the last event.
    std::uint64_t newest() const { return newest_; }

    // Records that are missing before the next event.
    void discard(std::uint64_t records);
    // Adds an event that is not earlier than the last one. `file` tells where its packet comes from.
    void add(std::uint64_t ns, std::string_view event, std::string_view file);
    // The next event is of another file.
    void end_packet();
    // The end of a source; `discarded` without an event behind them have a packet of their own.
    void end_source(std::string_view file);
    void close() { file_.close(); }

private:
    void write_packet(std::string_view file);

    output_file file_;
    std::uint64_t newest_;
    std::string packet_; // the events of the packet that is being filled
    std::string packet_file_;
    std::uint64_t packet_begin_ = 0;
    std::uint64_t packets_ = 0;
    std::uint64_t discarded_ = 0;         // up to and in the packet that is being filled
    std::uint64_t written_discarded_ = 0; // as the packets written so far tell
};

} // namespace qn::dump
