// Wall-clock times as RFC 3339 writes them, with nanoseconds: 2026-11-21T05:12:01.123456789+01:00
#pragma once

#include <ctime>
#include <optional>
#include <string>
#include <string_view>

namespace qn::dump
{

class timestamps
{
public:
    // In UTC (with the suffix Z), or in the local zone.
    explicit timestamps(bool utc) : utc_(utc) {}

    // Nothing for a year that RFC 3339 cannot write, that is outside 0000 to 9999.
    std::optional<std::string> text(const timespec &time);
    // The same behind `out`; false, and nothing, for such a year.
    bool append(std::string &out, const timespec &time);
    // Width of a text.
    std::size_t width() const;

private:
    bool break_down(time_t second);

    bool utc_;
    // Most records share their second with the one before.
    std::optional<time_t> second_;
    bool writable_ = false;
    std::string prefix_; // up to the seconds
    std::string suffix_; // the zone
};

// Nanoseconds since the epoch, exact for every timespec.
std::string nanoseconds_text(const timespec &time);

} // namespace qn::dump
