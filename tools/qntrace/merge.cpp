// qntrace merge: the records of many files in one order by time.
#include <algorithm>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/pager.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/text.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/traces/clock_offsets.h"
#include "tools/qntrace/traces/origin_members.h"
#include "tools/qntrace/traces/read_merged.h"
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
        for (const trace_source &source : sources) origins_.push_back(origin_with_path(source));
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
int print_merged(const std::vector<trace_source> &sources, const clock_offsets &offsets, const merge_options &options,
                 Format &format)
{
    std::string out;
    const int status =
        read_merged({sources, offsets, options.utc}, [&](std::size_t source, const merge_stream &stream) {
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
    const clock_offsets offsets(options.offsets);
    const trace_set set = find_traces(options.files);
    offsets.check(set.sources);
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
}

} // namespace

void add_merge_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<merge_options>();
    auto *command = app.add_subcommand("merge", "Print the records of many trace files in one order by time");
    command->add_flag("--json", options->json, "Print one JSON object a record instead of text");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    add_offset_option(*command, options->offsets);
    command->add_flag("--no-pager", options->no_pager, no_pager_help);
    options->selected = add_selection_options(*command);
    add_traces_option(*command, options->files);
    command->callback([options, &status] {
        const pager screen(!options->json && !options->no_pager);
        status = merge(*options);
    });
}

} // namespace qn::dump
