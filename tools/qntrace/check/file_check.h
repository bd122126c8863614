// One trace file, verified: its header, the tiling of its ring, and its records with their order.
//
// What is damage and what is not:
//
//   damage   what no writer leaves behind, wherever it is killed: the file was changed, cut or torn afterwards
//   loss     records that were not completed, or are missing between others, and pages that were overwritten before
//            they were copied: the file is as it was written, and tells what is not in it
//   note     what is worth knowing: a clock that steps back, a reader that asks the writers to wait
//
// Only damage makes a file unsound.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <vector>

#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{

// A finding, and the sequence number of the last numbered record before it.
struct placed_finding {
    reader::finding what;
    std::optional<std::uint32_t> behind;
};

struct file_check {
    static constexpr std::size_t most_findings = 100;

    bool readable = false;     // it has the header of a trace file
    std::uint64_t damages = 0; // findings that are damage
    std::uint64_t records = 0; // sound ones
    std::optional<timespec> first_time;
    std::optional<timespec> last_time;
    std::uint64_t ring_bytes = 0;
    std::uint64_t unreadable_bytes = 0; // of these
    losses lost;
    std::vector<placed_finding> findings; // the first of them
    std::uint64_t more_findings = 0;

    bool sound() const { return damages == 0; }
};

// Throws io_error.
file_check check_file(reader::byte_source &source);

} // namespace qn::dump
