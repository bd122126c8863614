// Trace files for the tests of what reads many of them: built byte by byte, or written by a program in a process of its
// own.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "reader/program.h"
#include "reader/trace_builder.h"

namespace qn::test
{

using strings = std::vector<std::string>;

// Records with the ids given, a millisecond apart, the first one `ms` milliseconds after 05:12:00.
trace_builder ids_from(std::uint64_t ms, const std::vector<std::uint32_t> &ids, std::uint64_t node_id = 0xABCD);

// The objects of a sound run of `qntrace COMMAND --json --utc ARGUMENTS`; fails the test when it is not sound.
std::vector<nlohmann::json> sound_objects(const std::string &command, const strings &arguments);
// The ids of the records that `qntrace merge` prints, in its order.
std::vector<std::uint32_t> merged_ids(const strings &arguments);
std::vector<std::uint32_t> ids_in(const outcome &merged);
// One member of each.
strings texts_of(const std::vector<nlohmann::json> &objects, const std::string &member);

// A program that traces `count` records of the component WRIT with the values `first`, `first` + 1, ... and ends when
// every full page was copied. Page sets have 8 pages of 256 KiB, with room for about 6000 records each.
class writing_program
{
public:
    // Starts it. Without a spool directory it traces to a single file.
    writing_program(const std::string &file, const std::string &spool_directory, std::uint64_t first,
                    std::uint64_t count);
    ~writing_program(); // waits for its end, and fails the test when it did not go well
    writing_program(const writing_program &) = delete;
    writing_program &operator=(const writing_program &) = delete;

private:
    pid_t child_ = -1;
};

// The values of the records of such programs, in the order in which they were printed.
std::vector<std::uint64_t> written_values(const std::vector<nlohmann::json> &objects);

} // namespace qn::test
