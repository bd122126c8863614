// Space for a record in the ring of one page. Anchor set lock, held by the caller.
//
// Space is taken at the free pointer, by consuming the oldest records from there on until they span the request and 28
// bytes more, which the free rest needs for a header of its own:
//
//   before   ... newest | old | old | old ...          after   ... newest | new record | free rest | old ...
//                       ^ pNextFree                                                     ^ pNextFree
//
// At every instant the records tile the ring, so that a process killed between any two stores leaves a ring that can be
// continued: a record first covers all that was consumed and is cut to its length when the rest has its header.
#include <cstdio>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

namespace
{
using namespace qn::tr;
using format::record_header_bytes;

constexpr auto free_space = static_cast<qn_uint16_t>(format::kind::free_space);
constexpr auto being_written = static_cast<qn_uint16_t>(format::kind::being_written);
constexpr auto start_kind = static_cast<qn_uint16_t>(format::kind::start);

// A trace of several pages never wraps inside a page. One that was started as a single file stays one.
bool is_multipage(const trace_anchor_t *anchor)
{
    return anchor->spool != nullptr && anchor->spool->onoff != 0 && anchor->spool->pages > 1 &&
           anchor->ppActivePg != nullptr;
}

qn_uint32_t bytes_to_end(const trace_anchor_t *anchor, const trace_record_header_t *record)
{
    return static_cast<qn_uint32_t>(anchor->pMapEnd - reinterpret_cast<const unsigned char *>(record));
}

trace_record_header_t *behind(trace_record_header_t *record, qn_uint32_t bytes)
{
    return reinterpret_cast<trace_record_header_t *>(reinterpret_cast<unsigned char *>(record) + bytes);
}

// Names the record that a reader starts from.
void publish_oldest(trace_anchor_t *anchor)
{
    const auto offset = reinterpret_cast<unsigned char *>(anchor->pNextFree) - anchor->pMap;
    store_relaxed(header_of(anchor)->uOldestRecordOffset, static_cast<qn_uint32_t>(offset));
}

// The start record overwritten last: the header takes over its time base and process.
struct overwritten_start {
    bool found = false;
    qn_uint32_t pid = 0;
    cu_timeinfo_t time_info{};

    void look_at(const trace_record_header_t *record, qn_uint32_t room)
    {
        if (record->function != start_kind || room < sizeof(trace_record_start_t)) return;
        const auto *start = reinterpret_cast<const trace_record_start_t *>(record);
        found = true;
        pid = start->pid;
        time_info = start->timeInfo;
    }
    void keep_in(trace_file_header_t *header) const
    {
        if (!found) return;
        header->timeInfo = time_info;
        store_relaxed(header->uPid, pid);
    }
};

[[gnu::cold, gnu::noinline]] trace_record_header_t *give_up(trace_anchor_t *anchor, const char *reason)
{
    log_trc_error(reason, '0');
    trace_reinit(anchor);
    return nullptr;
}

[[gnu::cold, gnu::noinline]] trace_record_header_t *give_up_looping(trace_anchor_t *anchor, unsigned int requested)
{
    char reason[60];
    std::snprintf(reason, sizeof reason, "opal_trace: allocate_space allocation loop (%u)\n", requested);
    return give_up(anchor, reason);
}

[[gnu::cold, gnu::noinline]] void clip_to_mapping(trace_anchor_t *anchor, trace_record_header_t *record)
{
    debug("Bad length: len: 0x%X (%u), pNextRec: %p (%u), pMapEnd: %p (%u)\n", record->length, record->length,
          static_cast<void *>(record), static_cast<unsigned>(reinterpret_cast<uintptr_t>(record)),
          static_cast<void *>(anchor->pMapEnd), static_cast<unsigned>(reinterpret_cast<uintptr_t>(anchor->pMapEnd)));
    record->length = bytes_to_end(anchor, record);
}

// Closes off the rest of the file behind the free pointer, and goes back to the start of the ring.
[[gnu::noinline]] void wrap_round(trace_anchor_t *anchor, qn_uint32_t consumed)
{
    trace_record_header_t *filler = anchor->pNextFree;
    filler->function = being_written;
    keep_store_order();
    filler->length = consumed;
    anchor->seqNumber += 2;
    filler->seqNumber = anchor->seqNumber;
    keep_store_order();
    anchor->pNextFree = anchor->pWrap;
    store_relaxed(header_of(anchor)->uOldestRecordOffset, header_of(anchor)->uOffset);
    keep_store_order();
    filler->function = free_space;
}
} // namespace

trace_record_header_t *allocate_space(trace_anchor_t *pAnchor, unsigned int *pReqLength)
{
    if (spooling_is_on(pAnchor) && pAnchor->ppActivePg != nullptr && *pAnchor->ppActivePg != nullptr)
        return allocate_space_page(*pAnchor->ppActivePg, pReqLength);
    return allocate_space_page(pAnchor, pReqLength);
}

trace_record_header_t *allocate_space_page(trace_anchor_t *pAnchor, unsigned int *pReqLength)
{
    if (pAnchor == nullptr || pAnchor->pMap == nullptr) return nullptr;
    trace_file_header_t *header = header_of(pAnchor);
    const unsigned int requested = *pReqLength;
    const qn_uint64_t needed = qn_uint64_t{requested} + record_header_bytes;
    const qn_uint32_t max_alloc_loop = pAnchor->uRequestedFileSize / record_header_bytes;

    // One comparison for two questions: is the record too long, and has a reader asked us to wait? A request is seen by
    // the records that, with it, come to more than the longest one.
    const qn_uint32_t tail_request = load_relaxed(header->uTailReq);
    if (__builtin_expect(qn_uint64_t{tail_request} + requested > pAnchor->uMaxSize, 0)) {
        if (tail_request == 0) return nullptr;
        do_coordination(pAnchor);
    }
    if (requested % 2 != 0) debug("Odd length requested: %u\n", requested);

    trace_record_header_t *next = pAnchor->pNextFree;
    if (bytes_to_end(pAnchor, next) == 0) return pageFull(pAnchor, pReqLength); // the last record filled a page exactly
    qn_uint32_t consumed = 0;
    bool wrapped = false;
    overwritten_start start;
    for (qn_uint32_t count = 0;; ++count) {
        if (count > max_alloc_loop) return give_up_looping(pAnchor, requested);
        if (__builtin_expect(next->seqNumber == load_relaxed(header->uSeqLock), 0)) wait_tail(pAnchor, next->seqNumber);
        const qn_uint32_t room = bytes_to_end(pAnchor, next);
        start.look_at(next, room);
        if (__builtin_expect(next->length > room, 0)) clip_to_mapping(pAnchor, next);
        const qn_uint32_t length = next->length;
        consumed += length;
        if (consumed >= needed) break;

        next = behind(next, length);
        if (length == room) {
            if (wrapped) return give_up(pAnchor, "opal_trace: allocate_space allocation loop overwrap\n");
            if (is_multipage(pAnchor)) return pageFull(pAnchor, pReqLength);
            wrapped = true;
            wrap_round(pAnchor, consumed);
            next = pAnchor->pNextFree;
            consumed = 0;
        } else if (room - length < record_header_bytes) {
            return give_up(pAnchor, "opal_trace: allocate_space overrun one\n");
        }
    }

    trace_record_header_t *record = pAnchor->pNextFree;
    record->function = being_written;
    keep_store_order();
    record->length = consumed;
    pAnchor->seqNumber += 2;
    record->seqNumber = pAnchor->seqNumber;
    if (consumed > needed) {
        trace_record_header_t *rest = behind(record, requested);
        if (__builtin_expect(bytes_to_end(pAnchor, rest) < record_header_bytes, 0)) {
            if (is_multipage(pAnchor)) return pageFull(pAnchor, pReqLength);
            rest = pAnchor->pWrap;
        } else {
            rest->length = consumed - requested;
        }
        pAnchor->pNextFree = rest;
        rest->function = free_space;
        rest->seqNumber = format::seq_filler;
        keep_store_order();
        record->length = requested;
    } else {
        // No room for a rest: the record keeps the 28 bytes.
        pAnchor->pNextFree = behind(record, consumed);
        if (bytes_to_end(pAnchor, pAnchor->pNextFree) == 0 && !is_multipage(pAnchor))
            pAnchor->pNextFree = pAnchor->pWrap;
    }
    keep_store_order();
    publish_oldest(pAnchor);

    record->threadId = static_cast<qn_uint32_t>(pthread_self());
    qn_uint64_t now = 0;
    cu_get_ctr_1(&now);
    record->timeStamp = now;
    start.keep_in(header);
    return record;
}
