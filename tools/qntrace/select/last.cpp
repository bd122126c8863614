#include "tools/qntrace/select/last.h"

namespace qn::dump
{

void last_records::keep(const reader::trace_record &record)
{
    if (most_ == 0) return;
    if (kept_.size() < most_) {
        assign(kept_.emplace_back(), record);
    } else {
        assign(kept_[oldest_], record);
        oldest_ = (oldest_ + 1) % most_;
    }
}

void last_records::assign(copy &place, const reader::trace_record &record)
{
    const auto bytes = record.raw.bytes.bytes();
    place.raw = record.raw;
    place.bytes.assign(bytes.begin(), bytes.end());
    place.time = record.time;
}

reader::trace_record last_records::copy::restored() const
{
    reader::trace_record record;
    record.raw = raw;
    record.raw.bytes = reader::byte_view(bytes, raw.bytes.order());
    auto decoded = reader::decode(record.raw);
    record.body = std::move(decoded.body);
    record.problem = std::move(decoded.problem);
    record.time = time;
    return record;
}

} // namespace qn::dump
