// One run over the records of many files in their order by time, with a line that shows how far it has come.
#pragma once

#include <cstddef>
#include <functional>
#include <vector>

#include "tools/qntrace/traces/clock_offsets.h"
#include "tools/qntrace/traces/merged_traces.h"

namespace qn::dump
{

struct merged_reading {
    const std::vector<trace_source> &sources;
    const clock_offsets &offsets;
    bool utc = false; // times in messages
    // Called behind the last record of each trace file with what is missing from it; may be empty.
    std::function<void(std::size_t source, const losses &)> after_file = {};
};

// Returns the exit status; everything that is wrong was told.
int read_merged(const merged_reading &reading, const merged_traces::record_sink &sink);

} // namespace qn::dump
