#include "tools/qntrace/follow/ring_follower.h"

#include <algorithm>
#include <utility>

#include <fmt/format.h>

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

// Right in front of the writer a copy is small, so that it is made before he comes there; farther from him it grows.
constexpr std::size_t first_copy_bytes = 4 * 1024;
constexpr std::size_t most_copy_bytes = 256 * 1024;
constexpr unsigned most_starts_at_oldest = 16;

// A filler whose number is 0 has none, except where the numbers go round with it.
bool has_number(const reader::record_header &header, std::optional<std::uint32_t> before)
{
    constexpr std::uint32_t greatest = 0xFFFFFFFE;
    return reader::is_numbered(header) || (header.seq == 0 && before == greatest);
}

bool carries_body(const reader::record_header &header) { return !is_free(header) && !is_unfinished(header); }

} // namespace

ring_follower::ring_follower(reader::byte_source &source, const reader::file_header &header, bool since_start)
    : source_(source), header_(header), time_base_(header.time_info), since_start_(since_start)
{
}

ring_follower::progress ring_follower::advance(ring_listener &to)
{
    const auto now = look_at_ring(source_, header_);
    if (!now) return progress::nothing;
    if (now->file_size != header_.file_size || (begun_ && now->is_empty())) return progress::new_life;
    if (now->is_empty()) {
        since_start_ = caught_up_ = true;
        return progress::nothing;
    }
    const auto written = written_to(*now);
    if (!written) return progress::nothing;
    if (!std::exchange(begun_, true)) {
        const bool was_empty = caught_up_;
        start_over(*now, *written);
        target_ = *written;
        caught_up_ = was_empty;
    } else if (started_anew(*now, *written)) {
        return progress::new_life;
    } else if (!is_in_reach(*now, *written)) {
        start_over(*now, *written);
    }
    see(*now, *written);

    caught_up_ = caught_up_ || (!lap_before_ && at_ >= target_);
    if (at_ < (lap_before_ ? header_.ring.end : *written)) {
        const auto done = read_on(*written, to);
        if (done == progress::nothing) caught_up_ = true;
        return done;
    }
    if (lap_before_) {
        at_ = header_.ring.begin;
        lap_before_ = false;
        return progress::some;
    }
    finished_ = now->is_full_page();
    return progress::nothing;
}

// Up to where records of this lap stand. The oldest record is the one at the start of the ring both before the first
// record of a lap has its space and behind the last one.
std::optional<std::uint64_t> ring_follower::written_to(const ring_glance &now)
{
    if (now.oldest != header_.ring.begin) return now.oldest;
    if (now.is_full_page() || (lap_under_way_ && same_lap(seen_.first, now.first))) return header_.ring.end;
    if (now.first.seq == 0) return header_.ring.begin + now.first.length; // a page's note, which is not counted
    return is_unfinished(now.first) ? written_behind(now) : header_.ring.end;
}

// The same where the first record of the lap is not complete: what stands behind it is newer only at the end of the lap.
std::optional<std::uint64_t> ring_follower::written_behind(const ring_glance &unfinished_first)
{
    reader::record_header next = unfinished_first.first;
    std::uint64_t at = header_.ring.begin;
    do {
        if (next.length < format::record_header_bytes || next.length > header_.ring.end - at) return std::nullopt;
        at += next.length;
        if (at == header_.ring.end) return header_.ring.begin;
        const auto read = record_header_at(source_, header_, at);
        if (!read) return std::nullopt;
        next = *read;
    } while (!reader::is_numbered(next));
    const auto again = look_at_ring(source_, header_);
    if (!again || again->oldest != header_.ring.begin || !same_lap(unfinished_first.first, again->first))
        return std::nullopt;
    return reader::later(next.seq, unfinished_first.first.seq) ? header_.ring.end : header_.ring.begin;
}

// Numbers only grow while a ring is continued, and a page is written once from its start to its end.
bool ring_follower::started_anew(const ring_glance &now, std::uint64_t written) const
{
    if (now.file_size != header_.file_size || now.is_empty()) return true;
    if (seen_.is_full_page() && !now.is_full_page()) return true;
    if (same_lap(seen_.first, now.first)) return now.page_state != 0 && !lap_before_ && written < at_;
    if (now.page_state != 0 && seen_.first.seq != 0) return true;
    return !reader::later(now.first.seq, last_seq_.value_or(seen_.first.seq));
}

// Whether the writer has not overwritten what is to be read next. When he has come round, exactly once.
bool ring_follower::is_in_reach(const ring_glance &now, std::uint64_t written)
{
    if (!same_lap(seen_.first, now.first)) {
        caught_up_ = true;
        if (lap_before_ || !ends_before(now.first)) return false;
        lap_before_ = at_ != header_.ring.end;
        if (!lap_before_) at_ = header_.ring.begin;
    }
    return lap_before_ ? written <= at_ : at_ <= written;
}

// Whether the rest of the lap that was read ends, by its numbers, right before that record.
bool ring_follower::ends_before(const reader::record_header &first_of_next_lap)
{
    auto last = last_seq_;
    if (!last) return false;
    reader::window window(source_);
    for (std::uint64_t at = at_; at != header_.ring.end;) {
        const auto bytes = window.fetch(at, format::record_header_bytes);
        if (bytes.size() < format::record_header_bytes) return false;
        const auto header = reader::parse_record_header(reader::byte_view(bytes, header_.order));
        if (header.length < format::record_header_bytes || header.length > header_.ring.end - at) return false;
        if (has_number(header, last)) {
            if (header.seq != *last + 2) return false;
            last = header.seq;
        }
        at += header.length;
    }
    return first_of_next_lap.seq == *last + 2;
}

// From the oldest record on; when the writer is too fast for that, from the start of the ring, which he comes to last.
void ring_follower::start_over(const ring_glance &now, std::uint64_t written)
{
    lap_before_ = starts_over_++ < most_starts_at_oldest && written != header_.ring.end;
    at_ = lap_before_ ? written : header_.ring.begin;
    in_order_ = false;
    usual_copy_bytes_ = first_copy_bytes;
    caught_up_ = true;
    time_base_ = reader::current_time_base(now.time_info);
}

void ring_follower::see(const ring_glance &now, std::uint64_t written)
{
    const bool same = same_lap(seen_.first, now.first);
    lap_under_way_ = (same && lap_under_way_) || written != header_.ring.begin;
    const auto first = same && is_unfinished(now.first) ? seen_.first : now.first;
    seen_ = now;
    seen_.first = first;
}

ring_follower::progress ring_follower::read_on(std::uint64_t written, ring_listener &to)
{
    const std::uint64_t end = lap_before_ ? header_.ring.end : written;
    // What was there at the beginning is handed out by itself.
    const std::uint64_t stop = !lap_before_ && !caught_up_ ? std::min(end, target_) : end;
    const bool newest_at_end = !lap_before_ && !seen_.is_full_page();
    if (end - at_ < format::record_header_bytes) {
        damaged(at_, end, to);
        return progress::some;
    }
    if (!copy(end)) return progress::nothing;
    if (!lap_before_) copy_newest_again(end);
    const auto touched = look_what_is_touched();
    if (!touched) return progress::some; // the next call finds out how far he has come
    if (at_ < touched->end) {
        start_over(seen_, touched->written);
        return progress::some;
    }
    bool moved = false;
    while (at_ < stop && at_ - copied_from_ + format::record_header_bytes <= copied_.size()) {
        // The first record's space may be taken anew by now, with others behind it, of which the copy is still good.
        const bool taken_anew = at_ == header_.ring.begin && at_ == seen_.oldest;
        const auto next = tile_at(at_, taken_anew ? header_.ring.end : end);
        if (!next) {
            damaged(at_, end, to);
            return progress::some;
        }
        if (is_cut_off(*next)) break;
        const bool newest = newest_at_end && next->offset + next->header.length == end;
        if (newest && is_unfinished(next->header)) return moved ? progress::some : progress::nothing;
        take(*next, to);
        moved = true;
    }
    usual_copy_bytes_ = std::min(2 * usual_copy_bytes_, most_copy_bytes);
    return progress::some;
}

// The bytes from `at_` on, at least those of the next record.
bool ring_follower::copy(std::uint64_t end)
{
    std::size_t wanted = std::min<std::uint64_t>(end - at_, usual_copy_bytes_);
    for (;;) {
        copied_.resize(wanted);
        copied_from_ = at_;
        if (source_.read_at(at_, copied_) < wanted) return false;
        const auto first = tile_at(at_, end);
        if (!first || !is_cut_off(*first)) return true;
        wanted = first->header.length;
    }
}

// The newest record may have been completed while it was copied. Once it is complete it is copied again; all records
// before it were complete, or given up, when the newest one's space was taken.
void ring_follower::copy_newest_again(std::uint64_t end)
{
    for (std::uint64_t at = at_; at - copied_from_ + format::record_header_bytes <= copied_.size();) {
        const auto next = tile_at(at, end);
        if (!next) return;
        const std::uint64_t behind = at + next->header.length;
        if (behind == end && carries_body(next->header) && behind - copied_from_ <= copied_.size()) {
            const auto newest = std::span(copied_).subspan(static_cast<std::size_t>(at - copied_from_));
            if (source_.read_at(at, newest) < newest.size()) copied_.resize(copied_.size() - newest.size());
            return;
        }
        at = behind;
    }
}

reader::record_header ring_follower::header_in_copy(std::uint64_t offset) const
{
    const auto bytes = std::span(copied_).subspan(static_cast<std::size_t>(offset - copied_from_));
    return reader::parse_record_header(reader::byte_view(bytes.first(format::record_header_bytes), header_.order));
}

// Of the copy; nothing when its length cannot be right.
std::optional<ring_follower::tile> ring_follower::tile_at(std::uint64_t offset, std::uint64_t end) const
{
    const auto header = header_in_copy(offset);
    const bool sound =
        header.length >= format::record_header_bytes && header.length % 4 == 0 && header.length <= end - offset;
    if (!sound) return std::nullopt;
    return tile{offset, header};
}

// Whether the copy lacks bytes of a record that are needed.
bool ring_follower::is_cut_off(const tile &at) const
{
    return carries_body(at.header) && at.header.length <= longest_record() &&
           at.offset - copied_from_ + at.header.length > copied_.size();
}

// What of the lap before may have been touched until a copy was complete; nothing when the writer has come round.
//
// Where the writer is, he may be taking space: as long as his record covers all of it, the header of the free rest may
// stand anywhere in it; and the rest of the record before begins where the oldest record is. Unless the copy begins
// there and the record, or his, is still the same: then all behind it is as it was.
std::optional<ring_follower::touched_part> ring_follower::look_what_is_touched()
{
    const auto now = look_at_ring(source_, header_);
    const auto written = now ? written_to(*now) : std::nullopt;
    if (!written || !same_lap(seen_.first, now->first) || started_anew(*now, *written)) return std::nullopt;
    see(*now, *written);
    if (!lap_before_) return touched_part{*written, header_.ring.begin};
    if (*written == header_.ring.end) return touched_part{*written, *written};
    const auto oldest = record_header_at(source_, header_, *written);
    const auto first = record_header_at(source_, header_, header_.ring.begin);
    if (!oldest || !first || !same_lap(now->first, *first)) return std::nullopt;
    if (at_ == *written) {
        const auto copied = header_in_copy(at_);
        const bool same =
            copied.seq == oldest->seq && copied.function == oldest->function && copied.length == oldest->length;
        if (same) return touched_part{*written, *written};
    }
    const bool taken = reader::is_numbered(*oldest) && !reader::later(now->first.seq, oldest->seq);
    return touched_part{*written, *written + (taken ? oldest->length : 0) + format::record_header_bytes};
}

void ring_follower::take(const tile &at, ring_listener &to)
{
    at_ = at.offset + at.header.length;
    // Where the space for the next record is, it may just be taken: then this was a complete record. Or a writer has died
    // while he took it: then this is the newest number of all.
    if (at.offset == seen_.oldest && is_unfinished(at.header)) return;
    if (!has_number(at.header, last_seq_) || !pass_number(at, to)) return;
    if (is_unfinished(at.header)) {
        to.found({reader::finding::severity::loss, at.offset,
                  fmt::format("this record was never completed by its writer (sequence number {})", at.header.seq),
                  at.header.seq});
    } else if (!is_free(at.header)) {
        hand_out(at, to);
    }
}

// Whether the record is behind those that were handed out. Counts what is missing between them.
bool ring_follower::pass_number(const tile &at, ring_listener &to)
{
    const std::uint32_t seq = at.header.seq;
    std::uint64_t missing = 0;
    if (last_seq_) {
        if (!reader::later(seq, *last_seq_)) {
            if (!in_order_) return false;
            to.found({reader::finding::severity::damage, at.offset,
                      fmt::format("sequence number {} follows {}", seq, *last_seq_), seq});
            last_seq_ = seq;
            return true;
        }
        missing = (seq - *last_seq_) / 2 - 1;
    } else if (since_start_ && seq > 2) {
        missing = seq / 2 - 1;
    }
    if (missing != 0) {
        if (!lost_) lost_ = lost_records{0, last_seq_.value_or(0) + 2, last_time_, std::nullopt};
        lost_->count += missing;
    }
    last_seq_ = seq;
    in_order_ = true;
    return true;
}

void ring_follower::hand_out(const tile &at, ring_listener &to)
{
    starts_over_ = 0;
    const bool oversized = at.header.length > longest_record();
    const std::size_t bytes = oversized ? format::record_header_bytes : at.header.length;
    reader::trace_record record;
    record.raw = {
        at.offset, at.header,
        reader::byte_view(std::span(copied_).subspan(static_cast<std::size_t>(at.offset - copied_from_), bytes),
                          header_.order),
        oversized};
    auto decoded = reader::decode(record.raw);
    record.body = std::move(decoded.body);
    record.problem = std::move(decoded.problem);
    time_base_.pass(record.body);
    if (const auto *start = std::get_if<reader::start_body>(&record.body)) started_by_ = start->pid;
    if (const auto *restart = std::get_if<reader::restart_body>(&record.body)) started_by_ = restart->start.pid;
    record.time = time_base_.time_of(at.header.counter);
    if (lost_) {
        lost_->behind = record.time;
        to.lost(*lost_);
        lost_.reset();
    }
    if (!record.problem.empty()) {
        to.found({reader::finding::severity::damage, at.offset,
                  fmt::format("{} (sequence number {})", record.problem, at.header.seq), at.header.seq});
    }
    last_time_ = record.time;
    to.record(record);
}

// What follows in this part of the ring cannot be found.
void ring_follower::damaged(std::uint64_t offset, std::uint64_t end, ring_listener &to)
{
    to.found({reader::finding::severity::damage, offset,
              "the length of this record makes no sense; the records behind it cannot be read"});
    at_ = end;
}

void ring_follower::finish(ring_listener &to)
{
    if (lost_) to.lost(*std::exchange(lost_, std::nullopt));
    const auto now = look_at_ring(source_, header_);
    const auto written = begun_ && now ? written_to(*now) : std::nullopt;
    if (!written || started_anew(*now, *written) || lap_before_ || at_ >= *written) return;
    const auto newest = record_header_at(source_, header_, at_);
    if (!newest || !is_unfinished(*newest)) return;
    to.found(
        {reader::finding::severity::loss, at_,
         fmt::format("this record is being written, or its writer died before it was complete (sequence number {})",
                     newest->seq),
         newest->seq});
}

std::uint64_t ring_follower::longest_record() const
{
    return (header_.ring.end - header_.ring.begin) / 2 + format::record_header_bytes;
}

} // namespace qn::dump
