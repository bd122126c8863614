// From the text of a filter expression to steps that can be taken for every record.
//
//   either     = both { "||" both }
//   both       = unary { "&&" unary }
//   unary      = "!" unary | "(" either ")" | comparison
//   comparison = field operator literal | literal operator field | field "in" "(" literal { "," literal } ")"
#pragma once

#include <cstddef>
#include <ctime>
#include <string_view>
#include <vector>

#include "tools/qntrace/select/where_comparison.h"

namespace qn::dump
{

// An evaluation has a single truth value: a comparison sets it, the other steps look at it. So there is nothing to
// recurse into and nothing to allocate.
struct where_step {
    enum class action { compare, invert, jump_if_true, jump_if_false };

    action what = action::compare;
    std::size_t index = 0; // of the comparison, or of the step to go on with
};

struct where_program {
    std::vector<where_step> steps;
    std::vector<where_comparison> comparisons;
};

// How deep parentheses and ! may be nested: what the parser's recursion is bounded by.
inline constexpr std::size_t where_deepest_nesting = 100;

// Everything that can be wrong with an expression is found here. Throws where_error.
where_program parse_where(std::string_view text, const timespec &now);

} // namespace qn::dump
