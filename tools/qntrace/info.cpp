// qntrace info: what a trace file is and what it holds, without its records.
#include <algorithm>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

struct info_options {
    bool json = false;
    bool utc = false;
    std::vector<std::string> files;
};

// The first or last record that carries data.
struct record_seen {
    std::uint32_t sequence = 0;
    std::optional<timespec> time;
};

struct ring_contents {
    std::uint64_t records = 0;
    std::uint64_t unfinished = 0;
    std::uint64_t lost = 0;
    std::optional<record_seen> oldest;
    std::optional<record_seen> newest;
};

// A ring's sequence numbers start at 2 and go up by 2, so that the oldest one tells how many came before it: records that
// were overwritten, and the fillers that closed off the end of the file each time it was reached.
std::uint64_t lost_before(std::uint32_t oldest_sequence) { return oldest_sequence > 2 ? (oldest_sequence - 2) / 2 : 0; }

ring_contents look_through(reader::trace_reader &trace)
{
    ring_contents contents;
    while (const auto record = trace.next()) {
        if (std::holds_alternative<reader::free_body>(record->body)) continue;
        if (std::holds_alternative<reader::unfinished_body>(record->body)) {
            ++contents.unfinished;
            continue;
        }
        const record_seen seen{record->raw.header.seq, record->time};
        if (!contents.oldest && !std::holds_alternative<reader::page_note_body>(record->body)) {
            contents.oldest = seen;
            contents.lost = lost_before(seen.sequence);
        }
        contents.newest = seen;
        ++contents.records;
    }
    return contents;
}

std::string escaped(std::string_view text)
{
    std::string out;
    append_quoted(out, text, locale_charset());
    return out;
}

std::string page_text(const reader::file_header &header)
{
    const auto state = header.page_state.value_or(0);
    if (state == 0) return "none: a trace of a single file";
    const auto name = page_state_name(state);
    return name.empty() ? fmt::format("state {}", state) : std::string(name);
}

class info_text
{
public:
    explicit info_text(bool utc) : times_(utc) {}

    std::string of(const std::string &path, const reader::file_header &header, const ring_contents &contents)
    {
        std::string out;
        line(out, "file", printable_name(path));
        line(out, "process", fmt::format("{}", header.pid));
        line(out, "program", escaped(header.program.value_or("")));
        line(out, "base name", escaped(header.base_program.value_or("")));
        line(out, "build", escaped(header.build_name.value_or("")));
        line(out, "platform", fmt::format("{}", header.platform));
        line(out, "format", fmt::format("version {}", header.version));
        line(out, "node", fmt::format("number {}, id {:#018x}", header.node_number, header.node_id.value_or(0)));
        line(out, "size",
             fmt::format("{} bytes, {} of them the ring", header.file_size, header.ring.end - header.ring.begin));
        line(out, "time base",
             fmt::format("{} ticks/s, {} ns at tick 0", header.time_info.timeinfo1,
                         static_cast<std::int64_t>(header.time_info.timeinfo2)));
        if (header.tz_offset_minutes) line(out, "zone", zone_text(*header.tz_offset_minutes));
        line(out, "page", page_text(header));
        line(out, "records",
             fmt::format("{}, {} lost before the oldest, {} unfinished", contents.records, contents.lost,
                         contents.unfinished));
        if (contents.oldest) line(out, "oldest", record(*contents.oldest));
        if (contents.newest) line(out, "newest", record(*contents.newest));
        return out;
    }

private:
    static void line(std::string &out, std::string_view name, std::string_view value)
    {
        out += fmt::format("{:<10} {}\n", name, value);
    }

    std::string record(const record_seen &seen)
    {
        const auto time = seen.time ? times_.text(*seen.time) : std::nullopt;
        return fmt::format("{}, sequence {}", time.value_or("time unknown"), seen.sequence);
    }

    timestamps times_;
};

json record_json(const record_seen &seen, timestamps &times)
{
    json record = {{"sequence", seen.sequence}};
    if (!seen.time) return record;
    record["time_ns"] = nanoseconds_text(*seen.time);
    if (const auto text = times.text(*seen.time)) record["time"] = *text;
    return record;
}

std::string info_json(const std::string &path, const reader::file_header &header, const ring_contents &contents,
                      bool utc)
{
    timestamps times(utc);
    std::string line;
    append_object(line, [&](text_encoder &encode) {
        json info = {{"type", "info"}};
        info["file"] = encode.text(path);
        info["pid"] = header.pid;
        info["program"] = encode.text(header.program.value_or(""));
        info["base_program"] = encode.text(header.base_program.value_or(""));
        info["build"] = encode.text(header.build_name.value_or(""));
        info["platform"] = header.platform;
        info["version"] = header.version;
        info["node_number"] = header.node_number;
        info["node_id"] = fmt::format("{:016x}", header.node_id.value_or(0));
        info["file_bytes"] = header.file_size;
        info["ring_bytes"] = header.ring.end - header.ring.begin;
        info["ticks_per_second"] = fmt::format("{}", header.time_info.timeinfo1);
        info["ns_at_tick_0"] = fmt::format("{}", static_cast<std::int64_t>(header.time_info.timeinfo2));
        info["page_state"] = header.page_state.value_or(0);
        info["records"] = contents.records;
        info["lost"] = contents.lost;
        info["unfinished"] = contents.unfinished;
        if (header.tz_offset_minutes) info["zone_minutes_west"] = *header.tz_offset_minutes;
        if (contents.oldest) info["oldest"] = record_json(*contents.oldest, times);
        if (contents.newest) info["newest"] = record_json(*contents.newest, times);
        return info;
    });
    return line;
}

int show_file(const std::string &path, const info_options &options, bool first)
{
    int status = status_sound;
    finding_printer findings(path);
    try {
        reader::file_source source(path);
        reader::trace_reader trace(source, std::ref(findings));
        if (trace.header()) {
            const ring_contents contents = look_through(trace);
            if (options.json) {
                write_data(info_json(path, *trace.header(), contents, options.utc));
            } else {
                if (!first) write_data("\n");
                write_data(info_text(options.utc).of(path, *trace.header(), contents));
            }
        }
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(path), error.what()));
        status = status_io_error;
    }
    findings.finish();
    return std::max(status, findings.status());
}

} // namespace

void add_info_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<info_options>();
    auto *command = app.add_subcommand("info", "Tell who wrote trace files, and what they hold");
    command->add_flag("--json", options->json, "Print one JSON object a file");
    command->add_flag("--utc", options->utc, "Print times in UTC instead of the local time zone");
    command->add_option("FILE", options->files, "Trace files: live ones, pages, or copies")->required();
    command->callback([options, &status] {
        int worst = status_sound;
        for (std::size_t i = 0; i < options->files.size(); ++i)
            worst = std::max(worst, show_file(options->files[i], *options, i == 0));
        flush_data();
        status = worst;
    });
}

} // namespace qn::dump
