// qntrace stats: how many records there are, of what, when, and how many are missing.
#include <algorithm>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/format/durations.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/stats/report.h"
#include "tools/qntrace/stats/tally.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t usual_top = 10;
constexpr std::int64_t most_buckets = 60; // what people can look over

struct stats_options {
    bool json = false;
    stats_format format = {false, usual_top};
    std::string bucket; // as given; empty: not
    std::vector<std::string> files;
    std::shared_ptr<const selection> selected;
};

// Counts the whole file without decoding its records.
void count_all(reader::trace_reader &trace, stats_tally &tally, loss_counter &lost)
{
    while (const auto record = trace.next_undecoded()) {
        const std::uint64_t missing = lost.pass(record->raw);
        if (reader::carries_data(record->raw)) tally.add(record->raw, record->time, missing);
    }
}

// What is lost is counted as well, whatever is selected: nobody knows what it was.
void count_selected(const trace_origin &origin, reader::trace_reader &trace, const selection &selected,
                    stats_tally &tally, loss_counter &lost)
{
    while (const auto record = trace.next()) {
        const std::uint64_t missing = lost.pass(record->raw);
        if (reader::carries_data(record->raw) && selected.admits(origin, *record))
            tally.add(record->raw, record->time, missing);
    }
}

int count_file(const std::string &path, const stats_options &options, stats_tally &tally)
{
    finding_printer findings(path);
    int status = status_sound;
    try {
        reader::file_source source(path);
        reader::trace_reader trace(source, std::ref(findings));
        if (trace.header()) {
            loss_counter lost(*trace.header());
            if (options.selected->admits_all())
                count_all(trace, tally, lost);
            else
                count_selected({path, *trace.header()}, trace, *options.selected, tally, lost);
            tally.lost.add(lost.so_far());
            ++tally.files;
        }
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(path), error.what()));
        status = status_io_error;
    }
    findings.finish();
    return std::max(status, findings.status());
}

// Throws std::invalid_argument.
std::optional<std::int64_t> bucket_width(const std::string &text)
{
    if (text.empty()) return std::nullopt;
    const auto width = parse_duration(text);
    if (!width || *width <= 0) throw std::invalid_argument("--bucket takes a duration, like 1s or 250us");
    return width;
}

int show_stats(const stats_options &options)
{
    stats_tally tally(bucket_width(options.bucket));
    const trace_set set = find_traces(options.files);
    int status = set.status;
    for (const trace_source &source : set.sources) status = std::max(status, count_file(source.path, options, tally));
    tally.buckets.finish(most_buckets);
    write_data(options.json ? stats_json(tally, options.format) : stats_text(tally, options.format));
    flush_data();
    return status;
}

} // namespace

void add_stats_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<stats_options>();
    auto *command = app.add_subcommand("stats", "Count records, bytes and losses");
    command->add_flag("--json", options->json, "Print one JSON object a line instead of text");
    command->add_flag("--utc", options->format.utc, "Print times in UTC instead of the local time zone");
    command->add_option("--bucket", options->bucket, "Count by stretches of time of this length; chosen when not given")
        ->type_name("DURATION");
    command
        ->add_option("--top", options->format.top,
                     fmt::format("How many components, ids and threads to show, {} unless given; 0: all", usual_top))
        ->type_name("N");
    options->selected = add_selection_options(*command);
    add_traces_option(*command, options->files);
    command->callback([options, &status] { status = show_stats(*options); });
}

} // namespace qn::dump
