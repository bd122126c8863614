// Which files hold the same life of a ring: the records since its start, or since its page was last taken over.
#pragma once

#include <string>
#include <vector>

#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

// Whether the file has the header of a trace file, or what is left of one, or that of a newer format. Throws io_error.
bool is_meant_as_trace_file(const std::string &path);

// Reads the header and the first record; findings are left to who reads the file. Throws io_error.
void look_at(trace_source &source);

// Keeps one file of each life, see trace_set.h. Files without any record are kept.
void drop_duplicates(std::vector<trace_source> &sources);

} // namespace qn::dump
