#include "tools/qntrace/errors/error_text.h"

#include <fmt/format.h>

#include "tools/qntrace/format/wrap.h"

namespace qn::dump
{
namespace
{

constexpr std::size_t count_width = 8;
constexpr std::size_t name_width = 7;
constexpr std::size_t indent = count_width + 2;

std::string ids_text(const error_event &event)
{
    return fmt::format("{}, set {} message {}", event.error_id, event.message_set, event.message_number);
}

} // namespace

void error_text::event(std::string &out, const error_event &event)
{
    out += time_text(event.time);
    out += "  ";
    out += origin_text(event);
    out += '\n';
    out.append(indent, ' ');
    append_wrapped(out, escaped(event.message.text), indent, options_.columns);
    details(out, event);
}

void error_text::group(std::string &out, const error_group &group, error_grouping by)
{
    const error_event &latest = group.latest;
    switch (by) {
    case error_grouping::message: title(out, group.count, escaped(latest.message.text)); break;
    case error_grouping::node: title(out, group.count, escaped(sources_[latest.source].node())); break;
    case error_grouping::component: title(out, group.count, escaped(latest.component)); break;
    }
    if (group.nodes.size() > 1) {
        std::string nodes;
        for (const auto &[node, count] : group.nodes)
            nodes += fmt::format("{}{} {}", nodes.empty() ? "" : ", ", escaped(node), count);
        field(out, "nodes", nodes);
    }
    if (group.count > 1) field(out, "first", time_text(group.first));
    field(out, group.count > 1 ? "last" : "time", time_text(group.last));
    field(out, "from", origin_text(latest));
    if (by != error_grouping::message) field(out, "message", escaped(latest.message.text));
    details(out, latest);
}

void error_text::details(std::string &out, const error_event &event) const
{
    std::string error = ids_text(event);
    if (event.catalogue) error += " of " + escaped(*event.catalogue);
    field(out, "error", error);
    if (event.file || event.function || event.line != 0) {
        std::string place = fmt::format("{}:{}", event.file ? escaped(*event.file) : "?", event.line);
        if (event.function) place += " in " + escaped(*event.function);
        field(out, "at", place);
    }
    if (event.ffdc_id) field(out, "ffdc", escaped(*event.ffdc_id));
}

void error_text::losses_line(std::string &out, const losses &lost) const
{
    out +=
        fmt::format("lost     {}\n", lost.any() ? losses_text(lost, options_.utc) : "nothing that the files tell of");
}

void error_text::title(std::string &out, std::uint64_t count, std::string_view text) const
{
    out += fmt::format("{:>{}}  ", count, count_width);
    append_wrapped(out, text, indent, options_.columns);
}

void error_text::field(std::string &out, std::string_view name, std::string_view text) const
{
    out.append(indent, ' ');
    out += fmt::format("{:<{}}  ", name, name_width);
    append_wrapped(out, text, indent + name_width + 2, options_.columns);
}

std::string error_text::time_text(const std::optional<timespec> &time)
{
    return time ? timestamps_.text(*time).value_or("-") : "-";
}

std::string error_text::origin_text(const error_event &event) const
{
    const trace_source &source = sources_[event.source];
    return fmt::format("{}  {}  {:#010x}",
                       escaped(fmt::format("{}/{}/{}", source.node(), source.program, source.trace)),
                       escaped(event.component), event.thread);
}

std::string error_text::escaped(std::string_view text) const
{
    std::string out;
    append_escaped(out, text, options_.printable);
    return out;
}

} // namespace qn::dump
