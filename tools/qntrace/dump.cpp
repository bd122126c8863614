// qntrace dump: prints trace files whole.
#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/dump_json.h"
#include "tools/qntrace/dump_text.h"
#include "tools/qntrace/findings.h"
#include "tools/qntrace/output.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{
namespace
{

struct dump_options {
    bool json = false;
    bool raw = false;
    bool utc = false;
    std::vector<std::string> files;
};

// Prints one file; `Format` is text_dump or json_dump.
template <typename Format>
void dump_records(const std::string &path, reader::trace_reader &trace, Format &format, bool raw)
{
    if (!trace.header()) return;
    std::string line;
    format.header(line, path, *trace.header());
    write_data(line);
    while (const auto record = trace.next()) {
        if (!raw && !reader::carries_data(record->body)) continue;
        line.clear();
        format.record(line, *record);
        write_data(line);
    }
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
            dump_records(path, trace, format, options.raw);
        } else {
            if (!first && trace.header()) write_data("\n");
            text_dump format({options.raw, options.utc, locale_charset()});
            dump_records(path, trace, format, options.raw);
        }
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(path), error.what()));
        status = status_io_error;
    }
    findings.finish();
    return std::max(status, findings.status());
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
    command->add_option("FILE", options->files, "Trace files: live ones, pages, or copies")->required();
    command->callback([options, &status] { status = dump_files(*options); });
}

} // namespace qn::dump
