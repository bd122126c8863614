// Filter expressions: comp == "IDX" && (id >= 100 || text =~ "error")
//
// What != and !~ say is exactly the opposite of == and =~, so that they hold for a record without the field. A field
// that a record has several times (value, text) fulfils a comparison when any of them does.
#pragma once

#include <ctime>
#include <string_view>

#include "tools/qntrace/select/record.h"
#include "tools/qntrace/select/where_parser.h"

namespace qn::dump
{

class where_expression
{
public:
    // Times that are relative count from `now`. Throws where_error.
    where_expression(std::string_view text, const timespec &now) : program_(parse_where(text, now)) {}

    bool holds(const trace_origin &origin, const reader::trace_record &record) const;

private:
    where_program program_;
};

} // namespace qn::dump
