// qntrace check: whether trace files are sound, and what is wrong with those that are not.
#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/check/file_check.h"
#include "tools/qntrace/check/report.h"
#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{
namespace
{

struct check_options {
    bool json = false;
    bool quiet = false;
    bool utc = false;
    std::vector<std::string> files;
};

int check_one(const std::string &path, const check_options &options)
{
    try {
        reader::file_source source(path);
        const file_check checked = check_file(source);
        if (!options.quiet)
            write_data(options.json ? check_json(path, checked, options.utc) : check_text(path, checked, options.utc));
        return checked.sound() ? status_sound : status_damaged;
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(path), error.what()));
        return status_io_error;
    }
}

int check_all(const check_options &options)
{
    const trace_set set =
        find_traces(options.files, duplicates::kept, options.quiet ? passed_over::untold : passed_over::told);
    if (set.sources.empty() && set.status == status_sound) write_message("there are no trace files");
    int worst = set.status;
    for (const trace_source &source : set.sources) worst = std::max(worst, check_one(source.path, options));
    flush_data();
    return worst;
}

} // namespace

void add_check_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<check_options>();
    auto *command = app.add_subcommand("check", "Tell whether trace files are sound, and what is wrong with them");
    auto *json = command->add_flag("--json", options->json, "Print one JSON object a file instead of text");
    command->add_flag("-q,--quiet", options->quiet, "Print nothing; the exit status tells")->excludes(json);
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    add_traces_option(*command, options->files);
    command->callback([options, &status] { status = check_all(*options); });
}

} // namespace qn::dump
