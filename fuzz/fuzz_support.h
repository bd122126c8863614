// What the fuzz targets share: reading an input as a specification, a few components to apply it to, and a way to fail
// loudly. Each target is one function, LLVMFuzzerTestOneInput; the tests run it over its seed corpus too.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>

#include "components/outcome.h"
#include "components/twin.h"
#include "trace/trace.h"

namespace qn::fuzz
{
// The input up to its first NUL. Empty and `ok` false when its patterns would keep the regular expression engine busy
// for longer than a fuzz run can wait: repetitions of repetitions copy their operand, so their cost multiplies.
struct input {
    std::string text;
    bool ok = false;
};

input read_input(const uint8_t *data, size_t size);

// Ends the run with the input at hand when something is not as it should be.
void require(bool holds, const char *what, const std::string &text);

// The status of a parse that was made behind cu_set_no_error_1(), beside its error record.
void require_outcome(int status, int code, int offset, const std::string &text);

// The components that specifications are applied to, registered once.
std::array<test::twin *, 3> components();

// Frees every trace file's anchor but the default one and takes the tokens back, so that a run does not fill the memory.
void forget_trace_files();
} // namespace qn::fuzz
