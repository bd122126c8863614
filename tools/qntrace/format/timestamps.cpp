#include "tools/qntrace/format/timestamps.h"

#include <cstdlib>

#include <fmt/compile.h>
#include <fmt/format.h>

namespace qn::dump
{
namespace
{

std::string zone_suffix(long offset_minutes)
{
    const long minutes = std::labs(offset_minutes);
    return fmt::format("{}{:02}:{:02}", offset_minutes < 0 ? '-' : '+', minutes / 60, minutes % 60);
}

} // namespace

bool timestamps::break_down(time_t second)
{
    constexpr time_t year_0000 = -62167219200;
    constexpr time_t year_9999_end = 253402300799;
    long offset_minutes = 0;
    struct tm parts = {};
    if (!utc_ && localtime_r(&second, &parts) != nullptr) offset_minutes = parts.tm_gmtoff / 60;
    // A zone whose offset has seconds, as before the time of time zones, is shown at the whole minute.
    const time_t shown = second + offset_minutes * 60;
    if (shown < year_0000 || shown > year_9999_end || gmtime_r(&shown, &parts) == nullptr) return false;
    prefix_ = fmt::format("{:04}-{:02}-{:02}T{:02}:{:02}:{:02}", parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday,
                          parts.tm_hour, parts.tm_min, parts.tm_sec);
    suffix_ = utc_ ? std::string(1, 'Z') : zone_suffix(offset_minutes);
    return true;
}

bool timestamps::append(std::string &out, const timespec &time)
{
    // Far outside the years that can be written, and safe to add a zone to.
    constexpr time_t limit = time_t{1} << 50;
    if (time.tv_sec < -limit || time.tv_sec > limit) return false;
    if (second_ != time.tv_sec) {
        writable_ = break_down(time.tv_sec);
        second_ = time.tv_sec;
    }
    if (!writable_) return false;
    out += prefix_;
    fmt::format_to(std::back_inserter(out), FMT_COMPILE(".{:09}"), time.tv_nsec);
    out += suffix_;
    return true;
}

std::optional<std::string> timestamps::text(const timespec &time)
{
    std::string text;
    if (!append(text, time)) return std::nullopt;
    return text;
}

std::size_t timestamps::width() const
{
    constexpr std::string_view in_utc = "2026-11-21T05:12:01.123456789Z";
    constexpr std::string_view in_a_zone = "2026-11-21T05:12:01.123456789+01:00";
    return utc_ ? in_utc.size() : in_a_zone.size();
}

std::string nanoseconds_text(const timespec &time)
{
    __extension__ using int128 = __int128;
    return fmt::format("{}", int128{time.tv_sec} * 1'000'000'000 + time.tv_nsec);
}

} // namespace qn::dump
