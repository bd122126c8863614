// The library as a whole: starting it from the environment, and stopping it for good.
#pragma once

#include "trace/files/anchor.h"
#include "trace/files/shared_words.h"

extern int global_switch;                  // 1 once tracing has been stopped for good; read without a lock
extern int this_is_child;                  // 1 in a child forked after the library was initialised
extern int use_msync_enabled_except_flush; // 1: the spool thread syncs pages too
extern pthread_once_t register_once;       // registration of the fork handler
extern pthread_once_t sp_read_cfg;         // reading of the spooling configuration

// Initialises an anchor from the environment; returns 0. Global mutex.
int init(trace_anchor_t *anchor);

// Non-zero when tracing has been stopped for good.
inline int master_override_off(void) { return qn::tr::load_relaxed(global_switch); }
void global_stop_trace(void);

void register_atfork(void);
void atfork_child(void);

namespace qn::tr
{
// Runs init() on the default anchor unless that was done; its result. Global mutex.
int init_default_anchor();
} // namespace qn::tr
