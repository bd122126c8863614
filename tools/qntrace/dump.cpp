// qntrace dump: prints trace files, or the records of them that are asked for.
#include <algorithm>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/pager.h"
#include "tools/qntrace/console/terminal.h"
#include "tools/qntrace/follow/follow.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/text.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/select/last.h"
#include "tools/qntrace/select/number.h"
#include "tools/qntrace/select/selection.h"

namespace qn::dump
{
namespace
{

struct dump_options {
    bool json = false;
    bool raw = false;
    bool utc = false;
    bool no_pager = false;
    std::string color = "auto";
    bool colored = false; // what follows from it
    std::optional<std::size_t> last;
    std::shared_ptr<const selection> selected;
    std::vector<std::string> files;
    bool follow = false;
    follow_options following;
};

// Prints one file; `Format` is text_dump or json_dump.
template <typename Format>
void dump_records(const std::string &path, reader::trace_reader &trace, Format &format, const dump_options &options)
{
    if (!trace.header()) return;
    std::string line;
    format.header(line, path, *trace.header());
    write_data(line);
    const auto print = [&](const reader::trace_record &record) {
        line.clear();
        format.record(line, record);
        write_data(line);
    };
    const trace_origin origin{path, *trace.header()};
    last_records newest(options.last.value_or(0));
    while (const auto record = trace.next()) {
        if (!options.raw && !reader::carries_data(record->body)) continue;
        if (!options.selected->admits(origin, *record)) continue;
        if (options.last) {
            newest.keep(*record);
        } else {
            print(*record);
        }
    }
    newest.for_each(print);
}

int dump_file(const std::string &path, const dump_options &options, bool first)
{
    finding_printer findings(path);
    int status = status_sound;
    try {
        reader::file_source source(path);
        reader::trace_reader trace(source, std::ref(findings));
        if (options.json) {
            json_dump format({options.raw, options.utc});
            dump_records(path, trace, format, options);
        } else {
            if (!first && trace.header()) write_data("\n");
            text_dump format({options.raw, options.utc, locale_charset(), options.colored});
            dump_records(path, trace, format, options);
        }
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(path), error.what()));
        status = status_io_error;
    }
    findings.finish();
    return std::max(status, findings.status());
}

void add_last_option(CLI::App &command, std::optional<std::size_t> &last)
{
    const auto take = [&last](const std::string &number) {
        last = parse_number(number);
        if (!last) throw CLI::ValidationError("--last", "expected a number");
    };
    command.add_option_function<std::string>("--last", take, "Of the selected records only the newest N of each file")
        ->type_name("N")
        ->group("Selection");
}

int dump_and_follow(const dump_options &options)
{
    if (options.files.size() != 1) {
        write_message("--follow takes one FILE");
        return status_usage;
    }
    follow_options following = options.following;
    following.output = {options.json, options.utc, options.colored, options.last, options.selected};
    return follow(options.files[0], following);
}

int dump_files(const dump_options &options)
{
    int worst = status_sound;
    for (std::size_t i = 0; i < options.files.size(); ++i) {
        worst = std::max(worst, dump_file(options.files[i], options, i == 0));
    }
    flush_data();
    return worst;
}

} // namespace

void add_dump_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<dump_options>();
    auto *command = app.add_subcommand("dump", "Print trace files: the header, then every record, oldest first");
    command->add_flag("--json", options->json, "Print one JSON object a line instead of text");
    command->add_flag("--raw", options->raw,
                      "Also print fillers and unfinished records, and with every record its offset, its length\n"
                      "and the fields of its header as they are stored");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    command->add_option("--color", options->color, "Whether the text is coloured; auto: on a terminal")
        ->type_name("WHEN")
        ->check(CLI::IsMember({"auto", "always", "never"}));
    command->add_flag("--no-pager", options->no_pager, no_pager_help);
    options->selected = add_selection_options(*command);
    add_last_option(*command, options->last);
    auto *follows = command
                        ->add_flag("--follow", options->follow,
                                   "Then go on with the records that are written from now on, as follow does")
                        ->excludes("--raw");
    add_follow_options(*command, options->following, follows);
    command->add_option("FILE", options->files, "Trace files: live ones, pages, or copies")->required();
    command->callback([options, &status] {
        options->colored = wants_color(options->color);
        if (options->follow) {
            status = dump_and_follow(*options);
            return;
        }
        const pager screen(!options->json && !options->no_pager);
        status = dump_files(*options);
    });
}

} // namespace qn::dump
