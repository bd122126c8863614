#include "tools/qntrace/stats/tally.h"

#include <algorithm>
#include <cstring>
#include <tuple>

#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/record_names.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

using qn::tr::format::kind;

constexpr std::size_t most_keys = std::size_t{1} << 20;
constexpr std::uint64_t unknown_kind = 0x10000;                    // above all kinds
constexpr std::size_t id_at = qn::tr::format::record_header_bytes; // in all kinds that have one

// Four characters, 0 behind a NUL: what follows that is stale.
std::uint32_t component_key(const reader::record_header &header)
{
    const auto name = component_name(header);
    std::uint32_t key = 0;
    std::memcpy(&key, name.data(), name.size());
    return key;
}

std::uint64_t kind_key(const reader::raw_record &record)
{
    if (record.oversized) return unknown_kind;
    switch (static_cast<kind>(record.header.function)) {
    case kind::identifier:
    case kind::page_note:
    case kind::data_blocks:
    case kind::values_32:
    case kind::values_64:
    case kind::error:
    case kind::strings:
    case kind::start:
    case kind::time_calibration:
    case kind::restart: return record.header.function;
    default: return unknown_kind;
    }
}

std::optional<std::uint32_t> id_in(const reader::raw_record &record)
{
    switch (static_cast<kind>(record.header.function)) {
    case kind::identifier:
    case kind::data_blocks:
    case kind::values_32:
    case kind::values_64:
    case kind::error:
    case kind::strings: break;
    default: return std::nullopt;
    }
    if (!record.bytes.holds(id_at, sizeof(std::uint32_t))) return std::nullopt;
    const std::uint32_t id = record.bytes.u32(id_at);
    return id == id_of_no_id ? std::nullopt : std::optional(id);
}

} // namespace

void amount_table::find(std::uint64_t key)
{
    const auto known = rows_.find(key);
    if (known != rows_.end())
        last_ = &known->second;
    else
        last_ = rows_.size() < most_keys ? &rows_[key] : &others_;
    last_key_ = key;
}

std::vector<amount_table::row> amount_table::largest(std::size_t most) const
{
    std::vector<row> rows;
    rows.reserve(rows_.size());
    for (const auto &[key, counted] : rows_) rows.push_back({key, counted});
    std::sort(rows.begin(), rows.end(), [](const row &left, const row &right) {
        return std::tuple(right.counted.records, left.key) < std::tuple(left.counted.records, right.key);
    });
    if (most != 0 && rows.size() > most) rows.resize(most);
    return rows;
}

std::size_t amount_table::keys_left_out(std::size_t most) const
{
    return most != 0 && rows_.size() > most ? rows_.size() - most : 0;
}

void stats_tally::add(const reader::raw_record &record, const std::optional<timespec> &time, std::uint64_t missing)
{
    const std::uint64_t bytes = record.header.length;
    const std::uint32_t component = component_key(record.header);
    all.add(bytes);
    components.add(component, bytes);
    kinds.add(kind_key(record), bytes);
    threads.add(record.header.thread, bytes);
    if (const auto id = id_in(record)) ids.add(std::uint64_t{component} << 32 | *id, bytes);

    const auto ns = time ? nanoseconds_of(*time) : std::nullopt;
    if (!ns) {
        ++without_time;
        return;
    }
    buckets.add(*ns, bytes, missing);
    if (!first_ns || *ns < *first_ns) first_ns = *ns;
    if (!last_ns || *ns > *last_ns) last_ns = *ns;
}

std::string_view component_of_key(const std::uint64_t &key)
{
    return reader::cut_at_nul({reinterpret_cast<const char *>(&key), sizeof(std::uint32_t)}).text;
}

std::string_view kind_of_key(std::uint64_t key)
{
    switch (static_cast<kind>(key)) {
    case kind::identifier: return kind_name(reader::identifier_body{});
    case kind::page_note: return kind_name(reader::page_note_body{});
    case kind::data_blocks: return kind_name(reader::data_blocks_body{});
    case kind::values_32: return kind_name(reader::values_32_body{});
    case kind::values_64: return kind_name(reader::values_64_body{});
    case kind::error: return kind_name(reader::error_body{});
    case kind::strings: return kind_name(reader::strings_body{});
    case kind::start: return kind_name(reader::start_body{});
    case kind::time_calibration: return kind_name(reader::calibration_body{});
    case kind::restart: return kind_name(reader::restart_body{});
    default: return kind_name(reader::unknown_body{});
    }
}

std::uint32_t id_of_key(std::uint64_t key) { return static_cast<std::uint32_t>(key); }

std::uint64_t component_key_of_id_key(std::uint64_t key) { return key >> 32; }

} // namespace qn::dump
