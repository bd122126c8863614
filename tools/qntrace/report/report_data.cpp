#include "tools/qntrace/report/report_data.h"

#include <algorithm>

#include <fmt/format.h>

#include "tools/qntrace/format/body.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/record_names.h"

namespace qn::dump
{
namespace
{

std::optional<std::int64_t> time_of(const reader::trace_record &record)
{
    return record.time ? nanoseconds_of(*record.time) : std::nullopt;
}

// The body as `qntrace dump` prints it.
std::string body_text(const reader::trace_record &record)
{
    std::string text;
    append_body(text, record, {false, charset::utf_8});
    text.pop_back(); // the end of its last line
    if (text.size() <= report_data::longest_text) return text;
    std::size_t end = report_data::longest_text;
    while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;
    text.replace(end, std::string::npos, fmt::format("... [{} bytes more]", text.size() - end));
    return text;
}

} // namespace

report_data::report_data(const std::vector<trace_source> &sources)
    : sources_(sources), marks_(sources.size()), errors_(sources, error_grouping::message)
{
    std::map<std::pair<std::string, std::string>, std::size_t> known;
    for (const trace_source &source : sources) known.emplace(std::pair(source.node(), source.program), 0);
    for (auto &[name, index] : known) {
        index = processes_.size();
        processes_.push_back({name.first, name.second});
    }
    for (const trace_source &source : sources) process_of_source_.push_back(known.at({source.node(), source.program}));
}

void report_data::pass(std::size_t source, const merge_stream &stream)
{
    marks_.pass(source, stream.lost(), time_of(stream.record()));
}

void report_data::finish_file(std::size_t source, const losses &lost)
{
    marks_.finish(source, lost);
    lost_.add(lost);
    ++files_;
}

void report_data::add(std::size_t source, const reader::trace_record &record)
{
    const reader::record_header &header = record.raw.header;
    ++records_;
    bytes_ += header.length;
    const auto *error = std::get_if<reader::error_body>(&record.body);
    if (error != nullptr) errors_.add(event_of(source, record, *error, catalogues_));
    const auto time = time_of(record);
    const std::size_t component = rates_.index_of(component_name(header));
    rates_.add(component, header.length, time);
    if (!time) {
        ++without_time_;
        return;
    }
    first_ns_ = std::min(*time, first_ns_.value_or(*time));
    last_ns_ = std::max(*time, last_ns_.value_or(*time));
    timeline_.add(process_of_source_[source], header.thread, error != nullptr, [&] {
        return timeline_record{*time, static_cast<std::uint32_t>(component),
                               static_cast<std::uint32_t>(record.body.index()), body_text(record)};
    });
}

} // namespace qn::dump
