// Stopping trace files, and the end of all tracing.
#include <cerrno>
#include <cstdlib>
#include <sys/mman.h>
#include <unistd.h>

#include "trace/components/component.h"
#include "trace/components/specifications.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/spooling/spool.h"

namespace
{
using namespace qn::tr;

// Frees a list and clears its ends: first, since a child that another thread forks meanwhile goes by them.
template <class Node>
void free_list(Node *&first, Node *&last)
{
    Node *node = first;
    first = last = nullptr;
    while (node != nullptr) {
        Node *next = node->pNext;
        std::free(node);
        node = next;
    }
}

void free_components(trace_anchor_t *anchor)
{
    const mutex_lock list(component_list_mutex);
    while (anchor->pFirstComp != nullptr) {
        component_anchor_t *component = anchor->pFirstComp;
        anchor->pFirstComp = component->pNext;
        free_component(component);
    }
}

// Whether the header can be written: where somebody truncated the file, the store would be the end of the program. A
// kernel that cannot tell is taken at its best.
bool is_header_there(const trace_anchor_t *anchor)
{
    return madvise(anchor->pMap, sizeof(trace_file_header_t), MADV_POPULATE_WRITE) == 0 || errno != EFAULT;
}

// Under the queue mutex, so that the thread cannot be between its last test and its wait; but a copy to a slow disk, for
// which it holds that mutex, is not waited for.
void wake_spool_thread()
{
    const mutex_try_lock queue(spq.mutex);
    pthread_cond_signal(&spq.cond);
}

// Lets the spool thread come to its end: at most 2 s.
void wait_for_spool_thread()
{
    constexpr int most_waits = 100;
    constexpr useconds_t wait_us = 20000;
    wake_spool_thread();
    for (int waits = 0; waits < most_waits && load_acquire(is_spool_running) != 0; ++waits) {
        usleep(wait_us);
        wake_spool_thread();
    }
}
} // namespace

qn_int32_t stop_trace_page(trace_anchor_t *anchor, int child)
{
    debug("**@ stop_trace_page enter for %s\n", anchor->fileName);
    if (anchor->pMap == nullptr) return 0;
    if (!child) {
        {
            const mutex_lock not_being_copied(spq.mutex);
            if (is_header_there(anchor)) store_relaxed(header_of(anchor)->uFlags, 0);
        }
        debug("**@ stop_trace_page - msync(MS_SYNC) for %s\n", anchor->fileName);
        msync(anchor->pMap, anchor->uActualFileSize, MS_SYNC);
    }
    const mutex_lock queue(spq.mutex);
    while (sp_q_element_t *element = spool_dequeue_element(&spq, anchor)) std::free(element);
    unmap_page(anchor);
    return 0;
}

qn_int32_t stop_trace(trace_anchor_t *anchor, int child)
{
    debug("*** stop_trace for %s", anchor->fileName);
    qn_int32_t status = 0;
    for_each_page(anchor, [&](trace_anchor_t *page) {
        if (status == 0) status = stop_trace_page(page, child);
    });
    // A page that was cut off while it was written is in no ring: the next start goes on in the head.
    trace_anchor_t *active = anchor->pActivePg;
    if (status == 0 && active != nullptr && active->nextPage == nullptr) {
        status = stop_trace_page(active, child);
        anchor->pActivePg = anchor;
    }
    return status;
}

void tr_term_file_anchor(trace_anchor_t *anchor)
{
    stop_trace(anchor, 0);
    for (trace_anchor_t *page = anchor->p_obsolete_pages; page != nullptr; page = page->next) stop_trace_page(page, 0);
    free_components(anchor);
    free_list(anchor->pFirstTraceSpec, anchor->pLastTraceSpec);
    free_list(anchor->pFirstMapSpec, anchor->pLastMapSpec);
    anchor->fileName[0] = '\0';
    anchor->bInitialized = 0;
}

void tr_term(void)
{
    global_stop_trace();
    if (load_relaxed(this_is_child) != 0) return;
    wait_for_spool_thread();

    const global_lock global;
    if (!global) return;
    trace_anchor_t *next = nullptr;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = next) {
        next = load_acquire(anchor->next);
        const anchor_set_lock set(anchor);
        if (set) tr_term_file_anchor(anchor);
    }
}

namespace qn::tr
{
qn_int32_t stop_trace_locked(trace_anchor_t *anchor)
{
    const anchor_set_lock set(anchor);
    if (!set) return set_error_int(QN_TR_ELOCK, 9, set.result());
    return stop_trace(anchor, load_relaxed(this_is_child));
}
} // namespace qn::tr
