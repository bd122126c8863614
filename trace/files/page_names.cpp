// Names of page files. No state, no lock.
#include "trace/files/page_names.h"

#include <cstdio>
#include <cstring>

namespace qn::tr
{
namespace
{
constexpr size_t longest_suffix = sizeof ".4294967295.sp" - 1;
constexpr size_t longest_trace_name = trace_file_name_bytes - 1 - longest_suffix;
} // namespace

std::optional<std::string_view> trace_name_of_page(std::string_view name)
{
    constexpr std::string_view ending = ".sp";
    if (!name.ends_with(ending)) return std::nullopt;
    const std::string_view stem = name.substr(0, name.size() - ending.size());
    const size_t dot = stem.find_last_not_of("0123456789");
    if (dot == std::string_view::npos || dot + 1 == stem.size() || stem[dot] != '.') return std::nullopt;
    return stem.substr(0, dot);
}

void cut_at_second_last_dot(char *name)
{
    int dots = 0;
    for (size_t i = std::strlen(name); i-- > 1;) {
        if (name[i] != '.' || ++dots < 2) continue;
        name[i] = '\0';
        return;
    }
}

bool has_room_for_page_names(const char *trace_name) { return std::strlen(trace_name) <= longest_trace_name; }

void name_page(char (&page_name)[trace_file_name_bytes], const char *trace_name, qn_uint32_t number)
{
    std::snprintf(page_name, sizeof page_name, "%.*s.%u.sp", static_cast<int>(longest_trace_name), trace_name, number);
}
} // namespace qn::tr
