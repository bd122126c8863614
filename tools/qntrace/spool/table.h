// What the spool directories hold of each trace: a row for a node, a program and a trace of it.
#pragma once

#include <cstdint>
#include <ctime>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/qntrace/spool/tree.h"

namespace qn::dump
{

struct spool_row {
    std::uint64_t page_copies = 0;
    std::uint64_t file_copies = 0; // of whole trace files
    std::uint64_t damaged = 0;     // of all these
    std::uint64_t unreadable = 0;  // of all these
    std::uint64_t bytes = 0;
    std::optional<timespec> first; // record of the sound parts
    std::optional<timespec> last;

    void saw(const timespec &time);
};

class spool_table
{
public:
    // The row that a copy belongs to.
    spool_row &row_of(const spooled_copy &copy);
    bool empty() const { return rows_.empty(); }

    // Both end with a newline unless there are no rows: columns for people, and a JSON object a row.
    std::string text(bool utc) const;
    std::string json(bool utc) const;

private:
    // The names of the folders that tell the node and the program, and the trace.
    using key = std::pair<std::vector<std::string>, std::string>;
    std::map<key, spool_row> rows_;
};

} // namespace qn::dump
