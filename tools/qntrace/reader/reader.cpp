#include "tools/qntrace/reader/reader.h"

#include <utility>

#include <fmt/format.h>

namespace qn::reader
{
namespace
{

using qn::tr::format::kind;

// Whether a record concerns nobody but those who want to see its body.
bool is_ordinary(const record_header &header)
{
    switch (static_cast<kind>(header.function)) {
    case kind::identifier:
    case kind::page_note:
    case kind::data_blocks:
    case kind::values_32:
    case kind::values_64:
    case kind::error:
    case kind::strings: return true;
    default: return false;
    }
}

} // namespace

trace_reader::trace_reader(byte_source &source, finding_sink report, std::size_t window_bytes)
    : report_(std::move(report)), window_(source, window_bytes)
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
    auto decoded = decode_and_report(*raw);
    record.body = std::move(decoded.body);
    record.problem = std::move(decoded.problem);
    record.time = time_of(raw->header);
    return record;
}

std::optional<undecoded_record> trace_reader::next_undecoded()
{
    if (!walk_) return std::nullopt;
    const auto raw = walk_->next(extent::id);
    if (!raw) return std::nullopt;
    if (raw->oversized || !is_ordinary(raw->header)) decode_and_report(*raw);
    return undecoded_record{*raw, time_of(raw->header)};
}

std::uint64_t trace_reader::unreadable_bytes() const
{
    if (!header_) return 0;
    const std::uint64_t cut_off = header_->file_size > header_->ring.end ? header_->file_size - header_->ring.end : 0;
    return cut_off + walk_->unreadable_bytes();
}

decoded_record trace_reader::decode_and_report(const raw_record &raw)
{
    auto decoded = decode(raw);
    if (!decoded.problem.empty()) {
        const bool unfinished = std::holds_alternative<unfinished_body>(decoded.body);
        report_({unfinished ? finding::severity::loss : finding::severity::damage, raw.offset,
                 fmt::format("{} (sequence number {})", decoded.problem, raw.header.seq), raw.header.seq});
    }
    time_base_->pass(decoded.body);
    return decoded;
}

// A filler's header beyond its length, kind and sequence number is what happened to stand there.
std::optional<timespec> trace_reader::time_of(const record_header &header) const
{
    if (header.function == static_cast<std::uint16_t>(kind::free_space)) return std::nullopt;
    return time_base_->time_of(header.counter);
}

} // namespace qn::reader
