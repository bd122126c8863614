// Going on to the next page of a page set. Anchor set lock, held by the caller; the page that is taken over is held by its
// own mutex too, while it is reset, so that the spool thread does not begin to copy it.
//
// A page that was copied in time is simply written anew. Any other is overwritten all the same, since writers never wait
// for the spool thread here: that is counted, stamped into the header, and told by a notice at the start of the page.
#include <algorithm>
#include <array>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <sys/syslog.h>

#include "platform/common/descriptors.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/recording/space.h"
#include "trace/spooling/spool.h"

namespace
{
using namespace qn::tr;

constexpr qn_uint32_t switching_debug_level = 1; // lines are written above it

// A page is not mapped when its start failed.
bool can_be_written(const trace_anchor_t *page) { return page->pMap != nullptr; }

bool ring_can_be_written(trace_anchor_t *page)
{
    bool any = false;
    for_each_page(page, [&](const trace_anchor_t *candidate) { any = any || can_be_written(candidate); });
    return any;
}

void log_switch(int priority, const char *what, trace_anchor_t *page, int flags)
{
    if (!debug_level_above(switching_debug_level)) return;
    log_line(priority, "%s %s (flags: %d, tid: %u, pNextPage: %p)\n", page->fileName, what, flags,
             static_cast<unsigned>(pthread_self()), static_cast<void *>(page));
}

// Counts whether what the page holds was spooled in time, and takes it back from the queue when it was not.
void account_for_contents(trace_anchor_t *page)
{
    trace_file_header_t *header = header_of(page);
    const qn_uint8_t state = load_relaxed(header->sp_flags);
    if (state == format::page_state::ready) {
        page->consecutiveSpoolNotCopied = 0;
        log_switch(LOG_WARNING, "reuse", page, state);
        return;
    }
    log_switch(LOG_WARNING, "overwrite", page, state);
    header->sp_reuse_tm = static_cast<qn_uint32_t>(std::time(nullptr));
    spool_dequeue_and_delete_element(&spq, page);
    page->consecutiveSpoolNotCopied += 1;
}

void make_free(trace_record_header_t *record, qn_uint32_t length, qn_uint32_t sequence)
{
    record->function = static_cast<qn_uint16_t>(format::kind::free_space);
    record->seqNumber = sequence;
    record->length = length;
}

// Makes one free record of the whole ring. The records tile the page at every instant: first it is entered at its start,
// where the old records begin, then the first of them swallows the rest.
void empty_ring(trace_anchor_t *page)
{
    trace_file_header_t *header = header_of(page);
    page->pWrap = page->pRing;
    restore_layout(page, page->pRing);
    store_relaxed(header->uOldestRecordOffset, header->uOffset);
    keep_store_order();
    page->seqNumber = 0;
    page->pWrap->function = static_cast<qn_uint16_t>(format::kind::being_written);
    keep_store_order();
    page->pWrap->length = static_cast<qn_uint32_t>(page->pMapEnd - address(page->pWrap));
    page->pWrap->seqNumber = page->seqNumber;
    keep_store_order();
    page->pWrap->function = static_cast<qn_uint16_t>(format::kind::free_space);
}

// Tells at the start of the page that its contents were lost; the ring begins behind that. The free record behind it is
// shorter than the rest of the page by the notice's length: other programs reckon with that. A filler closes the page.
void write_notice(trace_anchor_t *page)
{
    std::array<char, format_buffer_bytes> text;
    const qn_uint32_t count = page->consecutiveSpoolNotCopied;
    const int written = std::snprintf(text.data(), text.size(), "SPOOL: %s not spooled %u consecutive time%s",
                                      page->fileName, count, count > 1 ? "s" : "");
    const size_t text_bytes = std::min(static_cast<size_t>(written), text.size() - 1) + 1;
    const auto length = static_cast<qn_uint32_t>((text_bytes + 35) & ~size_t{3});

    trace_record_header_t *notice = page->pWrap;
    trace_record_header_t *free_record = record_of(address(notice) + length);
    const auto rest = static_cast<qn_uint32_t>(page->pMapEnd - address(free_record));
    make_free(free_record, rest - length, page->seqNumber);
    make_free(record_of(page->pMapEnd - length), length, format::seq_filler);

    std::memcpy(notice + 1, text.data(), text_bytes);
    std::memcpy(notice->compId, format::library_component, sizeof notice->compId);
    stamp(notice);
    notice->seqNumber = page->seqNumber;
    keep_store_order();
    notice->length = length;
    keep_store_order();
    notice->function = static_cast<qn_uint16_t>(format::kind::page_note);
    page->pWrap = free_record;
    if (debug_level_above(switching_debug_level)) log_line(LOG_WARNING, "%s consec %u\n", page->fileName, count);
}

void start_writing(trace_anchor_t *page)
{
    account_for_contents(page);
    store_relaxed(header_of(page)->sp_flags, format::page_state::active);
    *page->ppActivePg = page;
    empty_ring(page);
    // All that relates the page's counters to time is in its header now: the start record is in another page.
    cu_get_procspeed_1(&header_of(page)->timeInfo);
    if (page->consecutiveSpoolNotCopied != 0) write_notice(page);
    page->pNextFree = page->pWrap;
}

// Queues the full page and makes another one of its set the active one; null when there is none to be had. Each line that
// is logged on the way would be a place where the thread may be cancelled, with the set half switched.
trace_anchor_t *switch_pages(trace_anchor_t *full)
{
    const qn::platform::no_cancel whole;
    store_relaxed(header_of(full)->sp_flags, format::page_state::full);
    trace_anchor_t *next = spool_enqueue(nullptr, nullptr, full, &spq, 0);
    if (next == nullptr) {
        set_error(QN_TR_ENOMEM, 14);
        return nullptr;
    }
    if (!ring_can_be_written(next)) {
        spool_dequeue_and_delete_element(&spq, full); // the next record comes here again
        return nullptr;
    }
    for (;; next = next->nextPage) {
        if (!can_be_written(next)) continue;
        const mutex_try_lock page_lock(next->anchorMutex);
        if (page_lock) {
            start_writing(next);
            return next;
        }
        log_switch(LOG_ERR, "locked", next, load_relaxed(header_of(full)->sp_flags));
    }
}
} // namespace

trace_record_header_t *pageFull(trace_anchor_t *pAnchor, unsigned int *pReqLength)
{
    // Space is reserved where the thread can be cancelled again: that may wait for a reader of the file.
    return allocate_space_page(switch_pages(pAnchor), pReqLength);
}
