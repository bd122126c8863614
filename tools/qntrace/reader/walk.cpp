#include "tools/qntrace/reader/walk.h"

#include <algorithm>
#include <utility>

#include <fmt/format.h>

namespace qn::reader
{
namespace
{

namespace format = qn::tr::format;

constexpr auto free_function = static_cast<std::uint16_t>(format::kind::free_space);
constexpr auto unfinished_function = static_cast<std::uint16_t>(format::kind::being_written);

bool has_body(const record_header &header)
{
    return header.function != free_function && header.function != unfinished_function;
}

bool begins_with_id(const record_header &header)
{
    switch (static_cast<format::kind>(header.function)) {
    case format::kind::identifier:
    case format::kind::data_blocks:
    case format::kind::values_32:
    case format::kind::values_64:
    case format::kind::error:
    case format::kind::strings: return true;
    default: return false;
    }
}

} // namespace

record_header parse_record_header(const byte_view &view)
{
    record_header header;
    header.length = view.u32(offsetof(trace_record_header_t, length));
    header.function = view.u16(offsetof(trace_record_header_t, function));
    header.reserved = view.u16(offsetof(trace_record_header_t, reserved));
    header.seq = view.u32(offsetof(trace_record_header_t, seqNumber));
    const auto component = view.chars(offsetof(trace_record_header_t, compId), header.component.size());
    std::copy(component.begin(), component.end(), header.component.begin());
    header.thread = view.u32(offsetof(trace_record_header_t, threadId));
    header.counter = view.u64(offsetof(trace_record_header_t, timeStamp));
    return header;
}

bool is_numbered(const record_header &header)
{
    return header.function != free_function || (header.seq != format::seq_filler && header.seq != 0);
}

bool carries_data(const raw_record &record) { return has_body(record.header); }

bool later(std::uint32_t seq, std::uint32_t than) { return static_cast<std::int32_t>(seq - than) > 0; }

ring_walk::ring_walk(byte_source &source, window &file, const file_header &header, finding_sink report)
    : source_(source), file_(file), header_(header), report_(std::move(report))
{
    if (header_.ring.oldest) {
        at_ = stop_ = *header_.ring.oldest;
    } else {
        start_without_oldest();
    }
}

std::optional<raw_record> ring_walk::next(extent wanted)
{
    while (leg_ != leg::done) {
        const std::uint64_t offset = at_;
        auto [header, problem] = look_at(offset);
        if (problem.empty() && leg_ == leg::second && offset + header.length > stop_) {
            problem = fmt::format("this record of {} bytes overlaps the oldest record at {}", header.length, stop_);
        }
        std::optional<raw_record> record;
        if (problem.empty()) {
            record = take(offset, header, wanted);
            if (!record) problem = "this record changed while it was read";
        }
        if (!problem.empty()) {
            derail(offset, problem);
            continue;
        }
        // Overtaken by the writer: what follows is older than what was handed out, unless the walk catches up.
        if (goes_back(record->header) && catch_up()) continue;
        advance(offset, header.length);
        if (record->oversized) unreadable_bytes_ += header.length;
        if (already_delivered(record->header)) continue;
        check_order(offset, record->header);
        return record;
    }
    return std::nullopt;
}

// The record header at `offset`, and whether the walk may step over the record.
ring_walk::tile ring_walk::look_at(std::uint64_t offset)
{
    const std::uint64_t room = header_.ring.end - offset;
    if (room < format::record_header_bytes) {
        return {{}, fmt::format("the {} bytes before the end of the ring are too few for a record", room)};
    }
    const auto parse_here = [&]() -> std::optional<record_header> {
        const auto bytes = file_.fetch(offset, format::record_header_bytes);
        if (bytes.size() < format::record_header_bytes) return std::nullopt;
        return parse_record_header(byte_view(bytes, header_.order));
    };
    auto header = parse_here();
    if (header && header->function == unfinished_function && rereads_left_ > 0) {
        // Its writer may have finished it since the window was filled.
        --rereads_left_;
        file_.drop();
        header = parse_here();
    }
    if (!header) return {{}, "the file ends inside this record's header"};

    tile result{*header, {}};
    if (header->length < format::record_header_bytes) {
        result.problem = fmt::format("record length {} is less than a record header", header->length);
    } else if (header->length % 4 != 0) {
        result.problem = fmt::format("record length {} is not a multiple of 4", header->length);
    } else if (header->length > room) {
        result.problem =
            fmt::format("record length {} reaches past the end of the ring at {}", header->length, header_.ring.end);
    }
    return result;
}

// The record's bytes, copied at one moment; nothing when they are no longer those of `header`.
std::optional<raw_record> ring_walk::take(std::uint64_t offset, const record_header &header, extent wanted)
{
    // A writer gives no record more than half the ring, and up to 28 bytes that it would not use otherwise.
    const std::uint64_t longest = (header_.ring.end - header_.ring.begin) / 2 + format::record_header_bytes;
    raw_record record;
    record.offset = offset;
    record.oversized = has_body(header) && header.length > longest;
    const bool whole = has_body(header) && !record.oversized;
    std::size_t needed = whole ? header.length : format::record_header_bytes;
    if (wanted == extent::id && begins_with_id(header))
        needed = std::min(needed, format::record_header_bytes + sizeof(std::uint32_t));
    const auto bytes = file_.fetch(offset, needed);
    if (bytes.size() < needed) return std::nullopt;
    record.bytes = byte_view(bytes, header_.order);
    record.header = parse_record_header(record.bytes);
    if (record.header.length != header.length || record.header.function != header.function) return std::nullopt;
    return record;
}

void ring_walk::advance(std::uint64_t offset, std::uint32_t length)
{
    ++tiles_;
    at_ = offset + length;
    if (leg_ == leg::first && at_ == header_.ring.end) {
        leg_ = leg::second;
        at_ = header_.ring.begin;
    }
    if (leg_ == leg::second && at_ >= stop_) leg_ = leg::done;
}

void ring_walk::derail(std::uint64_t offset, const std::string &problem)
{
    if (catch_up()) return;
    if (last_damage_ != offset) report_({finding::severity::damage, offset, problem});
    last_damage_ = offset;
    if (leg_ == leg::second) {
        unreadable_bytes_ += stop_ - offset;
        leg_ = leg::done;
    } else if (tiles_ == 0 && !surveyed_) {
        start_without_oldest();
    } else {
        unreadable_bytes_ += header_.ring.end - offset;
        leg_ = leg::second;
        at_ = header_.ring.begin;
        if (at_ >= stop_) leg_ = leg::done;
    }
}

// Starts anew at the oldest record of a file that was written to meanwhile.
bool ring_walk::catch_up()
{
    if (catch_ups_left_ == 0) return false;
    const auto oldest = reread_oldest(source_, header_);
    if (!oldest || *oldest == stop_ || *oldest == header_.ring.oldest) return false;
    --catch_ups_left_;
    report_({finding::severity::note, *oldest,
             "the file was written to while it was read; the walk goes on at the record that is now the oldest"});
    file_.drop();
    leg_ = leg::first;
    at_ = stop_ = *oldest;
    tiles_ = 0;
    unreadable_bytes_ = 0;
    delivered_through_ = last_seq_;
    return true;
}

void ring_walk::start_without_oldest()
{
    surveyed_ = true;
    const auto oldest = survey();
    leg_ = oldest ? leg::first : leg::second;
    at_ = oldest.value_or(header_.ring.begin);
    stop_ = oldest.value_or(header_.ring.end);
    tiles_ = 0;
}

// The offset behind the newest record, found by stepping through the whole ring; nothing when that is not possible.
std::optional<std::uint64_t> ring_walk::survey()
{
    std::uint64_t oldest = header_.ring.begin;
    std::optional<std::uint32_t> newest_seq;
    for (std::uint64_t at = header_.ring.begin; at < header_.ring.end;) {
        const auto [header, problem] = look_at(at);
        if (!problem.empty()) return std::nullopt;
        at += header.length;
        if (header.seq % 2 != 0) continue;
        if (newest_seq && !later(header.seq, *newest_seq)) continue;
        newest_seq = header.seq;
        oldest = at < header_.ring.end ? at : header_.ring.begin;
    }
    return oldest;
}

bool ring_walk::already_delivered(const record_header &header)
{
    if (!delivered_through_) return false;
    if (header.seq % 2 == 0 && later(header.seq, *delivered_through_)) {
        delivered_through_.reset();
        return false;
    }
    return true;
}

bool ring_walk::goes_back(const record_header &header) const
{
    const bool counted = is_numbered(header) && header.seq % 2 == 0;
    return counted && !delivered_through_ && last_seq_ && !later(header.seq, *last_seq_);
}

void ring_walk::check_order(std::uint64_t offset, const record_header &header)
{
    if (!is_numbered(header)) return;
    // A writer that died while it took the oldest record's space has left its own number there, the newest of all.
    if (tiles_ == 1 && header.function == unfinished_function) return;
    if (header.seq % 2 != 0) {
        report_({finding::severity::damage, offset,
                 fmt::format("sequence number {} is odd, which no record's is", header.seq), header.seq});
        return;
    }
    if (goes_back(header)) {
        report_({finding::severity::damage, offset,
                 fmt::format("sequence number {} follows {}", header.seq, *last_seq_), header.seq});
    }
    last_seq_ = header.seq;
}

} // namespace qn::reader
