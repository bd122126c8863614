// What it costs to compile a regular expression, found out before regcomp() does.
//
// regcomp() of the C library repeats a repeated part in memory, doubles it for a "+", keeps for every part that may
// be empty a list of all behind it, tries an anchor inside a repetition in all its combinations, and walks into
// parentheses on the stack. A few dozen characters suffice to take all memory, all time or the stack of the program,
// with the library's global lock held. docs/patterns.md has what was measured.
#pragma once

#include <string_view>

namespace qn::tr
{
// Whether the expression compiles with some ten megabytes, in some tenths of a second; one that is malformed may be
// either. Back references are not: POSIX extended regular expressions have none, and to compare a text with them may
// take for ever.
bool is_affordable(std::string_view pattern);
} // namespace qn::tr
