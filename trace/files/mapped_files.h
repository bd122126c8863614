// Which files the process has mapped as traces. Each is mapped once: two anchors, by two names for one file, would write
// over each other's records, and neither could tell. Any lock; these take the spool queue mutex.
#pragma once

#include <sys/stat.h>

#include "trace/files/anchor.h"

namespace qn::tr
{
// The file is the anchor's until it is released; false when it is another's.
bool claim_file(trace_anchor_t *anchor, const struct stat &file);

// Does nothing for an anchor that has claimed none.
void release_file(trace_anchor_t *anchor);
} // namespace qn::tr
