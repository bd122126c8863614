// The short way to space in the ring, for the records that ask for nothing special.
//
// Almost always the free pointer has a free rest and an old record or two behind it: nobody reads them, none of them is a
// start record, and the end of the file is not near. Then space is these few loads and stores, inline in the writer.
// Everything else goes the long way, allocate_space() in allocate.cpp, which tells the whole story.
//
// Anchor set lock, held by the caller.
#pragma once

#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/spooling/spool_types.h"

namespace qn::tr
{
inline unsigned char *address(trace_record_header_t *record) { return reinterpret_cast<unsigned char *>(record); }

inline trace_record_header_t *record_of(const unsigned char *address)
{
    return reinterpret_cast<trace_record_header_t *>(const_cast<unsigned char *>(address));
}

// Bytes of the records from the free pointer on that together come to `needed`; 0 when they are not plain, or many.
[[gnu::always_inline]] inline qn_uint32_t plain_span(trace_anchor_t *anchor, qn_uint64_t needed)
{
    constexpr int most_records = 8;
    const qn_uint32_t held_by_reader = load_relaxed(header_of(anchor)->uSeqLock);
    const unsigned char *end = anchor->pMapEnd;
    const unsigned char *first = address(anchor->pNextFree);
    const unsigned char *enough = first + needed;
    // Nearer to the end a place might have no room for a header.
    if (__builtin_expect(enough > end - format::record_header_bytes, 0)) return 0;
    const unsigned char *at = first;
    for (int records = 0; records < most_records; ++records) {
        const trace_record_header_t *record = record_of(at);
        if (__builtin_expect(record->seqNumber == held_by_reader, 0)) return 0;
        if (__builtin_expect(record->function == static_cast<qn_uint16_t>(format::kind::start), 0)) return 0;
        at += record->length;
        if (at >= enough) return at <= end ? static_cast<qn_uint32_t>(at - first) : 0;
    }
    return 0;
}

// Where the ring is read from when the free pointer is at `next_free`; at the end of the file, from the ring's start.
[[gnu::always_inline]] inline qn_uint32_t oldest_offset(trace_anchor_t *anchor, const unsigned char *next_free)
{
    if (__builtin_expect(next_free == anchor->pMapEnd, 0)) return header_of(anchor)->uOffset;
    return static_cast<qn_uint32_t>(next_free - anchor->pMap);
}

// Makes one record of the `consumed` bytes at the free pointer, and a free rest behind it if they are more than 28 bytes
// more than were requested. At every instant the records tile the ring: the record first covers all that was consumed,
// and is cut to its length when the rest has its header.
[[gnu::always_inline]] inline trace_record_header_t *claim(trace_anchor_t *anchor, qn_uint32_t consumed,
                                                           unsigned int requested)
{
    trace_record_header_t *record = anchor->pNextFree;
    record->function = static_cast<qn_uint16_t>(format::kind::being_written);
    keep_store_order();
    record->length = consumed;
    const qn_uint32_t sequence = anchor->seqNumber + 2;
    anchor->seqNumber = sequence;
    record->seqNumber = sequence;
    unsigned char *next_free = address(record) + consumed;
    if (__builtin_expect(consumed != qn_uint64_t{requested} + format::record_header_bytes, 1)) {
        next_free = address(record) + requested;
        trace_record_header_t *rest = record_of(next_free);
        rest->length = consumed - requested;
        rest->function = static_cast<qn_uint16_t>(format::kind::free_space);
        rest->seqNumber = format::seq_filler;
        keep_store_order();
        record->length = requested;
    }
    keep_store_order();
    anchor->pNextFree = record_of(next_free);
    store_relaxed(header_of(anchor)->uOldestRecordOffset, oldest_offset(anchor, next_free));
    return record;
}

// Who writes, and when.
inline void stamp(trace_record_header_t *record)
{
    // pthread_self(), without the call: on x86-64 it is the thread pointer.
    record->threadId = static_cast<qn_uint32_t>(reinterpret_cast<uintptr_t>(__builtin_thread_pointer()));
    qn_uint64_t now;
    cu_get_ctr_1(&now);
    record->timeStamp = now;
}

// The page of a page set that is being written; a single file's anchor is its own.
[[gnu::always_inline]] inline trace_anchor_t *page_to_write(trace_anchor_t *anchor)
{
    if (__builtin_expect(anchor->ppActivePg == nullptr, 1)) return anchor;
    trace_anchor_t *active = *anchor->ppActivePg;
    return active != nullptr && anchor->spool != nullptr && anchor->spool->onoff != 0 ? active : anchor;
}

// What the writers call. A reader's request to wait, a record that is too long and the end of a page take the long way.
[[gnu::always_inline]] inline trace_record_header_t *reserve(trace_anchor_t *anchor, unsigned int requested)
{
    trace_anchor_t *page = page_to_write(anchor);
    if (__builtin_expect(requested <= page->uMaxSize && load_relaxed(header_of(page)->uTailReq) == 0, 1)) {
        const qn_uint32_t consumed = plain_span(page, qn_uint64_t{requested} + format::record_header_bytes);
        if (__builtin_expect(consumed != 0, 1)) {
            trace_record_header_t *record = claim(page, consumed, requested);
            stamp(record);
            return record;
        }
    }
    unsigned int wanted = requested; // so that `requested` itself stays in a register
    return allocate_space(anchor, &wanted);
}
} // namespace qn::tr
