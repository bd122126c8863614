// Writing into the ring: space, the records that the library writes itself, page switching, flushing.
//
// Anchor set lock, held by the caller, unless a function says otherwise.
#pragma once

#include "trace/files/anchor.h"

// Reserves *pReqLength bytes (record header included) in the trace's active page, or in one page. The record comes back
// with its header filled in, `function` 0xFFFF and compId stale. Null when there is no space to be had: the record is to
// be dropped.
trace_record_header_t *allocate_space(trace_anchor_t *pAnchor, unsigned int *pReqLength);
trace_record_header_t *allocate_space_page(trace_anchor_t *pAnchor, unsigned int *pReqLength);

// Waits until a reader has let go of record `seq`: at most 2 s, then the reader's hold is broken.
void wait_tail(trace_anchor_t *pAnchor, uint32_t seq);

// Answers a reader's request to wait: at most 0.5 s, then the request is dropped. Returns 0.
int do_coordination(trace_anchor_t *pAnchor);

// Goes on to the next page of the set and reserves the space there.
trace_record_header_t *pageFull(trace_anchor_t *pAnchor, unsigned int *pReqLength);

// Write a start record; or a restart record, when tr_core_event_1 announced one for this file; or a time calibration.
// All return 0.
qn_int32_t int_record_start(trace_anchor_t *pAnchor);
qn_int32_t segfault_restart(trace_anchor_t *pAnchor);
qn_int32_t __time_calibration(trace_anchor_t *pAnchor);

// What tr_core_event_1 announced; null: nothing.
extern char *gCoreMessage;
extern char *gCoreTrcFile;

// Minutes from local time to Greenwich time, positive west of Greenwich; -1 also when the time cannot be broken down.
int get_tz_offset(void);

// Writes a record of 32-bit values. Takes the anchor set lock.
qn_int32_t int_record_values_32_v(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                  qn_uint32_t numValues, va_list args);

// Non-zero: pages are kept resident by touching them. Read without a lock.
extern int memory_is_pinned;

// Reads a word of every 512 bytes of every mapped page. Takes the global mutex.
int load_trace_pages_to_memory(void);

// Calls msync() on the mapping of every page, or of the active pages only. Takes the global mutex.
int msync_trace_pages(int incl_all_pages, int msync_flags, int ignore_error);

namespace qn::tr
{
// Does for one trace what load_trace_pages_to_memory does for all. Anchor set lock.
void touch_trace(trace_anchor_t *anchor);
} // namespace qn::tr
