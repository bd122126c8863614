// The short way to space in the ring, for the records that ask for nothing special.
//
// Almost always the free pointer has a free rest and an old record or two behind it: nobody reads them, none of them is a
// start record, and the end of the file is not near. Then space is these few loads and stores, inline in the writer.
// Everything else goes the long way, allocate_space() in allocate.cpp, which tells the whole story. The short way waits for
// nobody, and so a writer may go it by a bias (lock_bias.h).
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

// The end of the records from `first` on that together come to `needed` bytes; null when they are not plain, or many.
// One or two rounds of the loop are the rule; unrolled, they do without a counter.
[[gnu::always_inline]] inline const unsigned char *plain_end(trace_anchor_t *anchor, const unsigned char *first,
                                                             qn_uint64_t needed)
{
    constexpr int most_records = 8;
    const qn_uint32_t held_by_reader = load_relaxed(header_of(anchor)->uSeqLock);
    const unsigned char *end = anchor->pMapEnd;
    const unsigned char *enough = first + needed;
    // Nearer to the end a place might have no room for a header.
    if (__builtin_expect(enough + format::record_header_bytes > end, 0)) return nullptr;
    const unsigned char *at = first;
#pragma GCC unroll 8
    for (int records = 0; records < most_records; ++records) {
        const trace_record_header_t *record = record_of(at);
        if (__builtin_expect(record->seqNumber == held_by_reader, 0)) return nullptr;
        if (__builtin_expect(record->function == static_cast<qn_uint16_t>(format::kind::start), 0)) return nullptr;
        at += record->length;
        if (__builtin_expect(at >= enough, 1)) return at <= end ? at : nullptr;
    }
    return nullptr;
}

// Makes one record of the `consumed` bytes at the free pointer, and a free rest behind it if they are more than 28 bytes
// more than were requested. At every instant the records tile the ring: the record first covers all that was consumed,
// and is cut to its length when the rest has its header. Returns where the rest begins, or the next record.
[[gnu::always_inline]] inline unsigned char *cut_record(trace_anchor_t *anchor, trace_record_header_t *record,
                                                        qn_uint32_t consumed, unsigned int requested)
{
    record->function = static_cast<qn_uint16_t>(format::kind::being_written);
    keep_store_order();
    record->length = consumed;
    const qn_uint32_t sequence = anchor->seqNumber + 2;
    anchor->seqNumber = sequence;
    record->seqNumber = sequence;
    if (__builtin_expect(consumed == qn_uint64_t{requested} + format::record_header_bytes, 0))
        return address(record) + consumed;
    unsigned char *next = address(record) + requested;
    trace_record_header_t *rest = record_of(next);
    rest->length = consumed - requested;
    rest->function = static_cast<qn_uint16_t>(format::kind::free_space);
    rest->seqNumber = format::seq_filler;
    keep_store_order();
    record->length = requested;
    return next;
}

// What is at the free pointer is the oldest record.
[[gnu::always_inline]] inline void move_free_pointer(trace_anchor_t *anchor, unsigned char *next_free,
                                                     qn_uint32_t oldest_offset)
{
    keep_store_order();
    anchor->pNextFree = record_of(next_free);
    store_relaxed(header_of(anchor)->uOldestRecordOffset, oldest_offset);
}

// Who writes, and when.
inline void stamp(trace_record_header_t *record)
{
    // pthread_self(), without the call: on x86-64 it is the thread pointer.
    record->threadId = static_cast<qn_uint32_t>(reinterpret_cast<uintptr_t>(__builtin_thread_pointer()));
    // Straight into the field, which has the alignment of a record: by way of a local variable it would be stored twice.
    cu_get_ctr_1(reinterpret_cast<qn_uint64_t *>(address(record) + offsetof(trace_record_header_t, timeStamp)));
}

// The page of a page set that is being written; a single file's anchor is its own.
[[gnu::always_inline]] inline trace_anchor_t *page_to_write(trace_anchor_t *anchor)
{
    if (__builtin_expect(anchor->ppActivePg == nullptr, 1)) return anchor;
    trace_anchor_t *active = *anchor->ppActivePg;
    return active != nullptr && anchor->spool != nullptr && anchor->spool->onoff != 0 ? active : anchor;
}

// The long way, out of line. It may have to wait: the mutex, held by the caller.
trace_record_header_t *reserve_otherwise(trace_anchor_t *anchor, unsigned int requested);

// The short way; null when it does not lead there. A reader's request to wait, a record that is too long, and the end of a
// page or of the file take the long way.
[[gnu::always_inline]] inline trace_record_header_t *reserve(trace_anchor_t *anchor, unsigned int requested)
{
    trace_anchor_t *page = page_to_write(anchor);
    if (__builtin_expect(requested > page->uMaxSize || load_relaxed(header_of(page)->uTailReq) != 0, 0)) return nullptr;
    trace_record_header_t *record = page->pNextFree;
    const unsigned char *end = plain_end(page, address(record), qn_uint64_t{requested} + format::record_header_bytes);
    if (__builtin_expect(end == nullptr, 0)) return nullptr;
    unsigned char *next_free = cut_record(page, record, static_cast<qn_uint32_t>(end - address(record)), requested);
    move_free_pointer(page, next_free, static_cast<qn_uint32_t>(next_free - page->pMap));
    stamp(record);
    return record;
}
} // namespace qn::tr
