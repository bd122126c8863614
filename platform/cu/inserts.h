// Reading the inserts of a message from a variable argument list: exactly those that its text names, never one
// more, and of a string no more than the text may show.
#pragma once

#include <cstdarg>
#include <deque>
#include <span>
#include <string>
#include <vector>

#include <qn_cu.h>

#include "platform/cu/conversions.h"

namespace qn::cu
{
struct insert_list {
    std::vector<cu_error_arg_t> args; // strings are still the caller's, or in `texts`
    std::deque<std::string> texts;    // strings with a precision; wide strings, turned into multibyte text
};

// Replaces what `inserts` holds. May throw std::bad_alloc.
void read_inserts(std::span<const named_insert> named, va_list arguments, insert_list &inserts);
} // namespace qn::cu
