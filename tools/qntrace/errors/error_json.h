// Error records and their groups as members of JSON objects.
#pragma once

#include <functional>
#include <string_view>

#include <nlohmann/json.hpp>

#include "tools/qntrace/errors/error_groups.h"
#include "tools/qntrace/format/timestamps.h"

namespace qn::dump
{

// How a text out of a trace becomes one of JSON.
using json_text = std::function<nlohmann::ordered_json(std::string_view)>;

// "time" and "time_ns"; null where there is none.
nlohmann::ordered_json time_json(const std::optional<timespec> &time, timestamps &times);

// `source` is the event's.
nlohmann::ordered_json event_json(const error_event &event, const trace_source &source, timestamps &times,
                                  const json_text &text);
// `source` is that of the latest event.
nlohmann::ordered_json group_json(const error_group &group, const trace_source &source, timestamps &times,
                                  const json_text &text);

} // namespace qn::dump
