#include "tools/qntrace/select/time.h"

#include <array>
#include <charconv>
#include <cstdint>
#include <limits>
#include <optional>
#include <stdexcept>

namespace qn::dump
{
namespace
{

constexpr long nanoseconds_a_second = 1'000'000'000;

// Takes a text apart from its beginning.
class scanner
{
public:
    explicit scanner(std::string_view text) : rest_(text) {}

    bool at_end() const { return rest_.empty(); }
    std::string_view rest() const { return rest_; }

    bool skip(std::string_view one_of)
    {
        if (rest_.empty() || one_of.find(rest_.front()) == std::string_view::npos) return false;
        rest_.remove_prefix(1);
        return true;
    }

    // The digits that stand here.
    std::string_view digits()
    {
        const auto found = rest_.substr(0, rest_.find_first_not_of("0123456789"));
        rest_.remove_prefix(found.size());
        return found;
    }

    // Exactly that many digits.
    std::optional<int> number(std::size_t width)
    {
        const auto found = digits();
        if (found.size() != width) return std::nullopt;
        int value = 0;
        std::from_chars(found.data(), found.data() + found.size(), value);
        return value;
    }

    // Nanoseconds of a fraction, 0 when none stands here; nothing for one that is not exact or has no digit.
    std::optional<long> fraction()
    {
        if (!skip(".")) return 0;
        const auto found = digits();
        if (found.empty() || found.size() > 9) return std::nullopt;
        long value = 0;
        for (std::size_t i = 0; i < 9; ++i) {
            value = value * 10 + (i < found.size() ? found[i] - '0' : 0);
        }
        return value;
    }

private:
    std::string_view rest_;
};

std::optional<std::int64_t> whole(std::string_view digits)
{
    std::int64_t value = 0;
    const auto [stopped, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
    if (error != std::errc()) return std::nullopt;
    return value;
}

// SECONDS[.FRACTION], behind the @.
std::optional<timespec> since_the_epoch(scanner text)
{
    const auto seconds = whole(text.digits());
    const auto fraction = text.fraction();
    if (!seconds || !fraction || !text.at_end()) return std::nullopt;
    return timespec{*seconds, *fraction};
}

// NUMBER UNIT, behind the minus.
std::optional<timespec> before(const timespec &now, scanner text)
{
    __extension__ using int128 = __int128;
    static constexpr struct {
        std::string_view name;
        std::int64_t nanoseconds;
    } units[] = {
        {"ns", 1},
        {"us", 1000},
        {"ms", 1'000'000},
        {"s", nanoseconds_a_second},
        {"min", 60 * nanoseconds_a_second},
        {"h", 3600 * nanoseconds_a_second},
        {"d", 86400 * nanoseconds_a_second},
    };
    const auto amount = whole(text.digits());
    if (!amount) return std::nullopt;
    for (const auto &unit : units) {
        if (unit.name != text.rest()) continue;
        const int128 time =
            int128{now.tv_sec} * nanoseconds_a_second + now.tv_nsec - int128{*amount} * unit.nanoseconds;
        int128 seconds = time / nanoseconds_a_second;
        long rest = static_cast<long>(time % nanoseconds_a_second);
        if (rest < 0) {
            rest += nanoseconds_a_second;
            --seconds;
        }
        if (seconds < std::numeric_limits<time_t>::min()) return std::nullopt;
        return timespec{static_cast<time_t>(seconds), rest};
    }
    return std::nullopt;
}

// Z, +HH:MM or -HH:MM: seconds east of Greenwich.
std::optional<long> zone(scanner &text)
{
    if (text.skip("Zz")) return 0;
    const bool west = text.rest().starts_with('-');
    if (!text.skip("+-")) return std::nullopt;
    const auto hours = text.number(2);
    const bool colon = text.skip(":");
    const auto minutes = text.number(2);
    if (!hours || !colon || !minutes || *hours > 23 || *minutes > 59) return std::nullopt;
    const long seconds = *hours * 3600L + *minutes * 60L;
    return west ? -seconds : seconds;
}

// YYYY-MM-DDTHH:MM:SS
std::optional<tm> date_and_time(scanner &text)
{
    static constexpr struct {
        std::size_t width;
        std::string_view behind;
    } parts[] = {{4, "-"}, {2, "-"}, {2, "Tt "}, {2, ":"}, {2, ":"}, {2, ""}};
    std::array<int, std::size(parts)> values = {};
    for (std::size_t i = 0; i < std::size(parts); ++i) {
        const auto value = text.number(parts[i].width);
        if (!value || (!parts[i].behind.empty() && !text.skip(parts[i].behind))) return std::nullopt;
        values[i] = *value;
    }
    const auto [year, month, day, hour, minute, second] = values;
    if (month < 1 || month > 12 || day < 1 || hour > 23 || minute > 59 || second > 60) return std::nullopt;
    tm result = {};
    result.tm_year = year - 1900;
    result.tm_mon = month - 1;
    result.tm_mday = day;
    // A day that the month does not have becomes one of the next month.
    timegm(&result);
    if (result.tm_mday != day) return std::nullopt;
    result.tm_hour = hour;
    result.tm_min = minute;
    result.tm_sec = second;
    return result;
}

std::optional<timespec> calendar_time(scanner text)
{
    auto parts = date_and_time(text);
    const auto fraction = parts ? text.fraction() : std::nullopt;
    if (!fraction) return std::nullopt;
    if (text.at_end()) {
        parts->tm_isdst = -1; // whether it was in force is for the time zone to know
        return timespec{mktime(&*parts), *fraction};
    }
    const auto east = zone(text);
    if (!east || !text.at_end()) return std::nullopt;
    return timespec{timegm(&*parts) - *east, *fraction};
}

} // namespace

timespec parse_time(std::string_view text, const timespec &now)
{
    std::optional<timespec> time;
    if (text.starts_with('@')) {
        time = since_the_epoch(scanner(text.substr(1)));
    } else if (text.starts_with('-')) {
        time = before(now, scanner(text.substr(1)));
    } else {
        time = calendar_time(scanner(text));
    }
    if (!time) {
        throw std::invalid_argument("expected a time such as 2026-11-21T05:12:01.123456789Z (or +01:00; without a zone "
                                    "it is local time), @1795237921.123456789, or -10min (ns, us, ms, s, min, h, d)");
    }
    return *time;
}

} // namespace qn::dump
