// Counts as tables with bars for people, and as JSON lines for programs.
#pragma once

#include <cstddef>
#include <string>

#include "tools/qntrace/stats/tally.h"

namespace qn::dump
{

struct stats_format {
    bool utc = false;
    std::size_t top = 0; // rows of the tables of components, ids and threads; 0: all
};

std::string stats_text(const stats_tally &tally, const stats_format &format);
std::string stats_json(const stats_tally &tally, const stats_format &format);

} // namespace qn::dump
