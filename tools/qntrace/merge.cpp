// qntrace merge: the records of many files in one order by time.
#include <algorithm>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/pager.h"
#include "tools/qntrace/console/progress.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/text.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/traces/merged_traces.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{
namespace
{

struct merge_options {
    bool json = false;
    bool utc = false;
    bool no_pager = false;
    std::vector<std::string> offsets;
    std::vector<std::string> files;
    std::shared_ptr<const selection> selected;
};

// By the name of a node.
using node_offsets = std::map<std::string, std::int64_t>;

// Throws std::invalid_argument.
node_offsets parse_offsets(const std::vector<std::string> &texts)
{
    node_offsets offsets;
    for (const auto &text : texts) {
        const auto equals = text.rfind('=');
        const auto offset = equals == std::string::npos ? std::nullopt : parse_duration(text.substr(equals + 1));
        if (!offset || equals == 0) throw std::invalid_argument("--offset takes NODE=DURATION, like host3=+1.5ms");
        offsets[text.substr(0, equals)] = *offset;
    }
    return offsets;
}

bool names_node(const std::string &name, const trace_source &source)
{
    return name == source.host || name == source.node_id || name == source.node();
}

// Throws std::invalid_argument for a node that no file is of: its offset would be lost without a word.
void check_offsets(const node_offsets &offsets, const std::vector<trace_source> &sources)
{
    for (const auto &node : offsets) {
        const bool known = std::any_of(sources.begin(), sources.end(),
                                       [&](const trace_source &source) { return names_node(node.first, source); });
        if (!known) throw std::invalid_argument(fmt::format("no file is of the node {}", printable_name(node.first)));
    }
}

std::int64_t offset_of(const trace_source &source, const node_offsets &offsets)
{
    for (const auto &[name, offset] : offsets)
        if (names_node(name, source)) return offset;
    return 0;
}

// Node, program and trace, as the first column shows them.
std::string origin_text(const trace_source &source)
{
    return printable_name(fmt::format("{}/{}/{}", source.node(), source.program, source.trace));
}

class merge_text
{
public:
    merge_text(const std::vector<trace_source> &sources, bool utc) : format_({false, utc, locale_charset()})
    {
        for (const trace_source &source : sources) origins_.push_back(origin_text(source));
        if (std::equal(origins_.begin() + 1, origins_.end(), origins_.begin())) return;
        for (const auto &origin : origins_) width_ = std::max(width_, origin.size());
    }

    std::string heads() const
    {
        std::string out;
        origin_column(out, "SOURCE");
        format_.column_heads(out);
        return out;
    }

    void record(std::string &out, std::size_t source, const reader::trace_record &record)
    {
        origin_column(out, origins_[source]);
        format_.record(out, record);
    }

private:
    void origin_column(std::string &out, std::string_view text) const
    {
        if (width_ == 0) return;
        out += text;
        out.append(width_ - text.size() + 2, ' ');
    }

    text_dump format_;
    std::vector<std::string> origins_; // by source
    std::size_t width_ = 0;            // of the first column; 0: all records are of one trace, and there is none
};

class merge_json
{
public:
    merge_json(const std::vector<trace_source> &sources, bool utc) : format_({false, utc})
    {
        for (const trace_source &source : sources) {
            text_members origin;
            if (!source.cluster.empty()) origin.emplace_back("cluster", source.cluster);
            origin.emplace_back("node", source.node());
            if (!source.node_id.empty()) origin.emplace_back("node_id", source.node_id);
            origin.emplace_back("program", source.program);
            origin.emplace_back("trace", source.trace);
            origin.emplace_back("file", source.path);
            origins_.push_back(std::move(origin));
        }
    }

    void record(std::string &out, std::size_t source, const reader::trace_record &record)
    {
        format_.record(out, record, origins_[source]);
    }

private:
    json_dump format_;
    std::vector<text_members> origins_; // by source
};

template <typename Format>
int print_merged(const std::vector<trace_source> &sources, const node_offsets &offsets, const merge_options &options,
                 Format &format)
{
    std::uint64_t total_bytes = 0;
    for (const trace_source &source : sources) total_bytes += source.bytes;
    progress_line progress(total_bytes);
    merge_settings settings;
    settings.clock_offset = [&offsets](const trace_source &source) { return offset_of(source, offsets); };
    settings.before_message = [&progress] { progress.clear(); };
    settings.utc = options.utc;
    merged_traces traces(sources, std::move(settings));

    std::string out;
    std::uint64_t records = 0;
    const int status = traces.run([&](std::size_t source, const merge_stream &stream) {
        progress.show(++records, traces.bytes_done());
        if (!options.selected->admits({sources[source].path, stream.header()}, stream.record())) return;
        out.clear();
        format.record(out, source, stream.record());
        write_data(out);
    });
    flush_data();
    return status;
}

int merge(const merge_options &options)
{
    try {
        const node_offsets offsets = parse_offsets(options.offsets);
        const trace_set set = find_traces(options.files);
        check_offsets(offsets, set.sources);
        if (set.sources.empty()) {
            if (set.status == status_sound) write_message("there are no trace files");
            return set.status;
        }
        if (options.json) {
            merge_json format(set.sources, options.utc);
            return std::max(set.status, print_merged(set.sources, offsets, options, format));
        }
        merge_text format(set.sources, options.utc);
        write_data(format.heads());
        return std::max(set.status, print_merged(set.sources, offsets, options, format));
    } catch (const std::invalid_argument &error) {
        write_message(error.what());
        return status_usage;
    }
}

} // namespace

void add_merge_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<merge_options>();
    auto *command = app.add_subcommand("merge", "Print the records of many trace files in one order by time");
    command->add_flag("--json", options->json, "Print one JSON object a record instead of text");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    command
        ->add_option("--offset", options->offsets,
                     "NODE=DURATION: add this to the times of a node's records, like host3=+1.5ms;\n"
                     "the node is named by its host or its 16-digit identifier")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    command->add_flag("--no-pager", options->no_pager, no_pager_help);
    options->selected = add_selection_options(*command);
    command
        ->add_option("FILE", options->files,
                     "Trace files, pages and copies; traces by name, for all of their pages; folders, for all\n"
                     "copies below them and the trace files in them")
        ->required();
    command->callback([options, &status] {
        const pager screen(!options->json && !options->no_pager);
        status = merge(*options);
    });
}

} // namespace qn::dump
