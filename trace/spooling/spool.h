// Spooling: which specification governs a trace, the queue of full pages, the thread that copies them, and the
// configuration they come from.
#pragma once

#include <qn_cu.h>

#include "trace/files/anchor.h"
#include "trace/spooling/spool_types.h"

// The cluster this node belongs to, fetched once, and the result of fetching it.
extern cu_cluster_info_t clusterInfo;
extern qn_int32_t clusterInfoRC;

// 1 while the spool thread runs. Read without a lock.
extern qn_int32_t is_spool_running;

// What the configuration file asks for.
typedef enum { TAKE_NO_ACTION = 0, RECONFIGURE = 1, TURN_SPOOLING_OFF = 2 } configuration_action_t;

// Reads the spooling configuration into the default anchor's list. Once per process, through sp_read_cfg.
void read_spool_cfg(void);

// Looks at the configuration file's modification time, and remembers it.
configuration_action_t determine_configuration_action_from_the_configuration_file(void);

// Decides which specification governs the anchor's trace. Returns one that it used before and that must be kept, or
// null. Global mutex or anchor set lock, held by the caller.
trace_spool_spec_t *process_spool_spec(trace_anchor_t *p_anchor, trace_spool_spec_t *pFirstSpoolSpec);

// Takes a page out of the queue and frees its element, if it is there. Takes the queue's mutex.
void spool_dequeue_and_delete_element(sp_q_t *queue, trace_anchor_t *pAnchor);
