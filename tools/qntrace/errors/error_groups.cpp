#include "tools/qntrace/errors/error_groups.h"

#include <algorithm>
#include <string_view>
#include <tuple>
#include <utility>

#include <fmt/format.h>

#include "tools/qntrace/format/record_names.h"

namespace qn::dump
{
namespace
{

std::optional<std::string> kept(const std::optional<std::string_view> &text)
{
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

// In order of time; what has no time comes before.
auto time_key(const std::optional<timespec> &time)
{
    return std::tuple(time.has_value(), time ? time->tv_sec : 0, time ? time->tv_nsec : 0);
}

void cut(std::string &text)
{
    if (text.size() <= error_groups::longest_text) return;
    // Not within a character.
    std::size_t end = error_groups::longest_text;
    while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;
    text.replace(end, std::string::npos, fmt::format("... [{} bytes more]", text.size() - end));
}

void cut(std::optional<std::string> &text)
{
    if (text) cut(*text);
}

void cut_texts(error_event &event)
{
    cut(event.message.text);
    cut(event.catalogue);
    cut(event.default_message);
    cut(event.file);
    cut(event.function);
    cut(event.ffdc_id);
}

} // namespace

error_event event_of(std::size_t source, const reader::trace_record &record, const reader::error_body &error,
                     message_catalogues &catalogues)
{
    const reader::record_header &header = record.raw.header;
    error_event event;
    event.source = source;
    event.time = record.time;
    event.component = component_name(header);
    event.thread = header.thread;
    event.seq = header.seq;
    event.error_id = error.error_id;
    event.message = message_of(error, catalogues);
    event.catalogue = kept(error.catalogue);
    event.message_set = error.message_set;
    event.message_number = error.message_number;
    event.default_message = kept(error.default_message);
    event.file = kept(error.file);
    event.function = kept(error.function);
    event.line = error.line;
    event.ffdc_id = kept(error.ffdc_id);
    return event;
}

std::string error_groups::key_of(const error_event &event) const
{
    switch (by_) {
    case error_grouping::node: return sources_[event.source].node();
    case error_grouping::component: return event.component;
    case error_grouping::message: break;
    }
    // The texts hold no NUL.
    return fmt::format("{} {} {} {}", event.error_id, event.message_set, event.message_number,
                       event.catalogue.value_or(std::string())) +
           '\0' + event.default_message.value_or(std::string());
}

void error_groups::add(error_event event)
{
    ++errors_;
    cut_texts(event);
    std::string key = key_of(event);
    const auto known = groups_.find(key);
    if (known == groups_.end() && groups_.size() == most_groups) {
        ++without_group_;
        return;
    }
    error_group &group = known != groups_.end() ? known->second : groups_[std::move(key)];
    ++group.count;
    ++group.nodes[sources_[event.source].node()];
    const auto time = time_key(event.time);
    if (event.time && (!group.first || time < time_key(group.first))) group.first = event.time;
    if (event.time && time >= time_key(group.last)) group.last = event.time;
    if (group.count == 1 || time >= time_key(group.latest.time)) group.latest = std::move(event);
}

std::vector<const error_group *> error_groups::sorted(error_order order, std::size_t most) const
{
    using row = decltype(groups_)::value_type;
    std::vector<const row *> rows;
    rows.reserve(groups_.size());
    for (const row &each : groups_) rows.push_back(&each);
    std::sort(rows.begin(), rows.end(), [order](const row *left, const row *right) {
        const auto rank = [order](const error_group &group) {
            return std::tuple(order == error_order::count ? group.count : 0, time_key(group.last), group.count);
        };
        // The highest rank first, and something fixed between equals.
        return std::tuple(rank(right->second), std::string_view(left->first)) <
               std::tuple(rank(left->second), std::string_view(right->first));
    });
    if (most != 0 && rows.size() > most) rows.resize(most);
    std::vector<const error_group *> groups;
    groups.reserve(rows.size());
    for (const row *each : rows) groups.push_back(&each->second);
    return groups;
}

} // namespace qn::dump
