// What the fuzz targets of the library share: a few components to apply a specification to, and its outcome.
#pragma once

#include <array>
#include <string>

#include "components/outcome.h"
#include "components/twin.h"
#include "fuzz/fuzz_input.h"
#include "trace/trace.h"

namespace qn::fuzz
{
// The status of a parse that was made behind cu_set_no_error_1(), beside its error record.
void require_outcome(int status, int code, int offset, const std::string &text);

// The components that specifications are applied to, registered once.
std::array<test::twin *, 3> components();

// Frees every trace file's anchor but the default one and takes the tokens back, so that a run does not fill the memory.
void forget_trace_files();
} // namespace qn::fuzz
