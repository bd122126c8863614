#include "tools/qntrace/errors/error_json.h"

#include "tools/qntrace/traces/origin_members.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

const char *origin_name(error_message::origin from)
{
    switch (from) {
    case error_message::origin::catalogue: return "catalogue";
    case error_message::origin::default_text: return "default";
    case error_message::origin::ids: break;
    }
    return "ids";
}

// What the message is, and where it was noticed.
json message_members(const error_event &event, const json_text &text)
{
    const auto text_or_null = [&text](const std::optional<std::string> &given) {
        return given ? text(*given) : json(nullptr);
    };
    return {{"error_id", event.error_id},
            {"message", text(event.message.text)},
            {"message_from", origin_name(event.message.from)},
            {"catalogue", text_or_null(event.catalogue)},
            {"message_set", event.message_set},
            {"message_number", event.message_number},
            {"default_message", text_or_null(event.default_message)},
            {"source_file", text_or_null(event.file)},
            {"line", event.line},
            {"function", text_or_null(event.function)},
            {"ffdc_id", text_or_null(event.ffdc_id)}};
}

json place_members(const error_event &event, const trace_source &source, const json_text &text)
{
    json object;
    for (const auto &[name, value] : origin_members(source)) object[name] = text(value);
    object["file"] = text(source.path);
    object["comp"] = text(event.component);
    object["thread"] = event.thread;
    object["seq"] = event.seq;
    return object;
}

} // namespace

json time_json(const std::optional<timespec> &time, timestamps &times)
{
    const auto written = time ? times.text(*time) : std::nullopt;
    return {{"time", written ? json(*written) : json(nullptr)},
            {"time_ns", time ? json(nanoseconds_text(*time)) : json(nullptr)}};
}

json event_json(const error_event &event, const trace_source &source, timestamps &times, const json_text &text)
{
    json object = {{"type", "error"}};
    object.update(time_json(event.time, times));
    object.update(place_members(event, source, text));
    object.update(message_members(event, text));
    return object;
}

json group_json(const error_group &group, const trace_source &source, timestamps &times, const json_text &text)
{
    json object = {{"type", "group"}, {"errors", group.count}};
    object["first"] = time_json(group.first, times);
    object["last"] = time_json(group.last, times);
    json nodes = json::array();
    for (const auto &[node, count] : group.nodes) nodes.push_back({{"node", text(node)}, {"errors", count}});
    object["nodes"] = std::move(nodes);
    object["latest"] = event_json(group.latest, source, times, text);
    return object;
}

} // namespace qn::dump
