// Filing the report of a failure: identifier, system log, record. No state of its own; the one lock is the turn to write
// to the system log.
#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <exception>
#include <string>
#include <syslog.h>
#include <unistd.h>

#include <qn_ffdc.h>

#include "platform/common/files.h"
#include "platform/common/system_log.h"
#include "platform/ffdc/failure_id.h"
#include "platform/ffdc/record_file.h"
#include "platform/ffdc/text.h"

namespace qn::ffdc
{
namespace
{
constexpr size_t most_detail_bytes = 4096;

// What a caller tells about a failure; its pointers may be null.
struct failure {
    const char *id;
    const char *component, *subsystem;
    const char *file, *vers;
    int line;
    int log_event;
    int error_id;
    bytes detail;
    const char *detail_file;
    const char *text;
};

int priority_of(int log_event)
{
    if (log_event == FC_EVENT_WARNING) return LOG_WARNING;
    return log_event == FC_EVENT_INFO ? LOG_INFO : LOG_ERR;
}

const char *severity_of(int log_event)
{
    if (log_event == FC_EVENT_WARNING) return "warning";
    return log_event == FC_EVENT_INFO ? "info" : "error";
}

void write_system_log(const failure &what)
{
    const std::string component = one_line_or_nothing(what.component);
    const std::string text = one_line_or_nothing(what.text);
    const platform::system_log_turn turn;
    if (!turn) return;
    const platform::standard_numbers_taken other_numbers;
    syslog(priority_of(what.log_event), "%s: error %d: %s (failure id %s)", component.c_str(), what.error_id,
           text.c_str(), what.id);
}

// Not by gmtime_r(): a child that is forked while another thread is in there would wait for it for good.
std::string present_time()
{
    const auto now = std::chrono::floor<std::chrono::seconds>(std::chrono::system_clock::now());
    const auto today = std::chrono::floor<std::chrono::days>(now);
    const std::chrono::year_month_day date(today);
    const std::chrono::hh_mm_ss time(now - today);
    char text[64];
    std::snprintf(text, sizeof text, "%04d-%02u-%02uT%02d:%02d:%02dZ", static_cast<int>(date.year()),
                  static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                  static_cast<int>(time.hours().count()), static_cast<int>(time.minutes().count()),
                  static_cast<int>(time.seconds().count()));
    return text;
}

void append_line(std::string &record, const char *key, const std::string &value)
{
    if (value.empty()) return;
    record.append(key).append(": ").append(value) += '\n';
}

std::string source_of(const failure &what)
{
    if (what.file == nullptr) return {};
    return one_line(what.file) + ":" + std::to_string(what.line);
}

std::string detail_of(const failure &what)
{
    std::string digits;
    append_hex(digits, what.detail.first(std::min(what.detail.size(), most_detail_bytes)));
    return digits;
}

std::string record_of(const failure &what)
{
    std::string record;
    append_line(record, "id", what.id);
    append_line(record, "time", present_time());
    append_line(record, "process", std::to_string(getpid()));
    append_line(record, "component", one_line_or_nothing(what.component));
    append_line(record, "subsystem", one_line_or_nothing(what.subsystem));
    append_line(record, "source", source_of(what));
    append_line(record, "version", one_line_or_nothing(what.vers));
    append_line(record, "severity", severity_of(what.log_event));
    append_line(record, "error", std::to_string(what.error_id));
    append_line(record, "text", one_line_or_nothing(what.text));
    append_line(record, "detail_length", what.detail.empty() ? "" : std::to_string(what.detail.size()));
    append_line(record, "detail", detail_of(what));
    append_line(record, "detail_file", one_line_or_nothing(what.detail_file));
    return record += '\n';
}
} // namespace
} // namespace qn::ffdc

int fc_log_error_1(fc_eid_t id, int, const char *component, const char *subsystem, const char *file, const char *vers,
                   int line, int, int log_event, int error_id, const void *detail_data, int detail_data_len,
                   const char *detail_data_file, const char *syslog_text)
{
    const qn::platform::no_cancel whole;
    fc_eid_t made;
    qn::ffdc::make_failure_id(made);
    if (id != nullptr) std::copy(std::begin(made), std::end(made), id);
    try {
        const qn::ffdc::failure what{.id = made,
                                     .component = component,
                                     .subsystem = subsystem,
                                     .file = file,
                                     .vers = vers,
                                     .line = line,
                                     .log_event = log_event,
                                     .error_id = error_id,
                                     .detail = qn::ffdc::detail_bytes(detail_data, detail_data_len),
                                     .detail_file = detail_data_file,
                                     .text = syslog_text};
        qn::ffdc::write_system_log(what);
        return qn::ffdc::append_record(component, qn::ffdc::record_of(what));
    } catch (const std::exception &) {
        return ENOMEM;
    }
}
