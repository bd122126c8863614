#include "tools/qntrace/report/zone.h"

#include <ctime>
#include <optional>

namespace qn::dump
{
namespace
{

constexpr time_t second_ns = 1'000'000'000;
constexpr time_t week = 7 * 86'400; // no zone changes its offset and back again in less
constexpr time_t longest_span = 2000 * week;

std::optional<int> offset_at(time_t second)
{
    struct tm parts = {};
    if (localtime_r(&second, &parts) == nullptr) return std::nullopt;
    return static_cast<int>(parts.tm_gmtoff / 60);
}

} // namespace

page_zone local_zone(std::int64_t first_ns, std::int64_t last_ns)
{
    const time_t first = first_ns / second_ns;
    const time_t last = last_ns / second_ns;
    const auto offset = offset_at(last);
    if (!offset || last - first > longest_span) return {};
    for (time_t at = first; at < last; at += week)
        if (offset_at(at) != offset) return {};
    return {false, *offset};
}

} // namespace qn::dump
