// How many pages of which size a spooled trace gets, from what its configuration asks for.
#pragma once

#include <strings.h>

#include <qn_tr.h>

namespace qn::tr
{
inline constexpr qn_uint32_t spool_page_bytes = 262144;
inline constexpr qn_uint32_t smallest_spooled_trace = 2097152;
inline constexpr qn_uint32_t default_sync_seconds = 3600; // what an interval of 0 means
inline constexpr qn_uint32_t short_sync_seconds = 60;     // what a negative interval means

struct spool_shape {
    qn_uint32_t trace_bytes; // before it is divided into pages
    qn_uint32_t pages;
    qn_uint32_t page_bytes;
    qn_uint32_t sync_seconds;
};

constexpr qn_uint32_t spool_sync_seconds(qn_int32_t interval)
{
    if (interval == 0) return default_sync_seconds;
    return interval > 0 ? static_cast<qn_uint32_t>(interval) : short_sync_seconds;
}

// Pages are always 262144 bytes, and a trace has at least 8 of them, whatever was asked for.
constexpr spool_shape shape_of(qn_uint32_t trace_bytes, qn_uint32_t sync_seconds)
{
    if (trace_bytes < smallest_spooled_trace) trace_bytes = smallest_spooled_trace;
    return {trace_bytes, trace_bytes / spool_page_bytes, spool_page_bytes, sync_seconds};
}

// From QN_TR_SPOOL: pages, and a trace size or 0.
constexpr spool_shape shape_from_environment(qn_uint32_t pages, qn_uint32_t trace_bytes)
{
    return shape_of(trace_bytes != 0 ? trace_bytes : pages * spool_page_bytes, short_sync_seconds);
}

// From a trace section of the configuration file.
constexpr spool_shape shape_from_section(const trace_element_t &section)
{
    const qn_uint32_t pages = section.pages < 3 ? 3 : section.pages;
    const qn_uint32_t page_bytes = section.pg_size < 4096 ? 4096 : section.pg_size;
    const qn_uint32_t trace_bytes = section.trace_size != 0 ? section.trace_size : pages * page_bytes;
    return shape_of(trace_bytes, spool_sync_seconds(static_cast<qn_int32_t>(section.sync_interval)));
}

// Whether a section's "spooling" switches spooling on.
inline bool spooling_says_on(const char *spooling) { return strcasecmp(spooling, "ON") == 0; }
} // namespace qn::tr
