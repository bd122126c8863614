// The state behind a query handle. No lock: a handle belongs to its caller.
#pragma once

#include <qn_tr.h>

typedef struct trace_query_anchor {
    char id[4];       // "_TR_" while the handle is valid, not NUL-terminated
    qn_int32_t fd;    // -1: none
    qn_int32_t uSize; // of the file, cut to 32 bits
    char *pMap;       // the file's first memory page, read-only; null: not mapped
    char *pMapEnd;
} trace_query_anchor_t;

// Releases a handle: what a failed or cancelled opener runs, and the close call.
void cancel_open_query(void *pArg);
