// The default anchor, and making and finding anchors.
//
// Guarded by the anchor list mutex: insertion into the list and numAnchors. Look-ups take no lock.
#include "trace/files/anchor.h"

#include <cstdlib>
#include <cstring>
#include <string_view>
#include <unistd.h>

#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/page_names.h"
#include "trace/files/shared_words.h"
#include "trace/files/text.h"

// Its mutex, the global one, needs no creation: a record writer may be the first call of a program.
constinit trace_anchor_t anchors = {.anchorMutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP,
                                    .seqNumber = 1,
                                    .mapFd = -1,
                                    .uRequestedFileSize = default_file_size,
                                    .numAnchors = 1};

pthread_once_t trace_global_data_once = PTHREAD_ONCE_INIT;

void initialize_trace_global_data(void)
{
    init_recursive_mutex(&anchor_list_mutex);
    init_recursive_mutex(&configuration_file_last_modified_mutex);
    init_recursive_mutex(&spq.mutex);
}

void initAnchor(trace_anchor_t *anchor)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    anchor->bMultipageEnabled = 0;
    anchor->mapFd = -1;
    anchor->uRequestedFileSize = default_file_size;
    anchor->uRequestedTraceSize = 0;
    anchor->fileName[0] = '\0';
    anchor->pFirstComp = nullptr;
    anchor->pMap = nullptr;
    anchor->pMapEnd = nullptr;
    anchor->pNextFree = nullptr;
    anchor->pWrap = nullptr;
    anchor->pRing = nullptr;
    anchor->uActualFileSize = 0;
    anchor->uMaxSize = 0;
    anchor->pFirstTraceSpec = nullptr;
    anchor->pLastTraceSpec = nullptr;
    anchor->pFirstMapSpec = nullptr;
    anchor->pLastMapSpec = nullptr;
    anchor->pFirstSpoolSpec = nullptr;
    anchor->pLastSpoolSpec = nullptr;
    anchor->numAnchors = 0;
    anchor->alloc_cnt = 0;
    anchor->spool = nullptr;
    anchor->nextPage = nullptr;
    anchor->pSpoolMutex = nullptr;
    anchor->bSpoolProcessed = 0;
    anchor->pActivePg = nullptr;
    anchor->ppActivePg = nullptr;
    anchor->consecutiveSpoolNotCopied = 0;
    anchor->p_head_spool_anchor = nullptr;
    anchor->p_obsolete_pages = nullptr;
    anchor->p_obsolete_pages_tail = nullptr;
    if (anchor != &anchors) init_biased_mutex(&anchor->anchorMutex);
    anchor->pageSize = static_cast<qn_int32_t>(sysconf(_SC_PAGESIZE));
}

namespace qn::tr
{
bool spooling_is_on(const trace_anchor_t *anchor) { return anchor->spool != nullptr && anchor->spool->onoff != 0; }

bool is_spooled_page(const trace_anchor_t *anchor) { return spooling_is_on(anchor) && anchor->ppActivePg != nullptr; }

bool never_wraps(const trace_anchor_t *anchor)
{
    return is_spooled_page(anchor) && load_relaxed(anchor->spool->pages) > 1;
}

bool is_page_of(const trace_anchor_t *page, const trace_anchor_t *head) { return page->p_head_spool_anchor == head; }

void set_file_name(trace_anchor_t *anchor, const char *file_name) { copy_cut(anchor->fileName, file_name); }
} // namespace qn::tr

namespace
{
using namespace qn::tr;

// Zeroed memory for an anchor; records error 14 when there is none.
trace_anchor_t *new_anchor()
{
    auto *anchor = static_cast<trace_anchor_t *>(std::calloc(1, sizeof(trace_anchor_t)));
    if (anchor == nullptr) set_error(QN_TR_ENOMEM, 14);
    return anchor;
}

// The first anchor of the list for which matches(anchor) holds, or null.
template <class Matches>
trace_anchor_t *find_anchor(Matches matches)
{
    trace_anchor_t *anchor = &anchors;
    while (anchor != nullptr && !matches(anchor)) anchor = load_acquire(anchor->next);
    return anchor;
}

// The anchor whose trace file, or whose page set, has that name.
trace_anchor_t *find_anchor_for_file(const char *file_name)
{
    return find_anchor([file_name](trace_anchor_t *anchor) {
        return (load_relaxed(anchor->nextPage) != nullptr && spool_name_match(anchor->fileName, file_name) == 0) ||
               std::strcmp(anchor->fileName, file_name) == 0;
    });
}
} // namespace

trace_anchor_t *findOrCreateAnchorForFile(const char *fileName, int createIfNeeded)
{
    if (fileName[0] == '\0') return &anchors;

    trace_anchor_t *found = find_anchor_for_file(fileName);
    if (found != nullptr || !createIfNeeded) return found;

    trace_anchor_t *anchor = new_anchor();
    if (anchor == nullptr) return nullptr;
    initAnchor(anchor);
    set_file_name(anchor, fileName);

    // Another thread may have created it since the look-up. Two anchors would write over each other in one file.
    const mutex_lock list(anchor_list_mutex);
    found = find_anchor_for_file(anchor->fileName);
    if (found != nullptr) {
        pthread_mutex_destroy(&anchor->anchorMutex);
        std::free(anchor);
        return found;
    }
    anchor->next = anchors.next;
    store_release(anchors.next, anchor);
    anchors.numAnchors += 1;
    return anchor;
}

int spool_name_match(const char *anchorFileName, const char *fileName)
{
    const std::string_view name(anchorFileName);
    const auto trace_name = trace_name_of_page(name);
    // Only the first ".sp" counts: a page of a trace that is itself named "a.sp" is not known as one.
    if (!trace_name || name.find(".sp") + 3 != name.size()) return -1;
    return trace_name->compare(fileName);
}

trace_anchor_t *getSplAnchor(trace_anchor_t *headAnchor, const char *fileName)
{
    trace_anchor_t *found =
        find_anchor([fileName](trace_anchor_t *anchor) { return std::strcmp(anchor->fileName, fileName) == 0; });
    if (found != nullptr) return found;

    trace_anchor_t *page = new_anchor();
    if (page == nullptr) return nullptr;
    initAnchor(page);
    set_file_name(page, fileName);
    page->uMaxSize = headAnchor->uMaxSize;
    page->pageSize = headAnchor->pageSize;
    page->uRequestedFileSize = headAnchor->uRequestedFileSize;
    page->spool = headAnchor->spool;
    page->pSpoolMutex = headAnchor->pSpoolMutex;
    page->pActivePg = nullptr;
    page->ppActivePg = &headAnchor->pActivePg;
    page->p_head_spool_anchor = headAnchor;
    return page;
}
