#include "tools/qntrace/format/record_names.h"

#include <array>
#include <bit>
#include <cstdlib>

#include <fmt/format.h>

namespace qn::dump
{

std::string_view kind_name(const reader::record_body &body)
{
    // In the order of the alternatives of record_body.
    static constexpr std::array<std::string_view, std::variant_size_v<reader::record_body>> names = {
        "free",  "unfinished", "id",    "note",        "data",    "values32", "values64",
        "error", "strings",    "start", "calibration", "restart", "unknown"};
    return names[body.index()];
}

std::string_view argument_type_name(reader::argument_type type)
{
    static constexpr std::array<std::string_view, 7> names = {"int",      "long",   "long long", "double",
                                                              "reserved", "string", "pointer"};
    const auto index = static_cast<std::size_t>(type);
    return index < names.size() ? names[index] : "unknown";
}

std::string_view page_state_name(std::uint8_t state)
{
    namespace page_state = qn::tr::format::page_state;
    switch (state) {
    case page_state::active: return "active";
    case page_state::full: return "full";
    case page_state::ready: return "ready";
    case page_state::being_spooled: return "being spooled";
    default: return {};
    }
}

std::string argument_value(const reader::error_argument &argument)
{
    using reader::argument_type;
    switch (argument.type) {
    case argument_type::int_value: return fmt::format("{}", static_cast<std::int32_t>(argument.bits));
    case argument_type::long_value:
    case argument_type::long_long_value: return fmt::format("{}", static_cast<std::int64_t>(argument.bits));
    case argument_type::double_value: return fmt::format("{}", std::bit_cast<double>(argument.bits));
    default: return fmt::format("{:#x}", argument.bits);
    }
}

std::string zone_text(std::int32_t minutes_west)
{
    if (minutes_west < -24 * 60 || minutes_west > 24 * 60) return fmt::format("{} minutes west", minutes_west);
    const int minutes = std::abs(minutes_west);
    return fmt::format("UTC{}{:02}:{:02}", minutes_west > 0 ? '-' : '+', minutes / 60, minutes % 60);
}

std::string_view component_name(const reader::record_header &header)
{
    return reader::cut_at_nul({header.component.data(), header.component.size()}).text;
}

} // namespace qn::dump
