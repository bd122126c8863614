// qntrace config: what the library makes of a configuration file.
//
// The file is read by the library's own reader and interpreter, and its sections go through the rules of the spooler,
// so that what is shown is what holds.
#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include <fmt/format.h>
#include <nlohmann/json.hpp>
#include <qn_tr.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json_text.h"
#include "trace/files/compiled_pattern.h"
#include "trace/spooling/spool_shape.h"
#include "trace/traceutils/traceutils.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

struct config_options {
    bool json = false;
    std::string file = tr::configuration_file_name;
};

// One line of a section: for people, and as a member of its object.
struct field {
    const char *label;
    const char *unit;
    const char *member;
    json value;
};

struct section_report {
    const char *type; // "trace", "spool", "default" or "faulty"
    unsigned line;
    std::string name;
    std::vector<field> fields;
    std::string fault;
    std::vector<std::string> notes;
};

bool is_number(const std::string &key)
{
    constexpr std::array numbers = {"pages",
                                    "size",
                                    "tracesize",
                                    "spool_cleanup_interval",
                                    "spool_retention_days",
                                    "spool_directory_max_size",
                                    "spool_startup_interval"};
    return std::find(numbers.begin(), numbers.end(), key) != numbers.end();
}

// What was written and is not taken as it was meant.
std::vector<std::string> notes_on_values(const trace_raw_section_t &section)
{
    std::vector<std::string> notes;
    for (qn_int32_t i = 0; i < section.num_element; ++i) {
        const std::string key = section.kv_list[i].key;
        const std::string value = section.kv_list[i].pValue;
        const auto number = static_cast<qn_uint32_t>(std::atoi(value.c_str()));
        if (std::any_of(key.begin(), key.end(), [](unsigned char c) { return std::isupper(c) != 0; }))
            notes.push_back(fmt::format("{} is not used: keys are looked up in lower case", key));
        else if (key == "sync_interval")
            notes.emplace_back("sync_interval is not used");
        else if (is_number(key) && value != std::to_string(number))
            notes.push_back(fmt::format("{} = {} is taken as {}", key, value, number));
        else if ((key == "spooling" || key == "cleanup") && strcasecmp(value.c_str(), "ON") != 0 &&
                 strcasecmp(value.c_str(), "OFF") != 0)
            notes.push_back(fmt::format("{} = {} is neither ON nor OFF", key, value));
    }
    return notes;
}

section_report trace_report(const trace_element_t &section)
{
    const tr::spool_shape shape = tr::shape_from_section(section);
    const bool spooled = tr::spooling_says_on(section.spooling);
    section_report report{
        .type = "trace",
        .fields = {{"pattern", "", "pattern", section.pattern},
                   {"spooling", "", "spooling", spooled},
                   {"destination", "", "dest", section.dest},
                   {"pages", "", "pages", shape.pages},
                   {"page size", " bytes", "page_bytes", shape.page_bytes},
                   {"trace size", " bytes", "trace_bytes", shape.pages * shape.page_bytes},
                   {"sync interval", " seconds", "sync_seconds", shape.sync_seconds}},
    };
    if (!tr::compiled_pattern(section.pattern)) report.fault = "the pattern is no POSIX extended regular expression";
    if (section.pattern[0] == '\0') report.notes.emplace_back("the empty pattern matches every trace file");
    if (spooled && std::strcmp(section.dest, "/dev/null") == 0)
        report.notes.emplace_back("full pages are written anew without having been copied");
    return report;
}

section_report spool_report(const spool_element_t &section)
{
    return {
        .type = "spool",
        .fields = {{"directory", "", "spool_dir", section.spool_dir},
                   {"cleanup", "", "cleanup", section.cleanup},
                   {"cleanup interval", "", "cleanup_interval", section.cleanup_interval},
                   {"retention", " days", "retention_days", section.retention_days},
                   {"directory size", "", "dir_size", section.dir_size},
                   {"startup interval", "", "startup_interval", section.startup_interval}},
        .notes = {"the library itself removes nothing from a spool directory"},
    };
}

section_report default_report(const default_element_t &section, bool supplies)
{
    section_report report{.type = "default"};
    if (supplies)
        report.fields = {{"trace size", " bytes", "trace_bytes", section.trace_size}};
    else
        report.notes.emplace_back("only the first default section counts");
    report.notes.emplace_back("dest and spooling do not reach the trace sections");
    return report;
}

section_report report_of(const trace_config_element_t &element, bool supplies)
{
    switch (element.elementType) {
    case TRACE_ELEMENT: return trace_report(element.element.trace_element);
    case SPOOL_ELEMENT: return spool_report(element.element.spool_element);
    default: return default_report(element.element.default_element, supplies);
    }
}

// The file in the library's two forms.
class configuration
{
public:
    configuration() = default;
    configuration(const configuration &) = delete;
    configuration &operator=(const configuration &) = delete;
    ~configuration()
    {
        tr_free_trace_conf_data_1(data_);
        tr_free_trace_raw_config_1(raw_);
    }

    qn_int32_t read(const std::string &file)
    {
        const qn_int32_t status = tr::read_conf_file(file.c_str(), &raw_, &findings_);
        return status != 0 ? status : tr_parse_all_sections_1(raw_, &data_, 1);
    }
    std::vector<section_report> sections() const;

private:
    trace_raw_config_t *raw_ = nullptr;
    trace_conf_data_t *data_ = nullptr;
    tr::conf_findings findings_;
};

// Sections, elements and faults each stand in file order; the faults that no section is left for come last.
std::vector<section_report> configuration::sections() const
{
    std::vector<section_report> reports;
    auto line = findings_.section_lines.begin();
    auto fault = findings_.faults.begin();
    const auto add_fault = [&] {
        reports.push_back({.type = "faulty", .line = fault->line, .name = fault->section, .fault = fault->text});
        ++fault;
    };
    const trace_raw_section_t *supplier = tr_find_section_by_name_1(raw_, "default");
    qn_uint32_t element = 0;
    for (qn_int32_t i = 0; i < raw_->num_element; ++i) {
        if (raw_->ppChunkLst[i]->chunk_type != 1) continue;
        const auto &section = *static_cast<const trace_raw_section_t *>(raw_->ppChunkLst[i]->pChunk);
        if (section.bErr_flag != 0) {
            add_fault();
        } else if (element < data_->num_elements) {
            const trace_config_element_t &meaning = *data_->pTraceConfigElement[element++];
            section_report &report = reports.emplace_back(report_of(meaning, &section == supplier));
            report.line = *line;
            report.name = section.sect_name;
            const auto notes = notes_on_values(section);
            report.notes.insert(report.notes.begin(), notes.begin(), notes.end());
        }
        ++line;
    }
    while (fault != findings_.faults.end()) add_fault();
    return reports;
}

std::string value_text(const json &value)
{
    if (value.is_boolean()) return value.get<bool>() ? "on" : "off";
    if (!value.is_string()) return value.dump();
    std::string text;
    append_quoted(text, value.get<std::string>(), locale_charset());
    return text;
}

std::string text_of(const section_report &section)
{
    std::string out = fmt::format("line {}: {} section ", section.line, section.type);
    append_quoted(out, section.name, locale_charset());
    out += '\n';
    const auto add_line = [&](std::string_view label, std::string_view text) {
        out += fmt::format("    {:<17} ", label);
        append_escaped(out, text, locale_charset());
        out += '\n';
    };
    for (const field &each : section.fields)
        out += fmt::format("    {:<17} {}{}\n", each.label, value_text(each.value), each.unit);
    if (!section.fault.empty()) add_line("fault", section.fault);
    for (const std::string &note : section.notes) add_line("note", note);
    return out;
}

std::string json_of(const section_report &section)
{
    std::string line;
    append_object(line, [&](text_encoder &encode) {
        json object = {{"type", section.type}};
        object["section"] = encode.text(section.name);
        object["line"] = section.line;
        for (const field &each : section.fields)
            object[each.member] = each.value.is_string() ? encode.text(each.value.get<std::string>()) : each.value;
        if (!section.fault.empty()) object["fault"] = encode.text(section.fault);
        for (const std::string &note : section.notes) object["notes"].push_back(encode.text(note));
        return object;
    });
    return line;
}

// Why a file of that name cannot be read; empty when it was.
std::string read_failure(const std::string &file, configuration &config)
{
    std::error_code ignored;
    if (std::filesystem::is_directory(file, ignored)) return std::strerror(EISDIR);
    const qn_int32_t status = config.read(file);
    if (status == QN_TR_ECONFOPEN) return std::strerror(errno);
    return status == 0 ? "" : fmt::format("the library's reader returned {}", status);
}

int show_config(const config_options &options)
{
    configuration config;
    const std::string failure = read_failure(options.file, config);
    if (!failure.empty()) {
        write_message(fmt::format("{}: {}", printable_name(options.file), failure));
        return status_io_error;
    }
    int status = status_sound;
    const auto sections = config.sections();
    for (const section_report &section : sections) {
        write_data(options.json ? json_of(section) : text_of(section));
        if (!section.fault.empty()) status = status_damaged;
    }
    if (sections.empty()) write_message(fmt::format("{}: there are no sections", printable_name(options.file)));
    flush_data();
    return status;
}

} // namespace

void add_config_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<config_options>();
    auto *command = app.add_subcommand("config", "Tell what a configuration file means, and what is wrong with it");
    command->add_flag("--json", options->json, "Print one JSON object a section");
    command->add_option("FILE", options->file, "A configuration file; without it, the system's")->capture_default_str();
    command->callback([options, &status] { status = show_config(*options); });
}

} // namespace qn::dump
