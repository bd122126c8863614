#include "tools/qntrace/salvage/ring_writer.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <limits>
#include <utility>

#include "tools/qntrace/check/header_rules.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

constexpr std::uint64_t most_file_bytes = std::numeric_limits<std::uint32_t>::max() & ~3U;
constexpr std::uint64_t nanosecond_ticks = 1'000'000'000; // where no time base at all was found

bool usable(const cu_timeinfo_t &base) { return base.timeinfo1 != 0; }

bool alike(const cu_timeinfo_t &left, const cu_timeinfo_t &right)
{
    return left.timeinfo1 == right.timeinfo1 && left.timeinfo2 == right.timeinfo2;
}

} // namespace

ring_writer::ring_writer(std::FILE *out, std::vector<std::byte> header_bytes, const reader::file_header &header)
    : out_(out), header_bytes_(std::move(header_bytes)), header_(header), at_(header.ring.begin), last_at_(at_)
{
    header_bytes_.resize(header.ring.begin);
    if (usable(header.time_info)) first_base_ = base_ = header.time_info;
}

bool ring_writer::add(const reader::trace_record &record, const cu_timeinfo_t &base)
{
    const auto bytes = record.raw.bytes.bytes();
    if (at_ + sizeof(time_calibration_t) + bytes.size() > most_file_bytes) return false;
    if (!agree_on_time(record, base)) return false;
    append(bytes);
    last_seq_ = record.raw.header.seq;
    return true;
}

void ring_writer::finish()
{
    mend_header(close_ring());
    write_at(0, header_bytes_);
}

// Sees to it that the new file gives the record the time that it has in the other one.
bool ring_writer::agree_on_time(const reader::trace_record &record, const cu_timeinfo_t &base)
{
    if (!usable(base)) return true;
    if (!last_seq_ || !base_) {
        if (!base_ || !alike(*base_, base)) first_base_ = base;
        base_ = base;
        return true;
    }
    reader::current_time_base behind(*base_);
    behind.pass(record.body);
    if (!alike(behind.info(), base)) {
        const bool number_is_free = record.raw.header.seq - *last_seq_ >= 4;
        if (!number_is_free) return false;
        add_calibration(record, base);
    }
    base_ = base;
    return true;
}

// In the place of the record that had set the time base, under a number that is missing.
void ring_writer::add_calibration(const reader::trace_record &record, const cu_timeinfo_t &base)
{
    std::array<std::byte, sizeof(time_calibration_t)> bytes = {};
    put(bytes, offsetof(trace_record_header_t, function), 2,
        static_cast<std::uint16_t>(format::kind::time_calibration));
    put(bytes, offsetof(trace_record_header_t, seqNumber), 4, *last_seq_ + 2);
    std::memcpy(&bytes[offsetof(trace_record_header_t, compId)], format::library_component,
                sizeof format::library_component);
    put(bytes, offsetof(trace_record_header_t, threadId), 4, record.raw.header.thread);
    put(bytes, offsetof(trace_record_header_t, timeStamp), 8, record.raw.header.counter);
    put(bytes, offsetof(time_calibration_t, reBase), 8, base.timeinfo1);
    put(bytes, offsetof(time_calibration_t, reBase) + 8, 8, base.timeinfo2);
    append(bytes);
}

// Of a filler only the header is kept.
void ring_writer::append(std::span<const std::byte> record)
{
    std::array<std::byte, format::record_header_bytes> header;
    std::copy_n(record.begin(), header.size(), header.begin());
    put(header, offsetof(trace_record_header_t, length), 4, record.size());
    write_at(at_, header);
    write_at(at_ + header.size(), record.subspan(header.size()));
    last_at_ = at_;
    at_ += record.size();
}

// A rest without room for a record header stays with the last record, as the writers do it too.
std::uint64_t ring_writer::close_ring()
{
    const bool size_is_told = header_.file_size >= header_.ring.end && header_.file_size % 4 == 0;
    const std::uint64_t wanted = size_is_told ? header_.file_size : (header_.ring.end + 3) / 4 * 4;
    const std::uint64_t size = std::max(wanted, at_);
    const std::uint64_t rest = size - at_;
    if (rest == 0) {
        oldest_ = header_.ring.begin;
    } else if (rest < format::record_header_bytes) {
        std::array<std::byte, 4> length;
        put(length, 0, length.size(), size - last_at_);
        write_at(last_at_ + offsetof(trace_record_header_t, length), length);
        oldest_ = header_.ring.begin;
    } else {
        std::array<std::byte, format::record_header_bytes> filler = {};
        put(filler, offsetof(trace_record_header_t, length), 4, rest);
        put(filler, offsetof(trace_record_header_t, seqNumber), 4, format::seq_filler);
        write_at(at_, filler);
        oldest_ = at_;
    }
    if (rest != 0 && rest != format::record_header_bytes) write_at(size - 1, std::array{std::byte{0}});
    return size;
}

void ring_writer::mend_header(std::uint64_t file_bytes)
{
    const auto set = [this](std::size_t at, std::size_t width, std::uint64_t value) {
        put(header_bytes_, at, width, value);
    };
    const auto end_text = [this](std::size_t at, std::size_t size) {
        if (at + size <= header_bytes_.size()) header_bytes_[at + size - 1] = std::byte{0};
    };
    const bool little = header_.order == reader::byte_order::little;
    set(offsetof(trace_file_header_t, uProperties), 1,
        format::properties::always | (little ? format::properties::little_endian : 0));
    set(offsetof(trace_file_header_t, uFlags), 2, 0);
    set(offsetof(trace_file_header_t, uOffset), 4, header_.ring.begin);
    set(offsetof(trace_file_header_t, uSeqLock), 4, format::seq_lock_none);
    set(offsetof(trace_file_header_t, uTailReq), 4, 0);
    set(offsetof(trace_file_header_t, uActualFileSize), 4, file_bytes);
    const cu_timeinfo_t base = first_base_.value_or(cu_timeinfo_t{nanosecond_ticks, 0});
    set(offsetof(trace_file_header_t, timeInfo), 8, base.timeinfo1);
    set(offsetof(trace_file_header_t, timeInfo) + 8, 8, base.timeinfo2);
    set(offsetof(trace_file_header_t, machineId), 4, 0);
    set(offsetof(trace_file_header_t, uOldestRecordOffset), 4, oldest_);
    end_text(offsetof(trace_file_header_t, program), sizeof(trace_file_header_t::program));
    end_text(offsetof(trace_file_header_t, buildName), sizeof(trace_file_header_t::buildName));
    end_text(offsetof(trace_file_header_t, baseProgName), sizeof(trace_file_header_t::baseProgName));
    if (header_.page_state && !is_page_state(*header_.page_state)) set(offsetof(trace_file_header_t, sp_flags), 1, 0);
    if (header_.tz_offset_minutes && !is_zone_offset(*header_.tz_offset_minutes))
        set(offsetof(trace_file_header_t, tz_offset), 4, 0);
}

void ring_writer::put(std::span<std::byte> bytes, std::size_t at, std::size_t width, std::uint64_t value) const
{
    for (std::size_t i = 0; i < width; ++i) {
        const std::size_t place = header_.order == reader::byte_order::little ? i : width - 1 - i;
        bytes[at + place] = static_cast<std::byte>(value >> (8 * i) & 0xFF);
    }
}

void ring_writer::write_at(std::uint64_t offset, std::span<const std::byte> bytes)
{
    if (bytes.empty()) return;
    if (static_cast<std::uint64_t>(std::ftell(out_)) != offset) std::fseek(out_, static_cast<long>(offset), SEEK_SET);
    std::fwrite(bytes.data(), 1, bytes.size(), out_);
}

} // namespace qn::dump
