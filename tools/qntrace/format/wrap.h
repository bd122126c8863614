// Long text on several lines.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace qn::dump
{

// Appends `text`, which begins in the column `indent`, and the end of its last line. Lines are broken at blanks so that
// they have at most `columns` characters, and go on at `indent`; a word that is longer than that stays whole. With 0
// columns there is one line.
void append_wrapped(std::string &out, std::string_view text, std::size_t indent, std::size_t columns);

} // namespace qn::dump
