// Starting, re-using, stopping and terminating trace files.
//
// The caller holds the global mutex or the anchor set lock, as each function says; none of these takes a lock, except
// that stopping a page takes the spool queue mutex. A status is 0 or a code that has been recorded with its message.
#pragma once

#include "trace/files/anchor.h"

// Splits the trace into pages when its spool specification asks for that, starts every page that is not started, and
// writes the start record. Anchor set lock.
qn_int32_t start_trace(trace_anchor_t *anchor);

// Creates or re-uses one file, maps it and writes its header; nothing when it is mapped already. Anchor set lock.
qn_int32_t start_trace_page(trace_anchor_t *anchor);

// Undoes a half-made start_trace_page: pArg points at the descriptor. What a cancelled starter runs.
void cancel_start_trace(void *pArg);

// Writes a fresh header into the mapping. Returns 0. Anchor set lock.
qn_int32_t init_trace_header(trace_anchor_t *anchor);

// Flush, take from the spool queue and unmap every page, or one. In a forked child the files are only unmapped. Anchor
// set lock.
qn_int32_t stop_trace(trace_anchor_t *anchor, int child);
qn_int32_t stop_trace_page(trace_anchor_t *anchor, int child);

// 1 when the anchor has a file name and any category of any component traces, else 0.
int is_trace_on(trace_anchor_t *anchor);

// Puts a damaged file aside under its name plus ".save" and starts afresh. Anchor set lock.
qn_int32_t trace_reinit(trace_anchor_t *anchor);

// Stops the trace and empties the anchor. Global mutex and anchor set lock.
void tr_term_file_anchor(trace_anchor_t *anchor);

namespace qn::tr
{
// start_trace and stop_trace for callers that hold the global mutex: with the anchor set lock, so that no writer is
// inside the trace meanwhile.
qn_int32_t start_trace_locked(trace_anchor_t *anchor);
qn_int32_t stop_trace_locked(trace_anchor_t *anchor);

// Starts every trace file that is not started and has something to trace; the result of the last start attempted, 0
// when there was none. Global mutex.
qn_int32_t start_traces_that_are_on();

// Stops the trace and forgets what governed it; of a page set's head it makes a single file's anchor, and gives up the
// pages. Global mutex.
qn_int32_t become_unbound(trace_anchor_t *anchor);

// Smallest file that is started: a header, and a ring that takes every kind of record.
inline constexpr qn_uint32_t smallest_file_bytes = 4096;

// The pieces of a start, one file each.

// Brings the file to the wanted size, in bytes, without ever leaving it sparse; `size` becomes what it got.
qn_int32_t extend_trace_file(int fd, qn_uint64_t current_size, qn_uint32_t page_size, qn_uint32_t &size);

// How a program is named in a header.
struct program_names {
    char program[sizeof(trace_file_header_t::program)];
    char base_name[sizeof(trace_file_header_t::baseProgName)];
};

// True when the mapped ring is sound and this program's own, and was made ready to be continued.
bool reuse_ring(trace_anchor_t *anchor, const program_names &names);

// Empties the ring of a mapped file whose header is fresh.
void init_ring(trace_anchor_t *anchor);

// Whether multi-byte integers are stored with their low byte first here.
bool host_is_little_endian();

// Writes again what a reader must know to find the ring, which begins at `ring`. Another process that has the file
// mapped may have stored anything there, so this is done whenever a lap begins.
void restore_layout(trace_anchor_t *anchor, const trace_record_header_t *ring);

// Copies the build identifier into a header, or "Unknown" when it is empty.
void set_build_name(trace_file_header_t *header, const char *build_identifier);

inline trace_file_header_t *header_of(trace_anchor_t *anchor)
{
    return reinterpret_cast<trace_file_header_t *>(anchor->pMap);
}

inline trace_record_header_t *record_at(trace_anchor_t *anchor, qn_uint64_t offset)
{
    return reinterpret_cast<trace_record_header_t *>(anchor->pMap + offset);
}

// Unmaps a page and marks it as not started. Anchor set lock; takes the spool queue mutex, under which others read where
// a page is mapped.
void unmap_page(trace_anchor_t *anchor);
} // namespace qn::tr
