// Text in the fixed fields of the library's structures.
#pragma once

#include <algorithm>
#include <cstring>
#include <string_view>

namespace qn::tr
{
// Copies what fits, and always ends it. The text may lie in the field.
inline void copy_cut(char *field, size_t field_bytes, std::string_view text)
{
    const size_t length = std::min(text.size(), field_bytes - 1);
    if (length != 0) std::memmove(field, text.data(), length); // an empty text may be nowhere
    field[length] = '\0';
}

template <size_t size>
void copy_cut(char (&field)[size], std::string_view text)
{
    copy_cut(field, size, text);
}
} // namespace qn::tr
