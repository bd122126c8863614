#include "tools/qntrace/select/where_comparison.h"

#include <algorithm>
#include <array>
#include <cstdint>

#include <fmt/format.h>

#include "tools/qntrace/format/record_names.h"

namespace qn::dump
{
namespace
{

struct named_field {
    std::string_view name;
    where_type type;
};

// In the order of where_field.
constexpr std::array<named_field, 13> fields = {{
    {"comp", where_type::text},
    {"kind", where_type::text},
    {"id", where_type::number},
    {"thread", where_type::number},
    {"seq", where_type::number},
    {"pid", where_type::number},
    {"time", where_type::time},
    {"length", where_type::number},
    {"text", where_type::text},
    {"value", where_type::number},
    {"file", where_type::text},
    {"program", where_type::text},
    {"node", where_type::number},
}};

std::uint32_t pid_of(const trace_origin &origin, const reader::record_body &body)
{
    if (const auto *start = std::get_if<reader::start_body>(&body)) return start->pid;
    if (const auto *restart = std::get_if<reader::restart_body>(&body)) return restart->start.pid;
    return origin.header.pid;
}

// Whether `test` holds for any value, which it is given as a signed and as an unsigned number.
template <typename Test>
bool any_value(const reader::record_body &body, const Test &test)
{
    if (const auto *small = std::get_if<reader::values_32_body>(&body)) {
        for (std::size_t i = 0; i < small->values.size(); ++i) {
            const auto value = small->values[i];
            if (test(static_cast<std::int32_t>(value), value)) return true;
        }
    }
    if (const auto *large = std::get_if<reader::values_64_body>(&body)) {
        for (std::size_t i = 0; i < large->values.size(); ++i) {
            const auto value = large->values[i];
            if (test(static_cast<std::int64_t>(value), value)) return true;
        }
    }
    return false;
}

template <typename Test>
bool any_number(where_field field, const trace_origin &origin, const reader::trace_record &record, const Test &test)
{
    const auto &header = record.raw.header;
    const auto same = [&](where_integer value) { return test(value, value); };
    const auto if_there = [&](const auto &value) { return value && same(*value); };
    switch (field) {
    case where_field::id: return if_there(id_of(record.body));
    case where_field::thread: return if_there(thread_of(record));
    case where_field::seq: return same(header.seq);
    case where_field::pid: return same(pid_of(origin, record.body));
    case where_field::time: return record.time && same(where_nanoseconds(*record.time));
    case where_field::length: return same(header.length);
    case where_field::value: return any_value(record.body, test);
    case where_field::node: return if_there(origin.header.node_id);
    default: return false;
    }
}

template <typename Test>
bool any_text_of(where_field field, const trace_origin &origin, const reader::trace_record &record, const Test &test)
{
    const auto if_there = [&](const auto &text) { return text && test(*text); };
    switch (field) {
    case where_field::comp: return if_there(component_of(record));
    case where_field::kind: return test(kind_name(record.body));
    case where_field::text: return any_text(record.body, test);
    case where_field::file: return test(origin.path);
    case where_field::program: return if_there(origin.header.base_program);
    default: return false;
    }
}

bool compare(where_integer left, where_relation relation, where_integer right)
{
    switch (relation) {
    case where_relation::less: return left < right;
    case where_relation::less_equal: return left <= right;
    case where_relation::greater: return left > right;
    case where_relation::greater_equal: return left >= right;
    default: return left == right;
    }
}

} // namespace

bool where_comparison::holds(const trace_origin &origin, const reader::trace_record &record) const
{
    if (const auto *numbers = std::get_if<std::vector<where_number>>(&operand)) {
        return any_number(field, origin, record, [&](where_integer plain, where_integer without_sign) {
            return std::any_of(numbers->begin(), numbers->end(), [&](const where_number &number) {
                return compare(number.hexadecimal ? without_sign : plain, relation, number.value);
            });
        });
    }
    return any_text_of(field, origin, record, [&](std::string_view text) {
        if (const auto *expression = std::get_if<pattern>(&operand)) return expression->found_in(text);
        const auto &texts = std::get<std::vector<std::string>>(operand);
        return std::find(texts.begin(), texts.end(), text) != texts.end();
    });
}

std::optional<where_field> where_field_of(std::string_view name)
{
    const auto *found =
        std::find_if(fields.begin(), fields.end(), [&](const auto &field) { return field.name == name; });
    if (found == fields.end()) return std::nullopt;
    return static_cast<where_field>(found - fields.begin());
}

std::string where_field_list()
{
    std::string list;
    for (const auto &field : fields) {
        if (!list.empty()) list += ", ";
        list += field.name;
    }
    return list;
}

where_type where_type_of(where_field field) { return fields[static_cast<std::size_t>(field)].type; }

std::string_view where_field_name(where_field field) { return fields[static_cast<std::size_t>(field)].name; }

where_integer where_nanoseconds(const timespec &time)
{
    return where_integer{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

} // namespace qn::dump
