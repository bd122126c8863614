#include "reader/select_reading.h"

#include "tools/qntrace/select/where.h"

namespace qn::test
{

seqs seqs_if(const trace_builder &file, const predicate &passes)
{
    reader::memory_source source(file.bytes());
    reader::trace_reader trace(source, [](const reader::finding &) {});
    const dump::trace_origin origin{"dir/test.trc", trace.header().value()};
    seqs result;
    while (const auto record = trace.next()) {
        if (passes(origin, *record)) result.push_back(record->raw.header.seq);
    }
    return result;
}

seqs seqs_selected(const trace_builder &file, const dump::selection &selected)
{
    return seqs_if(file, [&](const auto &origin, const auto &record) { return selected.admits(origin, record); });
}

seqs seqs_where(const trace_builder &file, std::string_view expression)
{
    const dump::where_expression where(expression, test_now);
    return seqs_if(file, [&](const auto &origin, const auto &record) { return where.holds(origin, record); });
}

} // namespace qn::test
