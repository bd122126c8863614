// What is missing, as members of a JSON object.
#pragma once

#include <nlohmann/json.hpp>

#include "tools/qntrace/traces/losses.h"

namespace qn::dump
{

inline nlohmann::ordered_json losses_json(const losses &lost)
{
    return {{"unfinished", lost.unfinished},
            {"missing", lost.missing},
            {"overwritten", lost.overwritten},
            {"unspooled_pages", lost.unspooled},
            {"last_reuse_time", lost.last_reuse_time}};
}

} // namespace qn::dump
