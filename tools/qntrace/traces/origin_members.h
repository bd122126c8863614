// Where a record of several files comes from, as members of its JSON object: all but the name of the file.
#pragma once

#include "tools/qntrace/format/json.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

text_members origin_members(const trace_source &source);

} // namespace qn::dump
