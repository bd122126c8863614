#include "tools/qntrace/reader/reader.h"

#include <utility>

#include <fmt/format.h>

namespace qn::reader
{

trace_reader::trace_reader(byte_source &source, finding_sink report) : report_(std::move(report)), window_(source)
{
    header_ = read_header(window_, report_);
    if (!header_) return;
    if (header_->time_info.timeinfo1 == 0) {
        report_({finding::severity::damage, offsetof(trace_file_header_t, timeInfo),
                 "the header's time base has 0 ticks a second; the time of the oldest records is not known"});
    }
    time_base_.emplace(header_->time_info);
    walk_.emplace(source, window_, *header_, report_);
}

std::optional<trace_record> trace_reader::next()
{
    if (!walk_) return std::nullopt;
    auto raw = walk_->next();
    if (!raw) return std::nullopt;
    trace_record record;
    record.raw = *raw;
    auto decoded = decode(*raw);
    record.body = std::move(decoded.body);
    record.problem = std::move(decoded.problem);
    if (!record.problem.empty()) {
        report_({finding::severity::damage, raw->offset,
                 fmt::format("{} (sequence number {})", record.problem, raw->header.seq)});
    }
    time_base_->pass(record.body);
    // A filler's header beyond its length, kind and sequence number is what happened to stand there.
    if (!std::holds_alternative<free_body>(record.body)) record.time = time_base_->time_of(raw->header.counter);
    return record;
}

} // namespace qn::reader
