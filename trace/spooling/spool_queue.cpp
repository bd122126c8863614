// The spool queue: full pages and files to be copied, first in, first out.
//
// The queue mutex guards it, and with it every page in it: a page is unmapped and its anchor freed only after its element
// was taken out under that mutex. The spool thread holds it while it copies, on purpose: the page cannot be taken away or
// written meanwhile, and who fills a page in that time waits for the copy.
#include <cstdlib>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/shared_words.h"
#include "trace/files/text.h"
#include "trace/files/trace_file.h"
#include "trace/spooling/spool.h"

sp_q_t spq = {.mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP, .cond = PTHREAD_COND_INITIALIZER};

namespace
{
using namespace qn::tr;

int page_state(trace_anchor_t *page) { return page->pMap != nullptr ? load_relaxed(header_of(page)->sp_flags) : -1; }

const char *name_of(const sp_q_element_t *element)
{
    return element->pAnchor != nullptr ? element->pAnchor->fileName : element->fileName;
}

sp_q_element_t *new_element(const char *file_name, const char *dest, trace_anchor_t *page, int del)
{
    auto *element = static_cast<sp_q_element_t *>(std::calloc(1, sizeof(sp_q_element_t)));
    if (element == nullptr) {
        set_error(QN_TR_ENOMEM, 14);
        return nullptr;
    }
    element->pAnchor = page;
    element->del = del;
    if (page != nullptr) return element;
    element->dest = dest;
    copy_cut(element->fileName, file_name);
    return element;
}

// One debug line for each page in the queue, newest first, or one for an empty queue.
template <class Log>
void log_queue(const sp_q_t *queue, const char *empty, Log log)
{
    if (!debug_level_above(7)) return;
    if (queue->pFirst == nullptr) debug("%s", empty);
    for (const sp_q_element_t *element = queue->pFirst; element != nullptr; element = element->pNext)
        if (element->pAnchor != nullptr) log(element->pAnchor);
}

void unlink(sp_q_t *queue, sp_q_element_t *element)
{
    if (element == queue->pFirst && element == queue->pLast) {
        debug("ONLY\n");
        queue->pFirst = queue->pLast = nullptr;
    } else if (element == queue->pLast) {
        debug("LAST\n");
        element->pPrev->pNext = nullptr;
        queue->pLast = element->pPrev;
    } else if (element == queue->pFirst) {
        debug("FIRST\n");
        element->pNext->pPrev = nullptr;
        queue->pFirst = element->pNext;
    } else {
        debug("MID\n");
        element->pPrev->pNext = element->pNext;
        element->pNext->pPrev = element->pPrev;
    }
    queue->cnt -= 1;
}

trace_anchor_t *successor(trace_anchor_t *page)
{
    return page->nextPage != nullptr ? page->nextPage : page->p_head_spool_anchor;
}

void log_added(const sp_q_t *queue, trace_anchor_t *page)
{
    trace_anchor_t *next = successor(page);
    if (!debug_level_above(7) || next == nullptr) return;
    debug("%s added to queue (flags: %d); switching to %s (flags: %d cnt: %d)\n", page->fileName, page_state(page),
          next->fileName, page_state(next), queue->cnt);
}
} // namespace

trace_anchor_t *spool_enqueue(const char *fileName, const char *dest, trace_anchor_t *pAnchor, sp_q_t *queue, int del)
{
    sp_q_element_t *element = new_element(fileName, dest, pAnchor, del);
    if (element == nullptr) return nullptr;

    const mutex_lock lock(queue->mutex);
    log_queue(queue, "spool_enqueue before: EMPTY\n",
              [](const trace_anchor_t *page) { debug("spool_enqueue before: %s\n", page->fileName); });
    if (queue->pLast == nullptr) queue->pLast = element;
    element->pNext = queue->pFirst;
    if (queue->pFirst != nullptr) queue->pFirst->pPrev = element;
    queue->pFirst = element;
    queue->cnt += 1;
    log_queue(queue, "spool_enqueue after: EMPTY\n",
              [](const trace_anchor_t *page) { debug("spool_enqueue after: %s\n", page->fileName); });
    if (pAnchor != nullptr) log_added(queue, pAnchor);
    pthread_cond_signal(&queue->cond);
    return pAnchor != nullptr ? successor(pAnchor) : nullptr;
}

sp_q_element_t *spool_dequeue_element(sp_q_t *queue, trace_anchor_t *pAnchor)
{
    const mutex_lock lock(queue->mutex);
    debug("spool_dequeue_element (%s)\n", pAnchor->fileName);
    log_queue(queue, "spool_dequeue_element before: EMPTY\n", [](trace_anchor_t *page) {
        debug("spool_dequeue_element before: %s:%d\n", page->fileName, page_state(page));
    });
    sp_q_element_t *element = queue->pFirst;
    while (element != nullptr && element->pAnchor != pAnchor) element = element->pNext;
    if (element != nullptr) {
        debug("%s removing from queue (trace file) (spool_dequeue_element)\n", pAnchor->fileName);
        unlink(queue, element);
    }
    log_queue(queue, "spool_dequeue_element after: EMPTY\n",
              [](const trace_anchor_t *page) { debug("spool_dequeue_element after: %s\n", page->fileName); });
    return element;
}

void spool_dequeue_and_delete_element(sp_q_t *queue, trace_anchor_t *pAnchor)
{
    std::free(spool_dequeue_element(queue, pAnchor));
}

sp_q_element_t *spool_dequeue_last_element_inside_spq(sp_q_t *queue)
{
    sp_q_element_t *element = queue->pLast;
    if (element == nullptr) return nullptr;
    debug("%s removing from queue (trace file) (spool_dequeue_last_element_inside_spq)\n", name_of(element));
    unlink(queue, element);
    return element;
}

void spool_dequeue_last_and_spool_inside_spq(sp_q_t *queue)
{
    sp_q_element_t *element = spool_dequeue_last_element_inside_spq(queue);
    if (element == nullptr) return;
    do_spool(element);
    if (element->pAnchor != nullptr) {
        if (element->pAnchor->pMap != nullptr)
            store_relaxed(header_of(element->pAnchor)->sp_flags, format::page_state::ready);
        debug("%s removed from queue (trace file)\n", element->pAnchor->fileName);
    } else {
        if (element->del == 1) ::unlink(element->fileName);
        debug("%s removed from queue (other file)\n", element->fileName);
    }
    std::free(element);
}
