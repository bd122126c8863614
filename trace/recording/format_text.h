// A text made of a format and its arguments, several times faster than vsnprintf() for the formats that traces have.
#pragma once

#include <cstdarg>
#include <cstddef>

namespace qn::tr
{
struct made_text {
    int result; // vsnprintf()'s
    size_t
        length; // of the text in the buffer, as strlen() finds it: less than the result when the text is cut, or when
                // %c brings a NUL; 0 without a text, when the result is negative or the buffer has no bytes
};

// Does to `to` what vsnprintf() does, to the byte and for every format.
made_text format_text(char *to, size_t size, const char *format, va_list args);
} // namespace qn::tr
