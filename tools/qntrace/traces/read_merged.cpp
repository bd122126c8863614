#include "tools/qntrace/traces/read_merged.h"

#include <utility>

#include "tools/qntrace/console/progress.h"

namespace qn::dump
{

int read_merged(const merged_reading &reading, const merged_traces::record_sink &sink)
{
    std::uint64_t total_bytes = 0;
    for (const trace_source &source : reading.sources) total_bytes += source.bytes;
    progress_line progress(total_bytes);
    merge_settings settings;
    settings.clock_offset = [&reading](const trace_source &source) { return reading.offsets.of(source); };
    settings.before_message = [&progress] { progress.clear(); };
    settings.after_file = reading.after_file;
    settings.utc = reading.utc;
    merged_traces traces(reading.sources, std::move(settings));

    std::uint64_t records = 0;
    return traces.run([&](std::size_t source, const merge_stream &stream) {
        progress.show(++records, traces.bytes_done());
        sink(source, stream);
    });
}

} // namespace qn::dump
