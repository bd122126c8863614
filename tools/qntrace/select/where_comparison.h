// One comparison of a filter expression, ready to be made: a field and what it is compared with.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "tools/qntrace/select/pattern.h"
#include "tools/qntrace/select/record.h"

namespace qn::dump
{

// Holds every signed and unsigned number of 64 bits, and every time in nanoseconds.
__extension__ using where_integer = __int128;

enum class where_field { comp, kind, id, thread, seq, pid, time, length, text, value, file, program, node };

enum class where_type { number, text, time };

struct where_number {
    where_integer value = 0;
    bool hexadecimal = false; // then the values of a record are taken as unsigned, as their hexadecimal form is
};

enum class where_relation { equal, less, less_equal, greater, greater_equal, match };

struct where_comparison {
    where_field field = where_field::comp;
    where_relation relation = where_relation::equal;
    // Of several any; a time is a number of nanoseconds.
    std::variant<std::vector<where_number>, std::vector<std::string>, pattern> operand;

    // False when the record does not have the field.
    bool holds(const trace_origin &origin, const reader::trace_record &record) const;
};

// The field of that name, if there is one.
std::optional<where_field> where_field_of(std::string_view name);
// The names, separated by commas.
std::string where_field_list();
where_type where_type_of(where_field field);
std::string_view where_field_name(where_field field);

where_integer where_nanoseconds(const timespec &time);

} // namespace qn::dump
