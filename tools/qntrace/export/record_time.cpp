#include "tools/qntrace/export/record_time.h"

#include <fmt/format.h>

#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::dump
{

std::optional<std::int64_t> record_ns(const reader::trace_record &record)
{
    return record.time ? nanoseconds_of(*record.time) : std::nullopt;
}

std::string record_problem(const reader::trace_record &record, bool time_kept)
{
    std::string problem = record.problem;
    if (time_kept) return problem;
    if (!problem.empty()) problem += "; ";
    if (record.time)
        problem += fmt::format("the record's time is {} ns since 1970", nanoseconds_text(*record.time));
    else
        problem += fmt::format("the record's time is not known, its counter is {}", record.raw.header.counter);
    return problem;
}

} // namespace qn::dump
