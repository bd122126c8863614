// What the reader and the interpreter share beside the functions of traceutils.h.
#pragma once

#include <cstddef>
#include <cstdlib>

#include <qn_tr.h>

namespace qn::tr
{
inline constexpr qn_int32_t section_chunk = 1;
inline constexpr qn_int32_t comment_chunk = 2;

enum class section_type { trace, spool, standard };

// By the section's name: "default" is the default section, "spoolarea_..." a spool section.
section_type type_of_section(const char *name);

// The section of a chunk; null for a comment.
const trace_raw_section_t *section_of(const trace_chunk_t *chunk);

void free_raw_section(trace_raw_section_t *section);

// How much of a section's raw text is used and allocated. The record has no room for it, and to look for the end at
// every line would cost the square of the file's size.
struct raw_text_room {
    size_t length = 0;
    size_t allocated = 0;
};

// appendRawString, for who keeps the room between the calls.
qn_int32_t append_raw_text(trace_raw_section_t *section, raw_text_room &room, const char *line);

// Room for one more entry in a list of `used` that grows by `step` whenever it is full; false when memory runs out.
template <size_t step, typename entry>
bool make_room(entry *&list, size_t used)
{
    if (used % step != 0) return true;
    void *larger = std::realloc(list, (used / step + 1) * sizeof(entry[step]));
    if (larger == nullptr) return false;
    list = static_cast<entry *>(larger);
    return true;
}
} // namespace qn::tr
