// qntrace spool: what the spool directories hold, as a table.
#include <algorithm>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <fmt/format.h>
#include <qn_tr.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/reader/reader.h"
#include "tools/qntrace/spool/table.h"
#include "tools/qntrace/spool/tree.h"

namespace qn::dump
{
namespace
{

struct spool_options {
    bool json = false;
    bool utc = false;
    std::vector<std::string> directories;
};

// Reads a copy whole, for the times of its records and for what is wrong with it. The exit status that it deserves.
int read_copy(const spooled_copy &copy, spool_row &row)
{
    finding_printer findings(copy.path);
    int status = status_sound;
    try {
        reader::file_source source(copy.file, copy.folder);
        reader::trace_reader trace(source, std::ref(findings));
        while (const auto record = trace.next())
            if (record->time && reader::carries_data(record->body)) row.saw(*record->time);
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(copy.path), error.what()));
        status = status_io_error;
        ++row.unreadable;
    }
    findings.finish();
    if (status == status_sound && findings.status() != status_sound) ++row.damaged;
    return std::max(status, findings.status());
}

int show_directories(const std::vector<std::string> &directories, const spool_options &options)
{
    int worst = status_sound;
    spool_table table;
    const auto visit = [&](const spooled_copy &copy) {
        spool_row &row = table.row_of(copy);
        ++(copy.name.of_page ? row.page_copies : row.file_copies);
        row.bytes += copy.bytes;
        worst = std::max(worst, read_copy(copy, row));
    };
    const auto report = [&](const std::string &path, const std::string &why) {
        write_message(fmt::format("{}: {}", printable_name(path), why));
        worst = status_io_error;
    };
    spool_tree tree(visit, report);
    for (const auto &directory : directories) tree.walk(directory);
    write_data(options.json ? table.json(options.utc) : table.text(options.utc));
    if (table.empty()) write_message("there are no copies");
    flush_data();
    return worst;
}

// Where the system's configuration file has pages copied to, as far as anything was; nothing when it cannot be read.
std::optional<std::vector<std::string>> configured_directories()
{
    trace_raw_config_t *raw = nullptr;
    trace_conf_data_t *data = nullptr;
    std::optional<std::vector<std::string>> directories;
    if (tr_read_conf_file_1(&raw) == 0 && tr_parse_all_sections_1(raw, &data, 1) == 0) {
        directories.emplace();
        for (qn_uint32_t i = 0; i < data->num_elements; ++i) {
            const trace_config_element_t &section = *data->pTraceConfigElement[i];
            if (section.elementType != TRACE_ELEMENT) continue;
            const std::string directory = section.element.trace_element.dest;
            std::error_code error; // set when it is there and out of reach
            const bool made = std::filesystem::exists(directory, error) || error;
            if (made && directory != "/dev/null") directories->push_back(directory);
        }
    }
    tr_free_trace_conf_data_1(data);
    tr_free_trace_raw_config_1(raw);
    return directories;
}

int show_configured_directories(const spool_options &options)
{
    const auto directories = configured_directories();
    if (directories) return show_directories(*directories, options);
    write_message("/var/qn/cfg/trace.conf cannot be read; name the spool directories");
    return status_io_error;
}

} // namespace

void add_spool_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<spool_options>();
    auto *command = app.add_subcommand("spool", "Tell what the spool directories hold of each trace");
    command->add_flag("--json", options->json, "Print one JSON object a trace");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    command->add_option("DIR", options->directories,
                        "Spool directories, or folders below or above them; without any, those of the\n"
                        "system's configuration file");
    command->callback([options, &status] {
        status = options->directories.empty() ? show_configured_directories(*options)
                                              : show_directories(options->directories, *options);
    });
}

} // namespace qn::dump
