// The times of records as formats with integer nanoseconds of 64 bits have them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

// Nanoseconds since 1970; nothing for a record without a time, and for times further away than 292 years.
std::optional<std::int64_t> record_ns(const reader::trace_record &record);

// What is wrong with a record: what does not fit in its body, and the exact time when `time_kept` is false, that is
// when the output shows another one or none. Empty for a sound record.
std::string record_problem(const reader::trace_record &record, bool time_kept);

} // namespace qn::dump
