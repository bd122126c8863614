// The spool queue. Its mutex guards it.
#include "trace/spooling/spool.h"

#include <cstdlib>

#include "trace/files/locks.h"

sp_q_t spq = {.mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP, .cond = PTHREAD_COND_INITIALIZER};

// No page is ever queued yet: pages are full only in page sets, and nothing makes a set out of a trace so far.
void spool_dequeue_and_delete_element(sp_q_t *, trace_anchor_t *) {}
