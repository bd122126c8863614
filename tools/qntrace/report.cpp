// qntrace report: the records of many files as a page for a browser.
#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include <fmt/format.h>
#include <fmt/ranges.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/output_file.h"
#include "tools/qntrace/console/staged_output.h"
#include "tools/qntrace/report/page.h"
#include "tools/qntrace/select/selection.h"
#include "tools/qntrace/traces/clock_offsets.h"
#include "tools/qntrace/traces/read_merged.h"

namespace qn::dump
{
namespace
{

struct report_options {
    std::string output;
    std::string title;
    bool utc = false;
    std::vector<std::string> offsets;
    std::vector<std::string> files;
    std::shared_ptr<const selection> selected;
    std::string selection_text; // the options that select, as they were given
};

int write_report(const page_assets &assets, const trace_set &set, const clock_offsets &offsets,
                 const report_options &options)
{
    staged_output output(options.output, output_kind::stream, true);
    report_data data(set.sources);
    const auto after_file = [&data](std::size_t source, const losses &lost) { data.finish_file(source, lost); };
    const int status = read_merged(
        {set.sources, offsets, options.utc, after_file}, [&](std::size_t source, const merge_stream &stream) {
            data.pass(source, stream);
            if (options.selected->admits({set.sources[source].path, stream.header()}, stream.record()))
                data.add(source, stream.record());
        });
    data.finish();
    for (const auto &note : thinning_notes(data)) write_message(note);
    const int worst = std::max(set.status, status);
    const page_options shown = {options.utc, options.title, options.selection_text, worst != status_sound};
    output_file page(output.path());
    write_page(assets, data, shown, [&page](std::string_view text) { page.write(text); });
    page.close();
    output.publish();
    return worst;
}

int make_report(const report_options &options)
{
    const page_assets *assets = report_assets();
    if (assets == nullptr) {
        write_message("this build has no report: there was no npm when it was configured");
        return status_usage;
    }
    const clock_offsets offsets(options.offsets);
    const trace_set set = find_traces(options.files);
    offsets.check(set.sources);
    check_output(options.output, set);
    if (set.sources.empty()) {
        if (set.status == status_sound) write_message("there are no trace files");
        return set.status;
    }
    return write_report(*assets, set, offsets, options);
}

// Those that add_selection_options() has added, as far as they were given.
std::string given_selection(const CLI::App &command)
{
    std::vector<std::string> given;
    const auto selects = [](const CLI::Option *option) { return option->get_group() == "Selection"; };
    for (const CLI::Option *option : command.get_options(selects))
        if (option->count() > 0)
            given.push_back(fmt::format("{} {}", option->get_name(), fmt::join(option->results(), ",")));
    return fmt::format("{}", fmt::join(given, " "));
}

} // namespace

void add_report_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<report_options>();
    auto *command = app.add_subcommand("report", "Make a page for a browser: rates, timeline, errors, losses");
    command->add_option("-o,--output", options->output, "The HTML file to write")->type_name("OUT.html")->required();
    command->add_option("--title", options->title, "What the page is called; \"Trace report\" unless given")
        ->type_name("TEXT");
    options->title = "Trace report";
    command->add_flag("--utc", options->utc, "Show times in UTC instead of the local time zone");
    add_offset_option(*command, options->offsets);
    options->selected = add_selection_options(*command);
    add_traces_option(*command, options->files);
    command->callback([options, command, &status] {
        options->selection_text = given_selection(*command);
        status = make_report(*options);
    });
}

} // namespace qn::dump
