// Changing the ring of a page set while it is written: new pages, fewer pages, and the pages that were cut off but are
// not copied yet. Global mutex and anchor set lock, held by the caller: no writer is inside the set, and its rings are
// walked by nobody else.
//
// A page that was cut off is chained by `next`, which pages of a ring do not use; its `nextPage` is null, so that a
// writer who is still in it goes on to the head.
#include <cstdlib>
#include <cstring>

#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/page_names.h"
#include "trace/files/trace_file.h"
#include "trace/spooling/spool_list.h"

namespace
{
using namespace qn::tr;

qn_uint8_t state_of(trace_anchor_t *page) { return load_relaxed(header_of(page)->sp_flags); }

// Nothing in the page waits for its copy, and nobody writes it.
bool may_be_released(const trace_anchor_t *head, trace_anchor_t *page)
{
    return page->pMap == nullptr || (state_of(page) == format::page_state::ready && head->pActivePg != page);
}

// The page that was written last when the trace was stopped leads to the head, too.
void release(trace_anchor_t *head, trace_anchor_t *page)
{
    if (head->pActivePg == page) head->pActivePg = head;
    stop_trace_page(page, load_relaxed(this_is_child));
    pthread_mutex_destroy(&page->anchorMutex);
    std::free(page);
}

void make_obsolete(trace_anchor_t *head, trace_anchor_t *page)
{
    page->next = nullptr;
    if (head->p_obsolete_pages_tail != nullptr)
        head->p_obsolete_pages_tail->next = page;
    else
        head->p_obsolete_pages = page;
    head->p_obsolete_pages_tail = page;
}

trace_anchor_t *take_obsolete_pages(trace_anchor_t *head)
{
    trace_anchor_t *pages = head->p_obsolete_pages;
    head->p_obsolete_pages = head->p_obsolete_pages_tail = nullptr;
    return pages;
}

// Releases the obsolete pages for which may_go(page) holds, and keeps the others.
template <class MayGo>
void release_obsolete_pages(trace_anchor_t *head, MayGo may_go)
{
    for (trace_anchor_t *page = take_obsolete_pages(head); page != nullptr;) {
        trace_anchor_t *following = page->next;
        if (may_go(page))
            release(head, page);
        else
            make_obsolete(head, page);
        page = following;
    }
}

// The obsolete page of that name, which is obsolete no longer; null when there is none.
trace_anchor_t *take_back(trace_anchor_t *head, const char *page_name)
{
    trace_anchor_t *found = nullptr;
    for (trace_anchor_t *page = take_obsolete_pages(head); page != nullptr;) {
        trace_anchor_t *following = page->next;
        if (found == nullptr && std::strcmp(page->fileName, page_name) == 0)
            found = page;
        else
            make_obsolete(head, page);
        page = following;
    }
    if (found != nullptr) found->next = nullptr;
    return found;
}

// A resize changes the number of pages that a specification names, and leaves the rings as they are.
bool is_in_ring(trace_anchor_t *head, const char *page_name)
{
    bool found = false;
    for_each_page(head,
                  [&](const trace_anchor_t *page) { found = found || std::strcmp(page->fileName, page_name) == 0; });
    return found;
}

// Starts a page that joins a set which is being written. Its file may have been the active page of a process that died;
// the writers stay on the page they are on, which holds this process's time base.
void start_new_page(trace_anchor_t *head, trace_anchor_t *page)
{
    trace_anchor_t *active = head->pActivePg;
    start_trace_page(page);
    if (head->pActivePg == active) return;
    head->pActivePg = active;
    store_relaxed(header_of(page)->sp_flags, format::page_state::ready);
}

// Closes the ring behind its `pages`th page, and releases what is cut off.
void cut_ring(trace_anchor_t *head, qn_uint32_t pages)
{
    trace_anchor_t *last = head;
    for (qn_uint32_t i = 1; i < pages && last->nextPage != head; ++i) last = last->nextPage;
    trace_anchor_t *page = last->nextPage;
    store_relaxed(last->nextPage, head);
    while (page != head) {
        trace_anchor_t *following = page->nextPage;
        store_relaxed(page->nextPage, nullptr);
        if (may_be_released(head, page))
            release(head, page);
        else
            make_obsolete(head, page);
        page = following;
    }
}
} // namespace

void reconfigure_pages(trace_anchor_t *p_anchor, trace_spool_spec_t *p_old_spool_spec,
                       trace_spool_spec_t *p_new_spool_spec)
{
    if (p_anchor->nextPage == nullptr) return; // a single file stays one until it is started again

    trace_anchor_t *last = nullptr;
    for (trace_anchor_t *page = p_anchor->nextPage; page != p_anchor; page = page->nextPage) {
        store_relaxed(page->spool, p_new_spool_spec);
        last = page;
    }
    for (trace_anchor_t *page = p_anchor->p_obsolete_pages; page != nullptr; page = page->next)
        store_relaxed(page->spool, p_new_spool_spec);

    if (p_new_spool_spec->pages > p_old_spool_spec->pages)
        add_new_pages(p_anchor, p_old_spool_spec, p_new_spool_spec, last);
    else if (p_new_spool_spec->pages < p_old_spool_spec->pages)
        cut_ring(p_anchor, p_new_spool_spec->pages);
}

trace_anchor_t *add_new_pages(trace_anchor_t *p_anchor, trace_spool_spec_t *p_old_spool_spec,
                              trace_spool_spec_t *p_new_spool_spec, trace_anchor_t *p_original_last_anchor)
{
    char base_name[trace_file_name_bytes];
    std::memcpy(base_name, p_anchor->fileName, sizeof base_name);
    cut_at_second_last_dot(base_name);
    if (!has_room_for_page_names(base_name)) return nullptr;

    trace_anchor_t *first_new = nullptr;
    trace_anchor_t *last_new = nullptr;
    const auto give_up = [&] {
        for (trace_anchor_t *page = first_new; page != nullptr;) {
            trace_anchor_t *following = page->nextPage;
            page->nextPage = nullptr;
            make_obsolete(p_anchor, page);
            page = following;
        }
        return nullptr;
    };
    for (qn_uint32_t number = p_old_spool_spec->pages + 1; number <= p_new_spool_spec->pages; ++number) {
        char page_name[trace_file_name_bytes];
        name_page(page_name, base_name, number);
        if (is_in_ring(p_anchor, page_name)) continue;
        trace_anchor_t *page = take_back(p_anchor, page_name);
        if (page == nullptr) page = getSplAnchor(p_anchor, page_name);
        if (page == nullptr) return give_up();
        if (!is_page_of(page, p_anchor)) continue;
        start_new_page(p_anchor, page);
        if (last_new != nullptr)
            last_new->nextPage = page;
        else
            first_new = page;
        last_new = page;
        last_new->nextPage = nullptr;
    }
    if (first_new == nullptr) return nullptr;
    store_relaxed(last_new->nextPage, p_anchor);
    trace_anchor_t *last = p_original_last_anchor != nullptr ? p_original_last_anchor : p_anchor;
    store_release(last->nextPage, first_new);
    return first_new;
}

namespace qn::tr
{
void release_copied_obsolete_pages(trace_anchor_t *anchor)
{
    release_obsolete_pages(anchor, [anchor](trace_anchor_t *page) { return may_be_released(anchor, page); });
}

void release_all_obsolete_pages(trace_anchor_t *anchor)
{
    release_obsolete_pages(anchor, [](const trace_anchor_t *) { return true; });
}
} // namespace qn::tr
