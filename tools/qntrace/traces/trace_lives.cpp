#include "tools/qntrace/traces/trace_lives.h"

#include <algorithm>
#include <map>
#include <tuple>

#include <fmt/format.h>

namespace qn::dump
{
namespace
{

constexpr std::size_t first_look_bytes = 4096; // the header and, mostly, the first record need no more

void ignore(const reader::finding &) {}

// Where a life's records end in one file.
struct life_end {
    std::uint32_t newest = 0;   // sequence number
    std::uint64_t finished = 0; // records
};

life_end end_of(const trace_source &source)
{
    life_end end;
    try {
        reader::file_source file(source.path);
        reader::trace_reader trace(file, ignore);
        while (const auto record = trace.next_undecoded()) {
            if (!reader::carries_data(record->raw)) continue;
            end.newest = record->raw.header.seq;
            ++end.finished;
        }
    } catch (const reader::io_error &) {
        return end; // gone meanwhile, or cannot be read to its end: the other one is better
    }
    return end;
}

// Whether `left` holds more of the life that both are of.
bool holds_more(const trace_source &left, const trace_source &right)
{
    const life_end left_end = end_of(left);
    const life_end right_end = end_of(right);
    if (left_end.newest != right_end.newest)
        return static_cast<std::int32_t>(left_end.newest - right_end.newest) > 0; // modulo 2^32
    if (left_end.finished != right_end.finished) return left_end.finished > right_end.finished;
    return left.copy && !right.copy;
}

auto life_of(const trace_source &source)
{
    const first_record &first = *source.first;
    return std::tuple(source.trace, source.page, source.node_id, source.node_number, first.counter, first.seq,
                      first.thread, first.component);
}

} // namespace

bool is_meant_as_trace_file(const std::string &path)
{
    reader::file_source file(path);
    reader::window window(file, first_look_bytes);
    return reader::read_header(window, ignore).has_value() || reader::is_meant_as_header(window);
}

void look_at(trace_source &source)
{
    reader::file_source file(source.path);
    source.bytes = file.size();
    reader::trace_reader trace(file, ignore, first_look_bytes);
    const auto &header = trace.header();
    if (!header) return;
    if (header->node_id.value_or(0) != 0) source.node_id = fmt::format("{:016x}", *header->node_id);
    source.node_number = header->node_number;
    if (!header->base_program.value_or("").empty()) source.program = *header->base_program;
    while (const auto record = trace.next_undecoded()) {
        if (!reader::carries_data(record->raw)) continue;
        const reader::record_header &raw = record->raw.header;
        source.first = first_record{raw.counter, raw.seq, raw.thread, raw.component, record->time};
        return;
    }
}

void drop_duplicates(std::vector<trace_source> &sources)
{
    using life = decltype(life_of(sources.front()));
    std::map<life, std::size_t> best;
    std::vector<bool> dropped(sources.size(), false);
    for (std::size_t i = 0; i < sources.size(); ++i) {
        if (!sources[i].first) continue;
        const auto [known, is_new] = best.emplace(life_of(sources[i]), i);
        if (is_new) continue;
        const bool better = holds_more(sources[i], sources[known->second]);
        dropped[better ? known->second : i] = true;
        if (better) known->second = i;
    }
    std::size_t i = 0;
    std::erase_if(sources, [&](const trace_source &) { return dropped[i++]; });
}

} // namespace qn::dump
