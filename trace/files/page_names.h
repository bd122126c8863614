// Names of page files: "<trace>.<number>.sp".
#pragma once

#include <optional>
#include <string_view>

#include "trace/files/anchor.h"

namespace qn::tr
{
// The trace's name in a page's, "/x/y.trc" in "/x/y.trc.3.sp"; nothing when the name does not end like a page's.
std::optional<std::string_view> trace_name_of_page(std::string_view name);

// Cuts a name at its second dot from the end, wherever in the path that is; leaves a name without one as it is. Other
// programs reckon with what this does to names that are no page's.
void cut_at_second_last_dot(char *name);

// Whether every page of a trace of that name has a name that fits into an anchor.
bool has_room_for_page_names(const char *trace_name);

// Writes a page's name, for a trace that has room for it.
void name_page(char (&page_name)[trace_file_name_bytes], const char *trace_name, qn_uint32_t number);
} // namespace qn::tr
