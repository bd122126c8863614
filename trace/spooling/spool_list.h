// Lists of spool specifications, and writing into a specification that is in use.
#pragma once

#include "trace/spooling/spool.h"

namespace qn::tr
{
inline constexpr const char *recycle_only = "/dev/null"; // pages are reused without being copied

// The two ends of a list, as addSpoolCfgElement takes them. Global mutex, unless it is nobody else's yet.
struct spec_list {
    trace_spool_spec_t *first = nullptr;
    trace_spool_spec_t *last = nullptr;

    void append(trace_spool_spec_t *spec);
    bool remove(trace_spool_spec_t *spec); // false when it is not in the list
};

// A specification that is in use is read by the spool thread under the queue mutex alone: these take it to write.
void set_destination(trace_spool_spec_t *spec, const char *path);
void set_directory(trace_spool_spec_t *spec, char *directory);

// Pages of the traces that it governs are not copied from now on.
inline void recycle_pages(trace_spool_spec_t *spec) { set_destination(spec, recycle_only); }

// A specification that is switched off still gives its traces their pages.
inline void govern_without_copying(trace_spool_spec_t *spec)
{
    recycle_pages(spec);
    spec->onoff = 1;
}
} // namespace qn::tr
