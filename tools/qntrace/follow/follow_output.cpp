#include "tools/qntrace/follow/follow_output.h"

#include <algorithm>

#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"

namespace qn::dump
{
namespace
{

std::variant<text_dump, json_dump> format_for(const follow_output_options &options)
{
    if (options.json) return json_dump({false, options.utc});
    return text_dump({false, options.utc, locale_charset(), options.colored});
}

} // namespace

follow_output::follow_output(const follow_output_options &options)
    : options_(options), format_(format_for(options)), timestamps_(options.utc)
{
    if (options_.last) before_.emplace(*options_.last);
}

void follow_output::entered(const std::string &path, const reader::file_header &header)
{
    path_ = path;
    header_ = header;
    // As text it stands above the columns, once; programs are told of every file.
    header_due_ = options_.json || !any_header_;
}

void follow_output::record(const reader::trace_record &record)
{
    if (!options_.selected->admits({path_, *header_}, record)) return;
    if (before_)
        before_->keep(record);
    else
        print(record);
}

void follow_output::print_header()
{
    if (!header_due_) return;
    header_due_ = false;
    any_header_ = true;
    line_.clear();
    std::visit([this](auto &format) { format.header(line_, path_, *header_); }, format_);
    write_data(line_);
}

void follow_output::print(const reader::trace_record &record)
{
    print_header();
    line_.clear();
    std::visit([&](auto &format) { format.record(line_, record); }, format_);
    write_data(line_);
}

void follow_output::caught_up()
{
    if (header_) print_header();
    if (!before_) return;
    const auto newest = *std::exchange(before_, std::nullopt);
    newest.for_each([this](const reader::trace_record &record) { print(record); });
}

// Nobody has asked for the records before, so nothing is said of them.
void follow_output::lost(const lost_records &lost)
{
    if (before_) return;
    const bool one = lost.count == 1;
    tell_loss(path_, fmt::format("{} {} overwritten before {} read, from sequence number {} on, between {} and {}",
                                 lost.count, one ? "record was" : "records were", one ? "it was" : "they were",
                                 lost.first_seq, time_text(lost.before), time_text(lost.behind)));
}

std::string follow_output::time_text(const std::optional<timespec> &time)
{
    return (time ? timestamps_.text(*time) : std::nullopt).value_or("an unknown time");
}

void follow_output::found(const reader::finding &finding)
{
    if (before_ && finding.level != reader::finding::severity::damage) return;
    const auto where = finding.offset ? fmt::format("offset {}: ", *finding.offset) : std::string();
    tell_loss(path_, where + finding.text);
}

void follow_output::tell(const std::string &path, const std::string &what)
{
    write_message(fmt::format("{}: {}", printable_name(path), what));
}

void follow_output::tell_loss(const std::string &path, const std::string &what)
{
    status_ = std::max<int>(status_, status_damaged);
    tell(path, what);
}

} // namespace qn::dump
