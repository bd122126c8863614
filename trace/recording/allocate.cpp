// Space for a record in the ring of one page. Anchor set lock, held by the caller.
//
// Space is taken at the free pointer, by consuming the oldest records from there on until they span the request and 28
// bytes more, which the free rest needs for a header of its own:
//
//   before   ... newest | old | old | old ...          after   ... newest | new record | free rest | old ...
//                       ^ pNextFree                                                     ^ pNextFree
//
// At every instant the records tile the ring, so that a process killed between any two stores leaves a ring that can be
// continued. The last part, and a short way for the usual case, are in space.h.
#include <algorithm>
#include <cstdio>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/recording/space.h"

namespace
{
using namespace qn::tr;
using format::record_header_bytes;

constexpr auto free_space = static_cast<qn_uint16_t>(format::kind::free_space);
constexpr auto being_written = static_cast<qn_uint16_t>(format::kind::being_written);
constexpr auto start_kind = static_cast<qn_uint16_t>(format::kind::start);

// The longest span that one record can have: the whole ring, or a whole page that does not begin with a notice.
qn_uint64_t longest_span(const trace_anchor_t *anchor)
{
    trace_record_header_t *first = never_wraps(anchor) ? anchor->pRing : anchor->pWrap;
    return static_cast<qn_uint64_t>(anchor->pMapEnd - address(first));
}

// A record that no page has room for behind its notice, which only a reader's request to wait lets through, would go from
// page to page for good.
[[gnu::noinline]] trace_record_header_t *go_on_in_next_page(trace_anchor_t *page, unsigned int *requested)
{
    return page->pNextFree != page->pWrap ? pageFull(page, requested) : nullptr;
}

// The number that stands for no record holds none, not even one that has it: in a damaged ring there may be one.
bool is_held(const trace_file_header_t *header, const trace_record_header_t *record)
{
    return record->seqNumber == load_relaxed(header->uSeqLock) && record->seqNumber != format::seq_lock_none;
}

qn_uint32_t bytes_to_end(const trace_anchor_t *anchor, const trace_record_header_t *record)
{
    return static_cast<qn_uint32_t>(anchor->pMapEnd - reinterpret_cast<const unsigned char *>(record));
}

// What the header takes over from a start record that is overwritten: without it the records behind that one would have
// no time base.
struct start_of_process {
    qn_uint32_t pid;
    cu_timeinfo_t time_info;
};

[[gnu::cold, gnu::noinline]] void remember(start_of_process &of, const trace_file_header_t *header,
                                           const trace_record_header_t *record, qn_uint32_t room)
{
    if (room < sizeof(trace_record_start_t)) {
        of = {load_relaxed(header->uPid), header->timeInfo}; // cut off by the end of the file: no body to be read
        return;
    }
    const auto *start = reinterpret_cast<const trace_record_start_t *>(record);
    of = {start->pid, start->timeInfo};
}

[[gnu::cold, gnu::noinline]] void keep_in_header(trace_file_header_t *header, const start_of_process &start)
{
    header->timeInfo = start.time_info;
    store_relaxed(header->uPid, start.pid);
}

// Whether the calling thread starts a damaged trace afresh. Who damages rings may be at it still, and meet the start
// record of the fresh one: that ring is then left to the next writer, or this would never end.
class fresh_start
{
public:
    fresh_start() { ++in_progress_; }
    fresh_start(const fresh_start &) = delete;
    fresh_start &operator=(const fresh_start &) = delete;
    ~fresh_start() { --in_progress_; }
    static bool is_in_progress() { return in_progress_ != 0; }

private:
    static thread_local int in_progress_;
};

constinit thread_local int fresh_start::in_progress_ = 0;

[[gnu::cold, gnu::noinline]] trace_record_header_t *give_up(trace_anchor_t *anchor, const char *reason)
{
    log_trc_error(reason, '0');
    if (fresh_start::is_in_progress()) return nullptr;
    const fresh_start afresh;
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

// Where the ring is read from when the free pointer is at `next_free`; at the end of the file, from the ring's start.
qn_uint32_t oldest_offset(trace_anchor_t *anchor, const unsigned char *next_free)
{
    if (next_free == anchor->pMapEnd) return header_of(anchor)->uOffset;
    return static_cast<qn_uint32_t>(next_free - anchor->pMap);
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
    restore_layout(anchor, anchor->pWrap);
    store_relaxed(header_of(anchor)->uOldestRecordOffset, header_of(anchor)->uOffset);
    keep_store_order();
    filler->function = free_space;
}

// The record leaves no room for a rest's header before the end of the file: the rest is declared at the start of the
// ring. Cannot come about with a sound mapping.
[[gnu::cold, gnu::noinline]] trace_record_header_t *claim_before_start(trace_anchor_t *anchor, qn_uint32_t consumed,
                                                                       unsigned int requested)
{
    trace_record_header_t *record = anchor->pNextFree;
    record->function = being_written;
    keep_store_order();
    record->length = consumed;
    anchor->seqNumber += 2;
    record->seqNumber = anchor->seqNumber;
    anchor->pNextFree = anchor->pWrap;
    anchor->pWrap->function = free_space;
    anchor->pWrap->seqNumber = format::seq_filler;
    keep_store_order();
    record->length = requested;
    store_relaxed(header_of(anchor)->uOldestRecordOffset, header_of(anchor)->uOffset);
    return record;
}
} // namespace

trace_record_header_t *allocate_space(trace_anchor_t *pAnchor, unsigned int *pReqLength)
{
    return allocate_space_page(page_to_write(pAnchor), pReqLength);
}

trace_record_header_t *qn::tr::reserve_otherwise(trace_anchor_t *anchor, unsigned int requested)
{
    return allocate_space(anchor, &requested);
}

trace_record_header_t *allocate_space_page(trace_anchor_t *pAnchor, unsigned int *pReqLength)
{
    if (pAnchor == nullptr || pAnchor->pMap == nullptr) return nullptr;
    trace_file_header_t *header = header_of(pAnchor);
    const unsigned int requested = *pReqLength;
    const qn_uint64_t needed = qn_uint64_t{requested} + record_header_bytes;

    // One comparison for two questions: is the record too long, and has a reader asked us to wait? A request is seen by
    // the records that, with it, come to more than the longest one.
    const qn_uint32_t tail_request = load_relaxed(header->uTailReq);
    if (__builtin_expect(qn_uint64_t{tail_request} + requested > pAnchor->uMaxSize, 0)) {
        if (tail_request == 0) return nullptr;
        do_coordination(pAnchor);
        if (needed > longest_span(pAnchor)) return nullptr; // no wait makes room for it
    }
    if (__builtin_expect(requested % 2 != 0, 0)) debug("Odd length requested: %u\n", requested);

    trace_record_header_t *next = pAnchor->pNextFree;
    const unsigned char *end = pAnchor->pMapEnd;
    if (__builtin_expect(address(next) == end, 0)) return pageFull(pAnchor, pReqLength); // filled exactly
    const trace_record_header_t *start = nullptr; // the last start record among those consumed
    qn_uint64_t consumed = 0;
    bool wrapped = false;
    // A file may be larger than what was requested, and a sound ring of it may hold as many more records.
    const qn_int64_t most_bytes = std::max(pAnchor->uRequestedFileSize, pAnchor->uActualFileSize);
    for (qn_int64_t budget = most_bytes;; budget -= record_header_bytes) {
        if (__builtin_expect(budget < 0, 0)) return give_up_looping(pAnchor, requested);
        if (__builtin_expect(is_held(header, next), 0)) wait_tail(pAnchor, next->seqNumber);
        if (__builtin_expect(next->function == start_kind, 0)) start = next;
        const unsigned char *behind_next = address(next) + next->length;
        if (__builtin_expect(behind_next > end, 0)) {
            clip_to_mapping(pAnchor, next);
            behind_next = end;
        }
        consumed += static_cast<qn_uint64_t>(behind_next - address(next));
        if (consumed >= needed) break;

        next = record_of(behind_next);
        if (__builtin_expect(behind_next == end, 0)) {
            if (wrapped) return give_up(pAnchor, "opal_trace: allocate_space allocation loop overwrap\n");
            if (never_wraps(pAnchor)) return go_on_in_next_page(pAnchor, pReqLength);
            wrapped = true;
            wrap_round(pAnchor, static_cast<qn_uint32_t>(consumed));
            next = pAnchor->pNextFree;
            consumed = 0;
        } else if (__builtin_expect(behind_next > end - record_header_bytes, 0)) {
            return give_up(pAnchor, "opal_trace: allocate_space overrun one\n");
        }
    }
    const unsigned char *consumed_end = address(pAnchor->pNextFree) + consumed;
    if (__builtin_expect(consumed == needed && consumed_end > end - record_header_bytes && consumed_end != end, 0))
        return give_up(pAnchor, "opal_trace: allocate_space overrun one\n"); // the next record would have no header
    start_of_process overwritten;
    if (__builtin_expect(start != nullptr, 0)) remember(overwritten, header, start, bytes_to_end(pAnchor, start));

    trace_record_header_t *record = nullptr;
    if (consumed == needed || address(pAnchor->pNextFree) + requested <= end - record_header_bytes) {
        record = pAnchor->pNextFree;
        unsigned char *next_free = cut_record(pAnchor, record, static_cast<qn_uint32_t>(consumed), requested);
        move_free_pointer(pAnchor, next_free, oldest_offset(pAnchor, next_free));
    } else if (never_wraps(pAnchor)) {
        return pageFull(pAnchor, pReqLength);
    } else {
        record = claim_before_start(pAnchor, static_cast<qn_uint32_t>(consumed), requested);
    }
    // The record ends where the file ends: a single file goes on at the start of the ring, a page is full.
    if (address(pAnchor->pNextFree) == end && !never_wraps(pAnchor)) pAnchor->pNextFree = pAnchor->pWrap;
    stamp(record);
    if (__builtin_expect(start != nullptr, 0)) keep_in_header(header, overwritten);
    return record;
}
