// Starting a trace as a whole: the page set when there is one, then its pages, then its start record.
//
// Anchor set lock, held by the caller; the ..._locked forms take it.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "trace/components/component.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/page_names.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"
#include "trace/spooling/spool.h"

namespace
{
using namespace qn::tr;

// A page's name given back as a trace's name.
void reduce_to_trace_name(char *name)
{
    const std::string_view text(name);
    const size_t suffix = text.find(".sp");
    if (suffix != std::string_view::npos && suffix + 3 == text.size()) cut_at_second_last_dot(name);
}

// The expression is the interface: other programs reckon with its results.
qn_uint32_t round_page_size(qn_uint32_t bytes, qn_int32_t memory_page)
{
    const auto page = static_cast<qn_uint32_t>(memory_page);
    return (bytes + page) & ~page;
}

pthread_mutex_t *new_biased_mutex()
{
    auto *lock = static_cast<biased_mutex *>(std::malloc(sizeof(biased_mutex)));
    if (lock == nullptr) return nullptr;
    init_biased_mutex(&lock->mutex);
    return &lock->mutex;
}

// Frees the pages from `first` up to the head; none of them is mapped.
void free_pages(const trace_anchor_t *head, trace_anchor_t *first)
{
    for (trace_anchor_t *page = first; page != nullptr && page != head;) {
        trace_anchor_t *following = page->nextPage;
        pthread_mutex_destroy(&page->anchorMutex);
        std::free(page);
        page = following;
    }
}

// A chain of page anchors from number 2 on, whose last leads to the head; null when memory runs out, which is recorded. A
// number is left out when a trace file of its own goes by that page's name: that one has a lock and a ring of its own.
trace_anchor_t *new_pages(trace_anchor_t *head, const char *base_name, qn_uint32_t pages)
{
    trace_anchor_t *first = head;
    trace_anchor_t *last = nullptr;
    for (qn_uint32_t number = 2; number <= pages; ++number) {
        char page_name[trace_file_name_bytes];
        name_page(page_name, base_name, number);
        debug("creating page anchor '%s'\n", page_name);
        trace_anchor_t *page = getSplAnchor(head, page_name);
        if (page == nullptr) {
            free_pages(head, first);
            return nullptr;
        }
        if (!is_page_of(page, head)) continue;
        page->nextPage = head;
        (last != nullptr ? last->nextPage : first) = page;
        last = page;
    }
    return first;
}

// Makes the anchor the head of a ring of `pages` page anchors; the set's lock is held behind it.
qn_int32_t make_page_set(trace_anchor_t *head, qn_uint32_t pages, future_set_lock &lock)
{
    trace_spool_spec_t *spool = head->spool;
    const qn_uint32_t wanted = load_relaxed(spool->pg_size);
    const qn_uint32_t page_size = wanted != 0 ? wanted : head->uRequestedFileSize / pages;
    if (head->uRequestedTraceSize == 0) head->uRequestedTraceSize = head->uRequestedFileSize;
    head->uRequestedFileSize = round_page_size(page_size, head->pageSize);
    store_relaxed(spool->pg_size, head->uRequestedFileSize);

    char name_before[trace_file_name_bytes];
    std::memcpy(name_before, head->fileName, sizeof name_before);
    char base_name[trace_file_name_bytes];
    std::memcpy(base_name, name_before, sizeof base_name);
    reduce_to_trace_name(base_name);
    if (!has_room_for_page_names(base_name)) return set_error_str(QN_TR_EFILENAME, 17, head->fileName);

    // A set taken apart leaves its mutex behind, in case a thread still waits for it.
    pthread_mutex_t *shared = head->pSpoolMutex != nullptr ? head->pSpoolMutex : new_biased_mutex();
    if (shared == nullptr) return set_error(QN_TR_ENOMEM, 14);
    lock.take(*shared);
    name_page(head->fileName, base_name, 1);
    debug("creating page '%s'\n", head->fileName);
    store_release(head->pSpoolMutex, shared);

    trace_anchor_t *first = new_pages(head, base_name, pages);
    if (first == nullptr) {
        set_file_name(head, name_before); // a single file as before; the next start tries again
        return -1;
    }
    head->pActivePg = head;
    head->ppActivePg = &head->pActivePg;
    head->p_head_spool_anchor = head;
    store_relaxed(head->nextPage, first);
    return 0;
}

// A page that was cut off from its set stays what it is.
bool may_become_page_set(const trace_anchor_t *anchor)
{
    const bool may_have_pages =
        load_relaxed(anchors.pFirstSpoolSpec) != nullptr || load_relaxed(anchors.bMultipageEnabled) == 1;
    return may_have_pages && anchor->nextPage == nullptr && anchor->pMap == nullptr &&
           (anchor->p_head_spool_anchor == nullptr || anchor->p_head_spool_anchor == anchor);
}

// Binds the trace to its specification, and makes a page set of it if that one asks for pages. The list of specifications
// and the names of traces are the global mutex's. A writer who starts a damaged trace afresh has only the set lock and
// must not wait for the other: while that is taken, the file stays a single one until its next start.
qn_int32_t become_page_set_if_asked(trace_anchor_t *anchor, future_set_lock &lock)
{
    const mutex_try_lock global(anchors.anchorMutex, lock_rank::global);
    if (!global) return 0;
    process_spool_spec(anchor, anchors.pFirstSpoolSpec);
    const qn_uint32_t pages = spooling_is_on(anchor) ? load_relaxed(anchor->spool->pages) : 0;
    return pages != 0 ? make_page_set(anchor, pages, lock) : 0;
}

void start_if_on(trace_anchor_t *anchor, qn_int32_t &status)
{
    const anchor_set_lock set(anchor);
    if (!set)
        status = set_error_int(QN_TR_ELOCK, 9, set.result());
    else if (anchor->pMap == nullptr && is_trace_on(anchor))
        status = start_trace(anchor);
}

qn_int32_t start_pages(trace_anchor_t *anchor)
{
    qn_int32_t status = 0;
    for_each_page(anchor, [&](trace_anchor_t *page) {
        if (status == 0) status = start_trace_page(page);
    });
    return status;
}
} // namespace

qn_int32_t start_trace(trace_anchor_t *anchor)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    if (load_relaxed(this_is_child) != 0) return 0; // the parent may be writing the file

    future_set_lock lock(anchor);
    if (may_become_page_set(anchor)) {
        const qn_int32_t status = become_page_set_if_asked(anchor, lock);
        if (status != 0) return status;
    }

    const qn_int32_t status = start_pages(anchor);
    if (status != 0) return status;
    if (is_spooled_page(anchor)) int_record_start(*anchor->ppActivePg);
    // Only this trace's pages: the walk over all traces takes the global mutex, which comes before the anchor set lock.
    if (load_relaxed(memory_is_pinned) != 0 && !master_override_off()) touch_trace(anchor);
    return 0;
}

qn_int32_t trace_reinit(trace_anchor_t *anchor)
{
    char file_name[trace_file_name_bytes];
    char saved_name[trace_file_name_bytes];
    std::memcpy(file_name, anchor->fileName, sizeof file_name);

    if (is_trace_on(anchor)) stop_trace(anchor, 0);
    const int length = std::snprintf(saved_name, sizeof saved_name, "%s.save", file_name);
    if (length < trace_file_name_bytes) std::rename(file_name, saved_name);
    return start_trace(anchor);
}

int is_trace_on(trace_anchor_t *anchor) { return anchor->fileName[0] != '\0' && any_category_traces() ? 1 : 0; }

namespace qn::tr
{
qn_int32_t start_trace_locked(trace_anchor_t *anchor)
{
    const anchor_set_lock set(anchor);
    if (!set) return set_error_int(QN_TR_ELOCK, 9, set.result());
    return start_trace(anchor);
}

qn_int32_t start_traces_that_are_on()
{
    qn_int32_t status = 0;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = load_acquire(anchor->next))
        start_if_on(anchor, status);
    return status;
}

qn_int32_t become_unbound(trace_anchor_t *anchor)
{
    const anchor_set_lock set(anchor);
    if (!set) return set_error_int(QN_TR_ELOCK, 9, set.result());
    const qn_int32_t status = stop_trace(anchor, load_relaxed(this_is_child));
    release_all_obsolete_pages(anchor);
    // Cut off before they are freed: a child that another thread forks meanwhile walks the ring.
    trace_anchor_t *pages = anchor->nextPage;
    store_relaxed(anchor->nextPage, nullptr);
    anchor->pActivePg = nullptr;
    anchor->ppActivePg = nullptr;
    anchor->p_head_spool_anchor = nullptr;
    free_pages(anchor, pages);
    if (anchor->uRequestedTraceSize != 0) anchor->uRequestedFileSize = anchor->uRequestedTraceSize;
    anchor->uRequestedTraceSize = 0;
    forget_binding(anchor);
    return status;
}
} // namespace qn::tr
