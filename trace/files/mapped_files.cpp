// Which files the process has mapped as traces. Spool queue mutex, taken here: whoever unmaps a page holds it already.
#include "trace/files/mapped_files.h"

#include "trace/files/locks.h"

namespace
{
trace_anchor_t *claimed = nullptr; // linked by nextClaimed
} // namespace

namespace qn::tr
{
bool claim_file(trace_anchor_t *anchor, const struct stat &file)
{
    const mutex_lock queue(spq.mutex);
    for (const trace_anchor_t *other = claimed; other != nullptr; other = other->nextClaimed)
        if (other->fileDevice == file.st_dev && other->fileNode == file.st_ino) return other == anchor;
    anchor->fileDevice = file.st_dev;
    anchor->fileNode = file.st_ino;
    anchor->nextClaimed = claimed;
    claimed = anchor;
    return true;
}

void release_file(trace_anchor_t *anchor)
{
    const mutex_lock queue(spq.mutex);
    trace_anchor_t **link = &claimed;
    while (*link != nullptr && *link != anchor) link = &(*link)->nextClaimed;
    if (*link != nullptr) *link = anchor->nextClaimed;
}
} // namespace qn::tr
