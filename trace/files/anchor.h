// The anchor: the control block of one trace file, or of one page file of a page set.
//
// One anchor is static: `anchors`, the default anchor. It stands for the default trace file, heads the list of all
// trace files, and carries the process-wide lists of components and specifications. Anchors of trace files are never
// freed, so whoever walks the list needs no lock. Pages of a page set are not in the list: the head's `nextPage` leads
// through them in a ring.
//
// Guarded by the anchor set lock (locks.h), unless said otherwise below: everything about the mapping and the ring.
#pragma once

#include <pthread.h>
#include <sys/types.h>

#include <qn_tr.h>

#include "trace/files/format.h"
#include "trace/files/lock_bias.h"

typedef struct trace_anchor trace_anchor_t;
typedef struct component_anchor component_anchor_t;
typedef struct trace_level_spec trace_level_spec_t;
typedef struct trace_map_spec trace_map_spec_t;
typedef struct trace_spool_spec trace_spool_spec_t;

inline constexpr int trace_file_name_bytes = 4096;
inline constexpr int format_buffer_bytes = 1024;
inline constexpr qn_uint32_t default_file_size = 65536;

struct trace_anchor {
    // What every record touches: two cache lines.
    pthread_mutex_t anchorMutex;  // recursive; the default anchor's is the global mutex
    qn::tr::lock_bias anchorBias; // of that mutex: the two are a biased_mutex
    pthread_mutex_t *pSpoolMutex; // recursive, a biased_mutex; shared by the page set, its head's; null: a single file
    unsigned char *pMap;          // the file header; null while the file is not mapped
    trace_record_header_t *pNextFree;
    unsigned char *pMapEnd;      // one past the mapping
    qn_uint32_t seqNumber;       // of the last record
    qn_uint32_t uMaxSize;        // longest record; 0 while the file is not started. Also read without the lock
    trace_anchor_t **ppActivePg; // every page: the head's pActivePg

    int bInitialized;      // default anchor: init() has run. Global mutex
    int bMultipageEnabled; // default anchor: traces may be split into pages. Global mutex
    int mapFd;             // while the file is being opened, else -1
    dev_t fileDevice;      // which file is mapped. Spool queue mutex, as are the following two
    ino_t fileNode;
    trace_anchor_t *nextClaimed;
    trace_record_header_t *pWrap;         // where a lap of the ring begins: behind a page's notice
    trace_record_header_t *pRing;         // start of the ring, as it was found at the start
    qn_int32_t pageSize;                  // of memory
    component_anchor_t *pFirstComp;       // default anchor. Global mutex and component list mutex
    char fileName[trace_file_name_bytes]; // empty: no file. Global mutex; a page set's head has its first page's name
    qn_uint32_t uRequestedFileSize;       // bytes; of a page, once the file is one
    qn_uint32_t uRequestedTraceSize;      // page set's head: what was asked for of the whole, bytes; 0: not a page set
    qn_uint32_t uActualFileSize;          // bytes mapped; 0 while the file is not started
    trace_level_spec_t *pFirstTraceSpec;  // default anchor, as are the following lists. Global mutex
    trace_level_spec_t *pLastTraceSpec;
    trace_map_spec_t *pFirstMapSpec;
    trace_map_spec_t *pLastMapSpec;
    trace_spool_spec_t *pFirstSpoolSpec;
    trace_spool_spec_t *pLastSpoolSpec;
    char buffer[format_buffer_bytes]; // for formatted text
    qn_uint32_t numAnchors;           // default anchor: length of the list. Anchor list mutex
    trace_anchor_t *next;             // next trace file; written under the anchor list mutex, followed without
    qn_uint32_t alloc_cnt;
    trace_spool_spec_t *spool; // governs this file; null: none
    trace_anchor_t *nextPage;  // ring of the page set; null: a single file
    int bSpoolProcessed;       // `spool` has been looked for. Global mutex
    trace_anchor_t *pActivePg; // head: the page being written
    qn_uint32_t consecutiveSpoolNotCopied;
    trace_anchor_t *p_head_spool_anchor;
    trace_anchor_t *p_obsolete_pages; // head: pages cut off and not yet copied
    trace_anchor_t *p_obsolete_pages_tail;
};

static_assert(offsetof(trace_anchor, anchorMutex) == 0 &&
              offsetof(trace_anchor, anchorBias) == sizeof(pthread_mutex_t));

extern trace_anchor_t anchors;

// Creates the library's mutexes, once per process, before any anchor is used: pthread_once(&trace_global_data_once, ...).
void initialize_trace_global_data(void);
extern pthread_once_t trace_global_data_once;

// Gives an anchor its defaults, and a mutex unless it is the default anchor.
void initAnchor(trace_anchor_t *anchor);

// Finds the anchor of a trace file; the empty name is the default anchor's, and a page set is found by the name without
// its page suffix. Creates the anchor when there is none and createIfNeeded; null when it does not, or on error 14.
trace_anchor_t *findOrCreateAnchorForFile(const char *fileName, int createIfNeeded);

// Gives the anchor of one page file of a page set, creating it; null on error 14.
trace_anchor_t *getSplAnchor(trace_anchor_t *headAnchor, const char *fileName);

// 0 when anchorFileName is "<fileName>.<digits>.sp".
int spool_name_match(const char *anchorFileName, const char *fileName);

namespace qn::tr
{
// True when the anchor's file is governed by a specification that is on.
bool spooling_is_on(const trace_anchor_t *anchor);

// True for a page of a set whose specification is on. A single file may be governed by one, and stays a single file.
bool is_spooled_page(const trace_anchor_t *anchor);

// True for one of several such pages: its ring never wraps, the next page follows it.
bool never_wraps(const trace_anchor_t *anchor);

// False for a trace file of its own that goes by a page's name.
bool is_page_of(const trace_anchor_t *page, const trace_anchor_t *head);

// Copies a name into an anchor's field, cut to what it holds.
void set_file_name(trace_anchor_t *anchor, const char *file_name);

// Calls visit(page) for the anchor and the other pages of its set, in ring order.
template <class Visit>
void for_each_page(trace_anchor_t *anchor, Visit visit)
{
    trace_anchor_t *page = anchor;
    do {
        trace_anchor_t *following = page->nextPage;
        visit(page);
        page = following;
    } while (page != nullptr && page != anchor);
}
} // namespace qn::tr
