// Points in time as a user writes them:
//
//   2026-11-21T05:12:01.123456789+01:00   without a fraction or a zone too; local time then
//   @1795237921.123456789                 seconds since the epoch
//   -10min                                before now: ns, us, ms, s, min, h or d
#pragma once

#include <ctime>
#include <string_view>

namespace qn::dump
{

// Throws std::invalid_argument; what() says what was expected.
timespec parse_time(std::string_view text, const timespec &now);

} // namespace qn::dump
