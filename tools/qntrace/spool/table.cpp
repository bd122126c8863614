#include "tools/qntrace/spool/table.h"

#include <algorithm>
#include <array>

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::dump
{
namespace
{

using json_object = nlohmann::ordered_json;
using folder_names = std::vector<std::string>;

// Cluster, cluster id, host, node id, program.
constexpr std::array<const char *, 5> level_names = {"cluster", "cluster_id", "host", "node_id", "program"};

bool earlier(const timespec &left, const timespec &right)
{
    return std::pair(left.tv_sec, left.tv_nsec) < std::pair(right.tv_sec, right.tv_nsec);
}

constexpr std::size_t columns = 9;
using cells = std::array<std::string, columns>;

constexpr std::array<bool, columns> right_aligned = {false, false, false, false, false, true, true, true, true};

const cells heads = {"NODE", "PROGRAM", "TRACE", "FIRST RECORD", "LAST RECORD", "PAGES", "FILES", "BAD", "BYTES"};

std::string time_cell(const std::optional<timespec> &time, timestamps &times)
{
    return time ? times.text(*time).value_or("-") : "-";
}

std::string node_cell(const folder_names &folders)
{
    std::string node;
    for (std::size_t i = 0; i + 1 < folders.size(); ++i) {
        if (i > 0) node += '/';
        append_escaped(node, folders[i], locale_charset());
    }
    return node.empty() ? "-" : node;
}

std::string name_cell(std::string_view name)
{
    std::string cell;
    append_escaped(cell, name, locale_charset());
    return cell;
}

cells cells_of(const folder_names &folders, const std::string &trace, const spool_row &row, timestamps &times)
{
    return {node_cell(folders),
            folders.empty() ? "-" : name_cell(folders.back()),
            name_cell(trace),
            time_cell(row.first, times),
            time_cell(row.last, times),
            std::to_string(row.page_copies),
            std::to_string(row.file_copies),
            std::to_string(row.damaged + row.unreadable),
            std::to_string(row.bytes)};
}

json_object time_json(const timespec &time, timestamps &times)
{
    json_object object;
    if (const auto text = times.text(time)) object["time"] = *text;
    object["time_ns"] = nanoseconds_text(time);
    return object;
}

void append_row(std::string &out, const folder_names &folders, const std::string &trace, const spool_row &row,
                timestamps &times)
{
    append_object(out, [&](text_encoder &encode) {
        json_object object = {{"type", "spool"}};
        for (std::size_t i = 0; i < folders.size(); ++i)
            object[level_names[level_names.size() - folders.size() + i]] = encode.text(folders[i]);
        object["trace"] = encode.text(trace);
        object["page_copies"] = row.page_copies;
        object["file_copies"] = row.file_copies;
        object["damaged"] = row.damaged;
        object["unreadable"] = row.unreadable;
        object["bytes"] = row.bytes;
        if (row.first) object["first"] = time_json(*row.first, times);
        if (row.last) object["last"] = time_json(*row.last, times);
        return object;
    });
}

} // namespace

void spool_row::saw(const timespec &time)
{
    if (!first || earlier(time, *first)) first = time;
    if (!last || earlier(*last, time)) last = time;
}

spool_row &spool_table::row_of(const spooled_copy &copy)
{
    // Counted from the copy: there are more folders below one that holds several spool directories, and those above the
    // host are then not known to be a cluster's.
    const std::size_t known = begin_with_cluster(copy.folders) ? level_names.size() : level_names.size() - 2;
    const std::size_t levels = std::min(copy.folders.size(), known);
    return rows_[{folder_names(copy.folders.end() - static_cast<std::ptrdiff_t>(levels), copy.folders.end()),
                  copy.name.trace}];
}

std::string spool_table::text(bool utc) const
{
    if (rows_.empty()) return {};
    timestamps times(utc);
    std::vector<cells> lines = {heads};
    for (const auto &[key, row] : rows_) lines.push_back(cells_of(key.first, key.second, row, times));

    std::array<std::size_t, columns> widths = {};
    for (const cells &line : lines)
        for (std::size_t i = 0; i < columns; ++i) widths[i] = std::max(widths[i], line[i].size());

    std::string out;
    for (const cells &line : lines) {
        for (std::size_t i = 0; i < columns; ++i) {
            if (i > 0) out += "  ";
            out += right_aligned[i] ? fmt::format("{:>{}}", line[i], widths[i])
                                    : fmt::format("{:<{}}", line[i], widths[i]);
        }
        out += '\n';
    }
    return out;
}

std::string spool_table::json(bool utc) const
{
    timestamps times(utc);
    std::string out;
    for (const auto &[key, row] : rows_) append_row(out, key.first, key.second, row, times);
    return out;
}

} // namespace qn::dump
