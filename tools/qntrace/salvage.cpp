// qntrace salvage: the sound records of a damaged file, as a trace file that is sound or as JSON lines.
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include <fmt/format.h>
#include <sys/stat.h>

#include "tools/qntrace/commands.h"
#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/console/staged_output.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/salvage/ring_writer.h"
#include "tools/qntrace/salvage/sound_records.h"
#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{
namespace
{

struct salvage_options {
    bool json = false;
    bool utc = false;
    bool force = false;
    std::string file;
    std::string output; // empty: standard output
};

struct outcome {
    std::uint64_t saved = 0;
    std::uint64_t left_out = 0;
    std::uint64_t unreadable_bytes = 0;
    losses lost;
};

// Hands every sound record to `save`, which tells whether it could be saved.
template <typename Save>
outcome save_records(reader::trace_reader &trace, const Save &save)
{
    outcome result;
    sound_records sound(*trace.header(), [&](const reader::trace_record &record, const cu_timeinfo_t &base) {
        const bool saved = save(record, base);
        if (reader::carries_data(record.body)) ++(saved ? result.saved : result.left_out);
    });
    loss_counter lost(*trace.header());
    while (const auto record = trace.next()) {
        lost.pass(record->raw);
        sound.pass(*record);
    }
    sound.finish();
    result.left_out += sound.left_out();
    result.unreadable_bytes = trace.unreadable_bytes();
    result.lost = lost.so_far();
    return result;
}

outcome save_trace(reader::byte_source &source, reader::trace_reader &trace, std::FILE *out)
{
    std::vector<std::byte> header(trace.header()->ring.begin);
    source.read_at(0, header);
    ring_writer ring(out, std::move(header), *trace.header());
    const auto result = save_records(trace, [&ring](const reader::trace_record &record, const cu_timeinfo_t &base) {
        return ring.add(record, base);
    });
    ring.finish();
    return result;
}

template <typename Write>
outcome save_json(const salvage_options &options, reader::trace_reader &trace, const Write &write)
{
    json_dump format({false, options.utc});
    std::string line;
    format.header(line, options.file, *trace.header());
    write(line);
    return save_records(trace, [&](const reader::trace_record &record, const cu_timeinfo_t &) {
        if (!reader::carries_data(record.body)) return true;
        line.clear();
        format.record(line, record);
        write(line);
        return true;
    });
}

// Tells what was saved and what was not.
std::string summary(const salvage_options &options, const outcome &result)
{
    auto text =
        fmt::format("{}: {} record{} saved", printable_name(options.file), result.saved, result.saved == 1 ? "" : "s");
    std::string lost;
    const auto add = [&lost](const std::string &what) {
        if (!lost.empty()) lost += ", ";
        lost += what;
    };
    if (result.left_out != 0)
        add(fmt::format("{} damaged record{} left out", result.left_out, result.left_out == 1 ? "" : "s"));
    if (result.unreadable_bytes != 0) add(fmt::format("{} bytes of the ring unreadable", result.unreadable_bytes));
    if (result.lost.any()) add(losses_text(result.lost, options.utc));
    return lost.empty() ? text : fmt::format("{}; lost: {}", text, lost);
}

struct file_closer {
    void operator()(std::FILE *file) const { std::fclose(file); }
};

[[noreturn]] void cannot_be_written(const std::string &path)
{
    throw output_error(fmt::format("{}: cannot be written: {}", printable_name(path), std::strerror(errno)));
}

outcome save(const salvage_options &options, reader::byte_source &source, reader::trace_reader &trace)
{
    if (options.output.empty()) {
        const auto result = save_json(options, trace, write_data);
        flush_data();
        return result;
    }
    struct stat status = {};
    const mode_t mode = stat(options.file.c_str(), &status) == 0 ? status.st_mode & 0666 : 0600;
    staged_output output(options.output, output_kind::file, options.force);
    const std::unique_ptr<std::FILE, file_closer> file(std::fopen(output.path().c_str(), "wbe"));
    if (!file) cannot_be_written(options.output);
    fchmod(fileno(file.get()), mode);
    const auto write = [&file](std::string_view data) { std::fwrite(data.data(), 1, data.size(), file.get()); };
    const auto result = options.json ? save_json(options, trace, write) : save_trace(source, trace, file.get());
    // What was refused earlier is not forgotten: a full disk may have room for the last bytes again.
    const bool written = std::ferror(file.get()) == 0;
    if (std::fflush(file.get()) != 0 || !written) cannot_be_written(options.output);
    output.publish();
    return result;
}

int salvage(const salvage_options &options)
{
    finding_printer findings(options.file);
    bool damaged = false;
    const auto report = [&](const reader::finding &found) {
        damaged = damaged || found.level == reader::finding::severity::damage;
        findings(found);
    };
    try {
        reader::file_source source(options.file);
        reader::trace_reader trace(source, report);
        if (!trace.header()) return status_damaged;
        const auto result = save(options, source, trace);
        findings.finish();
        write_message(summary(options, result));
        return damaged || result.left_out != 0 ? status_damaged : status_sound;
    } catch (const reader::io_error &error) {
        write_message(fmt::format("{}: {}", printable_name(options.file), error.what()));
        return status_io_error;
    }
}

bool same_file(const std::string &left, const std::string &right)
{
    struct stat one = {};
    struct stat other = {};
    return stat(left.c_str(), &one) == 0 && stat(right.c_str(), &other) == 0 && one.st_dev == other.st_dev &&
           one.st_ino == other.st_ino;
}

int checked_salvage(const salvage_options &options)
{
    if (options.output.empty() && !options.json) {
        write_message("salvage writes a trace file with -o OUT, or JSON lines with --json");
        return status_usage;
    }
    if (same_file(options.file, options.output)) {
        write_message(fmt::format("{}: the damaged file itself is not written to", printable_name(options.output)));
        return status_usage;
    }
    return salvage(options);
}

} // namespace

void add_salvage_command(CLI::App &app, int &status)
{
    const auto options = std::make_shared<salvage_options>();
    auto *command = app.add_subcommand("salvage", "Save the sound records of a damaged trace file in a new one");
    command->add_option("-o,--output", options->output, "The new file; not replaced when it is there already")
        ->type_name("OUT");
    command->add_flag("--force", options->force, "Replace OUT when it is there already");
    command->add_flag("--json", options->json, "Write one JSON object a line, to standard output without -o");
    command->add_flag("--utc", options->utc, "Write times in UTC instead of the local time zone");
    command->add_option("FILE", options->file, "A trace file, page or copy")->required();
    command->callback([options, &status] { status = checked_salvage(*options); });
}

} // namespace qn::dump
