// A text made of a format and its arguments, several times faster than vsnprintf() for the formats that traces have.
#pragma once

#include <cstdarg>
#include <cstddef>

namespace qn::tr
{
// Does to `to` what vsnprintf() does, to the byte and for every format, and returns what it returns. `length` becomes
// the length of the text in `to`, as strlen() finds it: less than what is returned when the text is cut, or when %c
// brings a NUL. Without a text (a negative result, or size 0) it is left alone.
int format_text(char *to, size_t size, const char *format, va_list args, size_t &length);
} // namespace qn::tr
