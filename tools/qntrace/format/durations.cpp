#include "tools/qntrace/format/durations.h"

#include <algorithm>
#include <array>
#include <utility>

#include <fmt/format.h>

namespace qn::dump
{
namespace
{

constexpr std::int64_t ns_per_second = 1'000'000'000;

constexpr std::array<std::pair<std::string_view, std::int64_t>, 7> units = {{
    {"d", 86'400 * ns_per_second},
    {"h", 3'600 * ns_per_second},
    {"min", 60 * ns_per_second},
    {"s", ns_per_second},
    {"ms", 1'000'000},
    {"us", 1'000},
    {"ns", 1},
}};

bool add_digit(std::int64_t &value, char digit)
{
    return !__builtin_mul_overflow(value, 10, &value) && !__builtin_add_overflow(value, digit - '0', &value);
}

bool is_digit(char c) { return c >= '0' && c <= '9'; }

} // namespace

std::optional<std::int64_t> parse_duration(std::string_view text)
{
    const bool negative = text.starts_with('-');
    if (negative || text.starts_with('+')) text.remove_prefix(1);
    const auto number_end = std::find_if_not(text.begin(), text.end(), [](char c) { return is_digit(c) || c == '.'; });
    const auto number = text.substr(0, static_cast<std::size_t>(number_end - text.begin()));
    const auto unit = std::find_if(units.begin(), units.end(),
                                   [&](const auto &known) { return known.first == text.substr(number.size()); });
    if (unit == units.end() || number.empty() || !is_digit(number.front()) || !is_digit(number.back()))
        return std::nullopt;

    const auto point = std::min(number.find('.'), number.size());
    std::int64_t whole = 0;
    for (const char digit : number.substr(0, point))
        if (!add_digit(whole, digit)) return std::nullopt;
    std::int64_t result = 0;
    if (__builtin_mul_overflow(whole, unit->second, &result)) return std::nullopt;
    std::int64_t scale = unit->second;
    for (const char digit : number.substr(std::min(point + 1, number.size()))) {
        // A digit that is worth less than a nanosecond may only be 0. The 60 of a minute has no more than one.
        if (digit == '.' || (scale % 10 != 0 && digit != '0')) return std::nullopt;
        scale /= 10;
        if (__builtin_add_overflow(result, (digit - '0') * scale, &result)) return std::nullopt;
    }
    return negative ? -result : result;
}

std::string duration_text(std::int64_t nanoseconds)
{
    const auto unit =
        std::find_if(units.begin(), units.end(), [&](const auto &known) { return nanoseconds % known.second == 0; });
    return fmt::format("{}{}", nanoseconds / unit->second, unit->first);
}

timespec later_by(const timespec &time, std::int64_t nanoseconds)
{
    timespec sum = {0, time.tv_nsec + nanoseconds % ns_per_second};
    std::int64_t seconds = nanoseconds / ns_per_second;
    if (sum.tv_nsec < 0) {
        sum.tv_nsec += ns_per_second;
        --seconds;
    } else if (sum.tv_nsec >= ns_per_second) {
        sum.tv_nsec -= ns_per_second;
        ++seconds;
    }
    // The time comes from a file, and may be the last one there is.
    return __builtin_add_overflow(time.tv_sec, seconds, &sum.tv_sec) ? time : sum;
}

std::optional<std::int64_t> nanoseconds_of(const timespec &time)
{
    std::int64_t result = 0;
    if (__builtin_mul_overflow(std::int64_t{time.tv_sec}, ns_per_second, &result)) return std::nullopt;
    if (__builtin_add_overflow(result, std::int64_t{time.tv_nsec}, &result)) return std::nullopt;
    return result;
}

} // namespace qn::dump
