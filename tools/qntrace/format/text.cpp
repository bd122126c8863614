#include "tools/qntrace/format/text.h"

#include <cstdlib>

#include <fmt/compile.h>
#include <fmt/format.h>

#include "tools/qntrace/format/body.h"
#include "tools/qntrace/format/record_names.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t kind_width = 11;
constexpr std::size_t component_width = 4;

// What tells a terminal to change the colour. Text out of a file has its escapes spelt out, and changes nothing.
constexpr std::string_view cyan = "\x1b[36m";
constexpr std::string_view green = "\x1b[32m";
constexpr std::string_view red = "\x1b[1;31m";
constexpr std::string_view yellow = "\x1b[1;33m";
constexpr std::string_view usual = "\x1b[m";

void append(std::string &out, std::string_view text) { out += text; }

template <typename... Values>
void append(std::string &out, fmt::format_string<const Values &...> text, const Values &...values)
{
    fmt::format_to(std::back_inserter(out), text, values...);
}

// The colour of what a reader looks for: errors and damage, and notices; none for other records.
std::string_view alarm_color(const reader::trace_record &record)
{
    if (!record.problem.empty() || std::holds_alternative<reader::error_body>(record.body)) return red;
    if (std::holds_alternative<reader::page_note_body>(record.body) ||
        std::holds_alternative<reader::restart_body>(record.body)) {
        return yellow;
    }
    return {};
}

std::string_view order_name(reader::byte_order order)
{
    return order == reader::byte_order::little ? "little-endian" : "big-endian";
}

} // namespace

void text_dump::header(std::string &out, std::string_view path, const reader::file_header &header)
{
    append(out, "file     ");
    append_escaped(out, path, options_.printable);
    out += '\n';
    summary(out, header);
    if (options_.raw) raw_fields(out, header);
    column_heads(out);
}

void text_dump::summary(std::string &out, const reader::file_header &header)
{
    append(out, "format   version {}, {}, platform {}", header.version, order_name(header.order),
           unsigned{header.platform});
    if (header.build_name) {
        append(out, ", written by ");
        append_quoted(out, *header.build_name, options_.printable);
    }
    append(out, "\nring     {} to {}, oldest record at {}\n", header.ring.begin, header.ring.end,
           header.oldest_record_offset);
    append(out, "process  pid {}", header.pid);
    if (header.program && header.base_program) {
        append(out, ", ");
        append_quoted(out, *header.base_program, options_.printable);
        append(out, ", invoked as ");
        append_quoted(out, *header.program, options_.printable);
    }
    append(out, "\nnode     number {}", header.node_number);
    if (header.node_id) append(out, ", id {:#018x}", *header.node_id);
    append(out, "\ntime     {} ticks/s", header.time_info.timeinfo1);
    if (header.tz_offset_minutes) append(out, ", zone {}", zone_text(*header.tz_offset_minutes));
    out += '\n';
    if (header.page_state && (*header.page_state != 0 || header.page_reuse_time.value_or(0) != 0)) {
        const auto name = page_state_name(*header.page_state);
        append(out, "page     {}", name.empty() ? fmt::format("state {}", *header.page_state) : name);
        if (header.page_reuse_time.value_or(0) != 0) {
            append(out, ", last taken over unspooled at {}", seconds_text(*header.page_reuse_time));
        }
        out += '\n';
    }
}

void text_dump::raw_fields(std::string &out, const reader::file_header &header) const
{
    append(out, "fields   uProperties={:#04x} uPlatform={} uVersion={} uFlags={:#06x} uNodeNumber={}\n",
           header.properties, unsigned{header.platform}, header.version, header.flags, header.node_number);
    append(out, "         uOffset={} uSeqLock={} uTailReq={} uActualFileSize={}\n", header.ring_offset, header.seq_lock,
           header.tail_request, header.file_size);
    append(out, "         timeInfo={:#018x},{:#018x} machineId={:#x}\n", header.time_info.timeinfo1,
           header.time_info.timeinfo2, header.machine_id);
    append(out, "         uOldestRecordOffset={} uPid={}", header.oldest_record_offset, header.pid);
    if (header.node_id) append(out, " uNode_ID={:#018x}", *header.node_id);
    if (header.page_state) {
        append(out, "\n         sp_reuse_tm={} sp_flags={:#04x} tz_offset={}", header.page_reuse_time.value_or(0),
               *header.page_state, header.tz_offset_minutes.value_or(0));
    }
    out += '\n';
}

void text_dump::column_heads(std::string &out) const
{
    if (options_.raw)
        append(out, "{:>10}  {:>10}  {:>6}  {:>6}  {:>20}  ", "OFFSET", "LENGTH", "CODE", "RESV", "COUNTER");
    append(out, "{:<{}}  {:>8}  {:<10}  {:<4}  {:<{}}  BODY\n", "TIME", timestamps_.width(), "SEQ", "THREAD", "COMP",
           "KIND", kind_width);
}

void text_dump::record(std::string &out, const reader::trace_record &record)
{
    const auto &header = record.raw.header;
    if (options_.raw) {
        append(out, "{:>10}  {:>10}  {:>6}  {:#06x}  {:>20}  ", record.raw.offset, header.length, header.function,
               header.reserved, header.counter);
    }
    time_column(out, record);
    fmt::format_to(std::back_inserter(out), FMT_COMPILE("  {:>8}  {:#010x}  "), header.seq, header.thread);
    component_column(out, header);
    out += "  ";
    kind_and_body(out, record);
}

void text_dump::kind_and_body(std::string &out, const reader::trace_record &record) const
{
    const auto alarm = alarm_color(record);
    const auto kind = kind_name(record.body);
    begin_color(out, alarm.empty() ? green : alarm);
    out += kind;
    end_color(out);
    out.append(kind_width - kind.size() + 2, ' ');
    const auto begin = out.size();
    append_body(out, record, {options_.raw, options_.printable});
    if (alarm.empty() || out.size() <= begin + 1) return; // there is no body, and the blanks before it are gone
    const auto end = out.size() - 1;                      // the end of its last line
    if (options_.color) out.insert(end, usual).insert(begin, alarm);
}

void text_dump::time_column(std::string &out, const reader::trace_record &record)
{
    const auto begin = out.size();
    if (std::holds_alternative<reader::free_body>(record.body)) {
        out += '-';
    } else if (!record.time || !timestamps_.append(out, *record.time)) {
        append(out, "counter {}", record.raw.header.counter);
    }
    const auto width = out.size() - begin;
    if (width < timestamps_.width()) out.append(timestamps_.width() - width, ' ');
}

void text_dump::component_column(std::string &out, const reader::record_header &header) const
{
    begin_color(out, cyan);
    const auto begin = out.size();
    append_escaped(
        out, options_.raw ? std::string_view(header.component.data(), header.component.size()) : component_name(header),
        options_.printable);
    const auto width = out.size() - begin;
    end_color(out);
    if (width < component_width) out.append(component_width - width, ' ');
}

void text_dump::begin_color(std::string &out, std::string_view color) const
{
    if (options_.color) out += color;
}

void text_dump::end_color(std::string &out) const
{
    if (options_.color) out += usual;
}

std::string text_dump::seconds_text(std::uint32_t seconds)
{
    const auto text = timestamps_.text({static_cast<time_t>(seconds), 0});
    return text ? *text : fmt::format("{}", seconds);
}

} // namespace qn::dump
