// What a spool specification and the spool queue look like.
#pragma once

#include <pthread.h>

#include "trace/files/anchor.h"

// Says, for every trace file whose name matches `pattern`, how its pages are kept. A node of a doubly linked list that
// owns it. Global mutex.
struct trace_spool_spec {
    trace_spool_spec_t *pNext;
    trace_spool_spec_t *pPrev;
    char dest[4096];           // destination directory; "/dev/null": pages are reused without being copied
    char pattern[1024];        // POSIX extended regular expression, matched without regard to case
    qn_uint32_t pages;         // number of pages of a trace
    qn_uint32_t pg_size;       // bytes a page
    qn_int32_t onoff;          // 1: spooling is on
    qn_uint32_t sync_interval; // seconds
    char *dir;                 // the spool directory in use, inside some specification's `dest`; null until made
    qn_int32_t isDefaultSpec;  // 1: made for a trace that no configured specification matched
};

// A page, or a plain file, to be copied by the spool thread.
typedef struct sp_q_element {
    struct sp_q_element *pNext; // older
    struct sp_q_element *pPrev; // newer
    trace_anchor_t *pAnchor;    // the page; null for a plain file
    char fileName[4096];        // the plain file
    const char *dest;           // the plain file's destination directory: the caller's string
    qn_int32_t del;             // 1: remove the plain file after copying
} sp_q_element_t;

// The queue: filled by client threads, emptied by the spool thread.
typedef struct sp_q {
    sp_q_element_t *pFirst; // newest
    sp_q_element_t *pLast;  // oldest
    qn_int32_t cnt;
    pthread_mutex_t mutex; // recursive; guards the list and the unmapping of pages
    pthread_cond_t cond;   // signalled when there is something to do
} sp_q_t;

extern sp_q_t spq;
