// Small pieces of text that both the system-log line and the record are made of. Pure functions, no state.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>

namespace qn::ffdc
{
using bytes = std::span<const unsigned char>;

// The captured data, or nothing where there is none.
bytes detail_bytes(const void *data, int length);

void append_hex(std::string &out, bytes data);

// On one line: control characters become blanks, so that no text can pass for another line of the log. Blanks
// at the end go.
std::string one_line(std::string_view text);

// The same for a C string that may be null.
std::string one_line_or_nothing(const char *text);
} // namespace qn::ffdc
