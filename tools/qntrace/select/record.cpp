#include "tools/qntrace/select/record.h"

#include <utility>

#include <fmt/format.h>
#include <fmt/ranges.h>

#include "tools/qntrace/format/record_names.h"

namespace qn::dump
{
namespace
{

template <std::size_t... Index>
std::vector<std::string_view> names_of_all(std::index_sequence<Index...>)
{
    return {kind_name(reader::record_body(std::in_place_index<Index>))...};
}

bool is_filler(const reader::trace_record &record) { return std::holds_alternative<reader::free_body>(record.body); }

} // namespace

const std::vector<std::string_view> &kind_names()
{
    static const auto names = names_of_all(std::make_index_sequence<std::variant_size_v<reader::record_body>>());
    return names;
}

std::string kind_list() { return fmt::format("{}", fmt::join(kind_names(), ", ")); }

std::string_view without_trailing_blanks(std::string_view text)
{
    return text.substr(0, text.find_last_not_of(' ') + 1); // npos + 1 is 0
}

std::optional<std::string_view> component_of(const reader::trace_record &record)
{
    if (is_filler(record)) return std::nullopt;
    return without_trailing_blanks(component_name(record.raw.header));
}

std::optional<std::uint32_t> thread_of(const reader::trace_record &record)
{
    if (is_filler(record)) return std::nullopt;
    return record.raw.header.thread;
}

std::optional<std::uint32_t> id_of(const reader::record_body &body)
{
    return std::visit(
        [](const auto &of_kind) -> std::optional<std::uint32_t> {
            if constexpr (requires { of_kind.id; }) {
                if (of_kind.id != id_of_no_id) return of_kind.id;
            }
            return std::nullopt;
        },
        body);
}

} // namespace qn::dump
