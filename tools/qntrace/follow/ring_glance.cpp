#include "tools/qntrace/follow/ring_glance.h"

#include <array>

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

// At the start of the ring.
bool fits(const reader::record_header &first, const reader::file_header &header)
{
    return first.length >= format::record_header_bytes && first.length % 4 == 0 &&
           first.length <= header.ring.end - header.ring.begin;
}

} // namespace

bool ring_glance::is_empty() const { return first.seq == 0 && (is_free(first) || is_unfinished(first)); }

bool ring_glance::is_full_page() const { return page_state != 0 && page_state != format::page_state::active; }

std::optional<ring_glance> look_at_ring(reader::byte_source &source, const reader::file_header &header)
{
    constexpr unsigned most_looks = 4;
    for (unsigned looks = 0; looks < most_looks; ++looks) {
        const auto first = record_header_at(source, header, header.ring.begin);
        std::array<std::byte, format::header_bytes> bytes;
        if (!first || !fits(*first, header) || source.read_at(0, bytes) < bytes.size()) return std::nullopt;
        const auto first_again = record_header_at(source, header, header.ring.begin);
        if (!first_again || !same_lap(*first, *first_again)) continue;
        const reader::byte_view view(bytes, header.order);
        ring_glance seen;
        seen.first = *first;
        seen.oldest = view.u32(offsetof(trace_file_header_t, uOldestRecordOffset));
        seen.file_size = view.u32(offsetof(trace_file_header_t, uActualFileSize));
        seen.pid = view.u32(offsetof(trace_file_header_t, uPid));
        if (header.page_state) seen.page_state = view.u8(offsetof(trace_file_header_t, sp_flags));
        seen.time_info.timeinfo1 = view.u64(offsetof(trace_file_header_t, timeInfo));
        seen.time_info.timeinfo2 = view.u64(offsetof(trace_file_header_t, timeInfo) + 8);
        const bool inside = seen.oldest >= header.ring.begin && seen.oldest % 4 == 0 &&
                            seen.oldest + format::record_header_bytes <= header.ring.end;
        if (inside || seen.file_size != header.file_size) return seen;
    }
    return std::nullopt;
}

std::optional<reader::record_header> record_header_at(reader::byte_source &source, const reader::file_header &header,
                                                      std::uint64_t offset)
{
    std::array<std::byte, format::record_header_bytes> bytes;
    if (source.read_at(offset, bytes) < bytes.size()) return std::nullopt;
    return reader::parse_record_header(reader::byte_view(bytes, header.order));
}

bool same_lap(const reader::record_header &earlier, const reader::record_header &now)
{
    if (earlier.seq != now.seq) return false;
    if (is_unfinished(earlier) || is_unfinished(now)) return true;
    return earlier.function == now.function && (is_free(now) || earlier.counter == now.counter);
}

bool is_free(const reader::record_header &header)
{
    return header.function == static_cast<std::uint16_t>(format::kind::free_space);
}

bool is_unfinished(const reader::record_header &header)
{
    return header.function == static_cast<std::uint16_t>(format::kind::being_written);
}

} // namespace qn::dump
