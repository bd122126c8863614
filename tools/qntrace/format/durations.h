// Durations as a user writes them: a decimal number and its unit, +1.5ms, -2s, 250us, 10ns.
#pragma once

#include <cstdint>
#include <ctime>
#include <optional>
#include <string>
#include <string_view>

namespace qn::dump
{

// In nanoseconds, exactly. Nothing when the text is no duration, has a fraction of a nanosecond, or is longer than 292
// years.
std::optional<std::int64_t> parse_duration(std::string_view text);

// The other way round, in the largest unit of which it is a whole number: 1500us, 2s.
std::string duration_text(std::int64_t nanoseconds);

// Times that no timespec can hold stay as they are.
timespec later_by(const timespec &time, std::int64_t nanoseconds);

// Nothing for times that are further than 292 years from 1970.
std::optional<std::int64_t> nanoseconds_of(const timespec &time);

} // namespace qn::dump
