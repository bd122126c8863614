// Where a record of several files comes from, as members of its JSON object.
#pragma once

#include "tools/qntrace/format/json.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

// Cluster, node, program and trace; without what is not known.
text_members origin_members(const trace_source &source);

// With the trace file behind them. It is called "path": "file" is what an error record calls the source file that it is
// about.
text_members origin_with_path(const trace_source &source);

} // namespace qn::dump
