#include "tools/qntrace/traces/losses.h"

#include <algorithm>
#include <charconv>

#include <fmt/format.h>

#include "tools/qntrace/format/timestamps.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

std::uint32_t noted_times(const reader::raw_record &note)
{
    const auto body = reader::decode(note).body;
    const auto *text = std::get_if<reader::page_note_body>(&body);
    return text == nullptr ? 0 : times_not_spooled(text->text);
}

} // namespace

void losses::add(const losses &other)
{
    unfinished += other.unfinished;
    missing += other.missing;
    overwritten += other.overwritten;
    unspooled += other.unspooled;
    last_reuse_time = std::max(last_reuse_time, other.last_reuse_time);
}

std::string losses_text(const losses &lost, bool utc)
{
    std::string out;
    const auto add = [&out](std::uint64_t count, std::string_view one, std::string_view several) {
        if (count == 0) return;
        if (!out.empty()) out += ", ";
        out += fmt::format("{} {}", count, count == 1 ? one : several);
    };
    add(lost.unfinished, "record unfinished", "records unfinished");
    add(lost.missing, "record missing", "records missing");
    add(lost.unspooled, "page overwritten before it was copied", "pages overwritten before they were copied");
    if (lost.unspooled != 0 && lost.last_reuse_time != 0) {
        const auto time = timestamps(utc).text({static_cast<time_t>(lost.last_reuse_time), 0});
        if (time) out += fmt::format(", the last at {}", *time);
    }
    return out;
}

loss_counter::loss_counter(const reader::file_header &header)
{
    losses_.last_reuse_time = header.page_reuse_time.value_or(0);
}

std::uint64_t loss_counter::pass(const reader::raw_record &record)
{
    const auto kind = static_cast<format::kind>(record.header.function);
    if (kind == format::kind::being_written) ++losses_.unfinished;
    if (kind == format::kind::page_note) losses_.unspooled += noted_times(record);

    const std::uint32_t seq = record.header.seq;
    if (seq == format::seq_filler || seq % 2 != 0) return 0;
    std::uint32_t gap = 0;
    if (!last_seq_) {
        losses_.overwritten = seq > 2 ? (seq - 2) / 2 : 0;
    } else if (static_cast<std::int32_t>(seq - *last_seq_) > 2) { // modulo 2^32
        gap = (seq - *last_seq_) / 2 - 1;
    }
    losses_.missing += gap;
    last_seq_ = seq;
    return gap;
}

std::uint32_t times_not_spooled(std::string_view text)
{
    constexpr std::string_view before_count = " not spooled ";
    const auto found = text.rfind(before_count);
    if (found == std::string_view::npos) return 0;
    text.remove_prefix(found + before_count.size());
    std::uint32_t count = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
    constexpr std::string_view behind_count = " consecutive time";
    const std::string_view rest(end, static_cast<std::size_t>(text.data() + text.size() - end));
    return error == std::errc() && rest.starts_with(behind_count) ? count : 0;
}

} // namespace qn::dump
