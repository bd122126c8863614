#include "tools/qntrace/reader/header.h"

#include <algorithm>
#include <array>
#include <cstddef>

#include <fmt/format.h>

namespace qn::reader
{
namespace
{

namespace format = qn::tr::format;

// The part of the header that every version has; what lies behind it is there when `uOffset` leaves room for it.
constexpr std::uint32_t common_header_bytes = offsetof(trace_file_header_t, program);
constexpr std::uint32_t longest_header_bytes = 4096; // no version comes near it
constexpr std::uint16_t first_version_with_node_id = 4;
constexpr std::uint16_t first_version_with_pages = 5;

file_header parse(std::span<const std::byte> bytes, byte_order order)
{
    const byte_view view(bytes, order);
    file_header header;
    header.order = order;
    header.properties = view.u8(offsetof(trace_file_header_t, uProperties));
    header.platform = view.u8(offsetof(trace_file_header_t, uPlatform));
    header.version = view.u16(offsetof(trace_file_header_t, uVersion));
    header.flags = view.u16(offsetof(trace_file_header_t, uFlags));
    header.node_number = view.u16(offsetof(trace_file_header_t, uNodeNumber));
    header.ring_offset = view.u32(offsetof(trace_file_header_t, uOffset));
    header.seq_lock = view.u32(offsetof(trace_file_header_t, uSeqLock));
    header.tail_request = view.u32(offsetof(trace_file_header_t, uTailReq));
    header.file_size = view.u32(offsetof(trace_file_header_t, uActualFileSize));
    header.time_info.timeinfo1 = view.u64(offsetof(trace_file_header_t, timeInfo));
    header.time_info.timeinfo2 = view.u64(offsetof(trace_file_header_t, timeInfo) + 8);
    header.machine_id = view.u32(offsetof(trace_file_header_t, machineId));
    header.oldest_record_offset = view.u32(offsetof(trace_file_header_t, uOldestRecordOffset));
    header.pid = view.u32(offsetof(trace_file_header_t, uPid));
    return header;
}

// The fields behind the common part, as far as they lie before the ring.
void parse_rest(file_header &header, std::span<const std::byte> bytes)
{
    const byte_view view(bytes.first(std::min<std::uint64_t>(bytes.size(), header.ring.begin)), header.order);
    const auto text = [&](std::size_t at, std::size_t count) -> std::optional<std::string> {
        if (!view.holds(at, count)) return std::nullopt;
        return std::string(cut_at_nul(view.chars(at, count)).text);
    };
    header.program = text(offsetof(trace_file_header_t, program), sizeof(trace_file_header_t::program));
    header.build_name = text(offsetof(trace_file_header_t, buildName), sizeof(trace_file_header_t::buildName));
    header.base_program = text(offsetof(trace_file_header_t, baseProgName), sizeof(trace_file_header_t::baseProgName));
    constexpr std::size_t node_id_at = offsetof(trace_file_header_t, uNode_ID);
    if (header.version >= first_version_with_node_id && view.holds(node_id_at, 8)) {
        header.node_id = view.u64(node_id_at);
    }
    if (header.version >= first_version_with_pages && view.holds(0, format::header_bytes)) {
        header.page_reuse_time = view.u32(offsetof(trace_file_header_t, sp_reuse_tm));
        header.page_state = view.u8(offsetof(trace_file_header_t, sp_flags));
        header.tz_offset_minutes = static_cast<std::int32_t>(view.u32(offsetof(trace_file_header_t, tz_offset)));
    }
}

bool offset_plausible(const file_header &header)
{
    return header.ring_offset >= common_header_bytes && header.ring_offset <= longest_header_bytes &&
           header.ring_offset % 4 == 0;
}

// Says nothing about the file's real length: a truncated file's header still tells its full size.
bool size_plausible(const file_header &header)
{
    return header.file_size >= common_header_bytes + format::record_header_bytes;
}

bool plausible(const file_header &header)
{
    return header.version <= format::format_version && offset_plausible(header) && size_plausible(header);
}

bool oldest_plausible(std::uint64_t oldest, const ring_bounds &ring)
{
    return oldest >= ring.begin && (oldest - ring.begin) % 4 == 0 && oldest + format::record_header_bytes <= ring.end;
}

// The header in the byte order that its first byte names, or in the other one when only that makes sense.
file_header parse_in_its_order(std::span<const std::byte> bytes, const finding_sink &report)
{
    const bool little = (std::to_integer<unsigned>(bytes[0]) & format::properties::little_endian) != 0;
    auto named = parse(bytes, little ? byte_order::little : byte_order::big);
    if (plausible(named)) return named;
    auto other = parse(bytes, little ? byte_order::big : byte_order::little);
    if (!plausible(other)) return named;
    report({finding::severity::damage, 0,
            fmt::format("the byte-order bit 0x80 contradicts the rest of the header, which is {}-endian",
                        little ? "big" : "little")});
    return other;
}

void set_ring_begin(file_header &header, const finding_sink &report)
{
    header.ring.begin = header.ring_offset;
    const bool fixed = header.version == format::format_version;
    if (fixed ? header.ring_offset == format::header_bytes : offset_plausible(header)) return;
    header.ring.begin = format::header_bytes;
    report({finding::severity::damage, offsetof(trace_file_header_t, uOffset),
            fmt::format("the header gives {} as the offset of the first record; {} is used", header.ring_offset,
                        header.ring.begin)});
}

void set_ring_end(file_header &header, std::uint64_t file_bytes, const finding_sink &report)
{
    header.ring.end = std::min<std::uint64_t>(header.file_size, file_bytes);
    if (header.file_size < header.ring.begin + format::record_header_bytes) {
        header.ring.end = file_bytes;
        report({finding::severity::damage, offsetof(trace_file_header_t, uActualFileSize),
                fmt::format("the header gives {} as the size of the file, which has {} bytes", header.file_size,
                            file_bytes)});
    } else if (header.file_size > file_bytes) {
        report({finding::severity::damage, file_bytes,
                fmt::format("the file is truncated: it has {} bytes of {}", file_bytes, header.file_size)});
    } else if (header.file_size < file_bytes) {
        report({finding::severity::damage, header.file_size,
                fmt::format("{} bytes behind the end of the ring do not belong to the trace",
                            file_bytes - header.file_size)});
    }
}

void set_oldest(file_header &header, const finding_sink &report)
{
    if (oldest_plausible(header.oldest_record_offset, header.ring)) {
        header.ring.oldest = header.oldest_record_offset;
        return;
    }
    report({finding::severity::damage, offsetof(trace_file_header_t, uOldestRecordOffset),
            fmt::format("the header gives {} as the offset of the oldest record, the ring is {} to {}",
                        header.oldest_record_offset, header.ring.begin, header.ring.end)});
}

} // namespace

std::optional<file_header> read_header(window &file, const finding_sink &report)
{
    const std::uint64_t file_bytes = file.source_size();
    const auto bytes = file.fetch(0, format::header_bytes);
    if (bytes.size() < common_header_bytes + format::record_header_bytes) {
        report({finding::severity::damage, std::nullopt,
                fmt::format("not a trace file: {} bytes are too short for a header", bytes.size())});
        return std::nullopt;
    }

    auto header = parse_in_its_order(bytes, report);
    const bool marked = (header.properties & format::properties::always) != 0;
    const bool bounded = offset_plausible(header) && size_plausible(header);
    const bool half_bounded = offset_plausible(header) || size_plausible(header);
    const bool known_version = header.version <= format::format_version;
    if (!half_bounded || (!bounded && !(marked && known_version))) {
        report({finding::severity::damage, 0, "not a trace file: its header makes no sense"});
        return std::nullopt;
    }
    if (!known_version) {
        report({finding::severity::damage, offsetof(trace_file_header_t, uVersion),
                fmt::format("format version {} is newer than this program, which knows the versions up to {}",
                            header.version, format::format_version)});
        return std::nullopt;
    }
    if (!marked) {
        report({finding::severity::damage, 0, "the property bit 0x40, which every trace file has, is not set"});
    }

    set_ring_begin(header, report);
    if (header.ring.begin + format::record_header_bytes > file_bytes) {
        report({finding::severity::damage, file_bytes, "the file ends before its first record"});
        return std::nullopt;
    }
    set_ring_end(header, file_bytes, report);
    set_oldest(header, report);
    parse_rest(header, bytes);
    return header;
}

bool is_meant_as_header(window &file)
{
    const auto bytes = file.fetch(0, format::header_bytes);
    constexpr std::size_t mark_bytes = offsetof(trace_file_header_t, uFlags);
    constexpr std::uint16_t newest_thinkable_version = 255;
    if (bytes.size() < mark_bytes) return false;
    const auto properties = std::to_integer<std::uint8_t>(bytes[0]);
    const bool little = (properties & format::properties::little_endian) != 0;
    const byte_view start(bytes, little ? byte_order::little : byte_order::big);
    const auto version = start.u16(offsetof(trace_file_header_t, uVersion));
    const bool marked = (properties & ~format::properties::little_endian) == format::properties::always &&
                        start.u8(offsetof(trace_file_header_t, uPlatform)) == format::platform_linux;
    if (marked && version != 0 && version <= newest_thinkable_version) return true;
    if (bytes.size() < format::header_bytes) return false;
    const auto half_right = [&](byte_order order) {
        const file_header header = parse(bytes, order);
        const ring_bounds ring{format::header_bytes, file.source_size(), {}};
        return (header.ring_offset == ring.begin || header.file_size == ring.end) &&
               oldest_plausible(header.oldest_record_offset, ring);
    };
    return half_right(byte_order::little) || half_right(byte_order::big);
}

std::optional<std::uint64_t> reread_oldest(byte_source &source, const file_header &header)
{
    std::array<std::byte, 4> word = {};
    if (source.read_at(offsetof(trace_file_header_t, uOldestRecordOffset), word) < word.size()) return std::nullopt;
    const std::uint64_t oldest = byte_view(word, header.order).u32(0);
    if (!oldest_plausible(oldest, header.ring)) return std::nullopt;
    return oldest;
}

} // namespace qn::reader
