// What standard output is shown on.
#pragma once

#include <cstddef>
#include <string_view>

namespace qn::dump
{

// Columns of the terminal; 0 when standard output is none, or does not tell.
std::size_t output_columns();

// By the environment variable TERM.
bool is_dumb_terminal();

// Whether output is to be coloured by a choice of auto, always and never. What is not asked for, only a terminal gets,
// and nobody who has said that he wants none. Ask before a pager stands there in the terminal's place.
bool wants_color(std::string_view choice);

} // namespace qn::dump
