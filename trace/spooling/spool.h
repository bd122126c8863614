// Spooling: which specification governs a trace, the queue of full pages, the thread that copies them, and the
// configuration they come from.
#pragma once

#include <cstddef>

#include <ctime>
#include <pthread.h>

#include "trace/files/anchor.h"
#include "trace/spooling/spool_types.h"

// ---- Specifications and spool directories (spool_spec.cpp, spool_match.cpp, spool_dir.cpp). Global mutex, held by the
// caller: the lists, the caches, and the directories that are made.

// Not used by anything.
extern trace_spool_spec_t dfltSpoolSpec;

// Appends a specification to the list. With dupForClusterLink 1, a pattern under "/var/qn/" that names this node's
// cluster is appended a second time with the cluster's identifier. Returns 0, or 39 after recording error 14.
qn_int32_t addSpoolCfgElement(const char *dest, const char *pattern, qn_uint32_t pages, qn_int32_t onoff,
                              qn_int32_t interval, trace_spool_spec_t **pFirstSpoolSpec,
                              trace_spool_spec_t **pLastSpoolSpec, int dupForClusterLink, qn_uint32_t pageSize);

// Finds the specification that governs a trace file or one of its pages, and makes its spool directory; null: none, or
// its directory cannot be used, which switches it off.
trace_spool_spec_t *match_spool_file_name(const char *trc_file, trace_spool_spec_t *pFirstSpoolSpec);

// Makes the spool directory of this node and program under spec->dest, and leaves its path there; null on failure.
char *mkspooldir(trace_spool_spec_t *spec, const char *trc_file);

// Makes one directory unless it exists; 0 when it is there and writable.
int subdir(const char *dir);

// Makes a directory and those above it; 0 on success, 1 on failure.
int create_all_directories_in_path(const char *p_path);

// ---- Where specifications come from (spool_sources.cpp). Global mutex.

// Reads the spooling configuration into the default anchor's list. Once per process, through sp_read_cfg.
void read_spool_cfg(void);

// Appends the specifications of a QN_TR_SPOOL value. Returns 40 (one of them is on), 41 (none is), or 39 at an error;
// those before it stay.
qn_int32_t parse_spool_spec(const char *pString, trace_spool_spec_t **pFirstSpoolSpec,
                            trace_spool_spec_t **pLastSpoolSpec);

// Appends those of the configuration file. Returns its reader's status, or 47 when one could not be appended.
qn_int32_t spool_conf_file(trace_spool_spec_t **pFirstSpoolSpec, trace_spool_spec_t **pLastSpoolSpec);

// ---- The queue (spool_queue.cpp). Queue mutex: taken by these, held already by those named "inside".

// Queues a full page, and gives the page to be written next; null after error 14. Without a page, queues a file to be
// copied into dest (whose string is not copied), and gives null.
trace_anchor_t *spool_enqueue(const char *fileName, const char *dest, trace_anchor_t *pAnchor, sp_q_t *queue, int del);

// Takes a page's newest element out of the queue; null when there is none. The caller frees it.
sp_q_element_t *spool_dequeue_element(sp_q_t *queue, trace_anchor_t *pAnchor);
void spool_dequeue_and_delete_element(sp_q_t *queue, trace_anchor_t *pAnchor);

// Takes the oldest element out of the queue; null when it is empty.
sp_q_element_t *spool_dequeue_last_element_inside_spq(sp_q_t *queue);

// The same, copies it, marks a page reusable or removes a file that is to be removed, and frees the element.
void spool_dequeue_last_and_spool_inside_spq(sp_q_t *queue);

// ---- The spool thread (spool_thread.cpp) and copying (spool_copy.cpp).

// 1 while the spool thread runs. Read without a lock.
extern qn_int32_t is_spool_running;

// Guards the creation of the thread: pthread_once(&sp_thread_once, mk_sp_thread).
extern pthread_once_t sp_thread_once;
void mk_sp_thread(void);
void *cp_thread(void *arg);
namespace qn::tr
{
// In a forked child, where the thread does not exist: what is queued is the parent's, and the next call that needs the
// thread makes one.
void forget_spool_thread();
} // namespace qn::tr

// Copies a page or a file into its spool directory. Queue mutex, held by the caller. 0, or the recorded error's code.
qn_int32_t do_spool(sp_q_element_t *elem);

// Writes the memory, or the contents of the file fname_in when that is not null, into the file dest; removes dest when
// that fails. 0, or the recorded error's code.
qn_int32_t cp_mapped_file(const char *dest, const char *fname_in, const void *map, qn_uint32_t size);
qn_int32_t write_buffer_to_file(int fd, const void *buffer, size_t in_size, size_t *bytesWritten);

// Maps a whole file read-only. On failure the outputs are cleared. Not used by anything.
qn_int32_t map_file(const char *fileName, size_t *size, void **map, int *fd);

// ---- Binding traces to specifications, and changing that while they are written (spool_binding.cpp, page_ring.cpp,
// reconfigure.cpp). Global mutex, and the set lock of the trace; held by the caller of what takes an anchor.

// What the configuration file asks for.
typedef enum { TAKE_NO_ACTION = 0, RECONFIGURE = 1, TURN_SPOOLING_OFF = 2 } configuration_action_t;

// Decides which specification governs the anchor's trace. Returns one that it used before and that must be kept, or
// null.
trace_spool_spec_t *process_spool_spec(trace_anchor_t *p_anchor, trace_spool_spec_t *pFirstSpoolSpec);

// Gives the ring its new specification, and as many pages as that names.
void reconfigure_pages(trace_anchor_t *p_anchor, trace_spool_spec_t *p_old_spool_spec,
                       trace_spool_spec_t *p_new_spool_spec);
trace_anchor_t *add_new_pages(trace_anchor_t *p_anchor, trace_spool_spec_t *p_old_spool_spec,
                              trace_spool_spec_t *p_new_spool_spec, trace_anchor_t *p_original_last_anchor);

// These take the locks they need.
void reconfigure(void);
void turn_spooling_off_in_all_spool_specs(void);
void configure_if_necessary(void); // by the spool thread alone

void free_spool_spec_linked_list(trace_spool_spec_t *head);

// The configuration file's modification time as it was last seen. configuration_file_last_modified_mutex.
extern time_t configuration_file_last_modified;

namespace qn::tr
{
// True from tr_configure_1 until the spool thread looks at the configuration.
bool configuration_is_forced();

// Frees the pages that were cut off the anchor's ring: those that were copied meanwhile, or all.
void release_copied_obsolete_pages(trace_anchor_t *anchor);
void release_all_obsolete_pages(trace_anchor_t *anchor);

// Forgets which specification governs the trace. Global mutex and anchor set lock; the trace is no page set.
void forget_binding(trace_anchor_t *anchor);
} // namespace qn::tr

// Looks at the configuration file's modification time, and remembers it; the first form takes the mutex.
configuration_action_t determine_configuration_action_from_the_configuration_file(void);
configuration_action_t do_determine_configuration_action_from_the_configuration_file(void);

// ---- Status (spool_status.cpp).

// Orders two records of the status call by their first field.
int _strcmp(const void *s1, const void *s2);
