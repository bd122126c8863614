// qntrace export: records in the formats of other programs.
#include <algorithm>
#include <array>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/progress.h"
#include "tools/qntrace/console/staged_output.h"
#include "tools/qntrace/export/format.h"
#include "tools/qntrace/export/tree.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/traces/clock_offsets.h"
#include "tools/qntrace/traces/merged_traces.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{
namespace
{

struct export_options {
    std::string format;
    std::string output;
    std::string compress;
    bool force = false;
    std::vector<std::string> offsets;
    std::vector<std::string> files;
    std::shared_ptr<const selection> selected;
};

struct format_description {
    const char *name;
    output_kind output;
    bool in_one_order; // it takes all records by time, and not a source after the other
};

constexpr std::array<format_description, 4> formats = {{
    {"jsonl", output_kind::folder, false},
    {"ctf", output_kind::folder, false},
    {"chrome", output_kind::stream, true},
    {"sqlite", output_kind::file, true},
}};

std::vector<std::string> format_names()
{
    std::vector<std::string> names;
    names.reserve(formats.size());
    for (const auto &format : formats) names.emplace_back(format.name);
    return names;
}

const format_description &description_of(const std::string &name)
{
    return *std::find_if(formats.begin(), formats.end(), [&](const auto &format) { return format.name == name; });
}

compression compression_of(const export_options &options)
{
    if (options.compress.empty()) return compression::none;
    if (options.format != "jsonl") throw std::invalid_argument("--compress goes with --to jsonl only");
    return options.compress == "gzip" ? compression::gzip : compression::zstd;
}

std::unique_ptr<export_format> make_format(const export_options &options, const source_list &sources,
                                           const std::string &path)
{
    if (options.format == "jsonl") return make_jsonl_export(sources, path, compression_of(options));
    if (options.format == "ctf") return make_ctf_export(sources, path);
    if (options.format == "chrome") return make_chrome_export(sources, path);
    return make_sqlite_export(sources, path);
}

// The sources of a node, program and trace behind each other, in the order of time.
void sort_by_trace(source_list &sources)
{
    const auto key = [](const trace_source &source) {
        const bool timed = source.first && source.first->time;
        const timespec first = timed ? *source.first->time : timespec{};
        return std::tuple(folder_of(source), source.trace, timed, first.tv_sec, first.tv_nsec);
    };
    std::stable_sort(sources.begin(), sources.end(),
                     [&](const trace_source &left, const trace_source &right) { return key(left) < key(right); });
}

class exporting
{
public:
    exporting(const source_list &sources, const clock_offsets &offsets, const export_options &options,
              export_format &format)
        : sources_(sources), offsets_(offsets), selected_(*options.selected), format_(format),
          progress_(total_bytes(sources), false)
    {
    }

    // Both return an exit status.
    int in_one_order() { return run(sources_, 0); }

    int one_after_the_other()
    {
        int status = status_sound;
        for (std::size_t i = 0; i < sources_.size(); ++i) status = std::max(status, run({sources_[i]}, i));
        return status;
    }

private:
    static std::uint64_t total_bytes(const source_list &sources)
    {
        std::uint64_t bytes = 0;
        for (const trace_source &source : sources) bytes += source.bytes;
        return bytes;
    }

    // `first` is the index of the first one among all sources.
    int run(const source_list &sources, std::size_t first)
    {
        merge_settings settings;
        settings.clock_offset = [this](const trace_source &source) { return offsets_.of(source); };
        settings.before_message = [this] { progress_.clear(); };
        settings.after_file = [&](std::size_t source, const losses &lost) {
            format_.end_of_source(first + source, lost);
        };
        settings.utc = true;
        merged_traces traces(sources, std::move(settings));
        const int status = traces.run([&](std::size_t source, const merge_stream &stream) {
            progress_.show(++records_, bytes_done_ + traces.bytes_done());
            if (selected_.admits({sources[source].path, stream.header()}, stream.record()))
                format_.record(first + source, stream);
        });
        bytes_done_ += traces.bytes_done();
        return status;
    }

    const source_list &sources_;
    const clock_offsets &offsets_;
    const selection &selected_;
    export_format &format_;
    progress_line progress_;
    std::uint64_t records_ = 0;
    std::uint64_t bytes_done_ = 0;
};

int export_records(const export_options &options)
{
    const clock_offsets offsets(options.offsets);
    const format_description &chosen = description_of(options.format);
    compression_of(options);
    trace_set set = find_traces(options.files);
    if (set.sources.empty() && set.status != status_sound) return set.status;
    offsets.check(set.sources);
    check_output(options.output, set);
    if (set.sources.empty()) write_message("there are no trace files");
    if (!chosen.in_one_order) sort_by_trace(set.sources);

    staged_output output(options.output, chosen.output, options.force);
    const auto format = make_format(options, set.sources, output.path());
    exporting records(set.sources, offsets, options, *format);
    const int status = chosen.in_one_order ? records.in_one_order() : records.one_after_the_other();
    format->finish();
    output.publish();
    return std::max(set.status, status);
}

} // namespace

void add_export_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<export_options>();
    auto *command = app.add_subcommand("export", "Write the records of trace files in the format of other programs");
    command
        ->add_option("--to", options->format,
                     "jsonl: a folder of JSON lines, a file for each trace file; ctf: a folder of CTF 1.8 traces;\n"
                     "chrome: a JSON file of trace events; sqlite: a database")
        ->type_name("FORMAT")
        ->required()
        ->check(CLI::IsMember(format_names()));
    command->add_option("-o,--output", options->output, "The file or folder to make")->type_name("OUT")->required();
    command->add_flag("--force", options->force,
                      "Replace OUT when it is there: a file, or a folder that an export has made");
    command->add_option("--compress", options->compress, "Pack JSON lines: gzip or zstd")
        ->type_name("HOW")
        ->check(CLI::IsMember({"gzip", "zstd"}));
    add_offset_option(*command, options->offsets);
    options->selected = add_selection_options(*command);
    add_traces_option(*command, options->files);
    command->callback([options, &status] { status = export_records(*options); });
}

} // namespace qn::dump
