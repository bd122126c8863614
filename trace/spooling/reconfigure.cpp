// Following the configuration file: the specifications are read again and every trace is bound anew, or copying stops
// everywhere. The spool thread does it, under the global mutex and each trace's set lock in turn.
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <sys/stat.h>

#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/spooling/spool_list.h"
#include "trace/traceutils/traceutils.h"

time_t configuration_file_last_modified = 0;

namespace
{
using namespace qn::tr;

int configuration_forced = 0; // by tr_configure_1, under the queue mutex; read and cleared without it

// A list that nobody else sees; freed with its scope.
struct private_list : spec_list {
    private_list() = default;
    private_list(const private_list &) = delete;
    private_list &operator=(const private_list &) = delete;
    ~private_list() { free_spool_spec_linked_list(first); }
};

void exchange_with_default_list(spec_list &list)
{
    const spec_list before{anchors.pFirstSpoolSpec, anchors.pLastSpoolSpec};
    store_relaxed(anchors.pFirstSpoolSpec, list.first);
    anchors.pLastSpoolSpec = list.last;
    list = before;
}

// A specification that goes on governing traces does so without those that are freed: its directory may be another's.
void keep(trace_spool_spec_t *spec, spec_list &old, spec_list &kept)
{
    if (spec == nullptr || !old.remove(spec)) return;
    if (spec->dir != nullptr) set_directory(spec, spec->dest);
    kept.append(spec);
}

// Binds the trace anew; what governed it and must not be freed, or null.
trace_spool_spec_t *bind_anew(trace_anchor_t *anchor)
{
    const anchor_set_lock set(anchor);
    if (!set) return anchor->spool;
    const future_set_lock lock(anchor);
    anchor->bSpoolProcessed = 0;
    return process_spool_spec(anchor, anchors.pFirstSpoolSpec);
}

// Kept specifications follow the fresh ones, whose last stays the list's last. Without fresh ones they are the list.
void chain_behind_default_list(const spec_list &kept)
{
    if (kept.first == nullptr) return;
    if (anchors.pLastSpoolSpec == nullptr) {
        store_relaxed(anchors.pFirstSpoolSpec, kept.first);
        anchors.pLastSpoolSpec = kept.last;
        return;
    }
    anchors.pLastSpoolSpec->pNext = kept.first;
    kept.first->pPrev = anchors.pLastSpoolSpec;
}
} // namespace

void reconfigure(void)
{
    private_list list; // the fresh one, and then what was in use before
    if (spool_conf_file(&list.first, &list.last) != 0) return;
    for (trace_spool_spec_t *spec = list.first; spec != nullptr; spec = spec->pNext)
        if (spec->onoff == 0) govern_without_copying(spec);

    const global_lock global;
    if (!global || master_override_off()) return;
    pthread_once(&sp_read_cfg, read_spool_cfg);
    exchange_with_default_list(list);
    spec_list kept;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = load_acquire(anchor->next))
        keep(bind_anew(anchor), list, kept);
    chain_behind_default_list(kept);
}

void turn_spooling_off_in_all_spool_specs(void)
{
    const global_lock global;
    if (!global) return;
    for (trace_spool_spec_t *spec = anchors.pFirstSpoolSpec; spec != nullptr; spec = spec->pNext) recycle_pages(spec);
}

configuration_action_t do_determine_configuration_action_from_the_configuration_file(void)
{
    struct stat file;
    if (stat(configuration_file_name, &file) != 0) return errno == ENOENT ? TURN_SPOOLING_OFF : TAKE_NO_ACTION;
    if (file.st_mtime <= configuration_file_last_modified) return TAKE_NO_ACTION;
    configuration_file_last_modified = file.st_mtime;
    return RECONFIGURE;
}

configuration_action_t determine_configuration_action_from_the_configuration_file(void)
{
    const mutex_lock last_modified(configuration_file_last_modified_mutex);
    return last_modified ? do_determine_configuration_action_from_the_configuration_file() : TAKE_NO_ACTION;
}

void configure_if_necessary(void)
{
    store_relaxed(configuration_forced, 0);
    if (std::getenv("QN_TR_SPOOL") != nullptr) return;
    switch (determine_configuration_action_from_the_configuration_file()) {
    case RECONFIGURE: return reconfigure();
    case TURN_SPOOLING_OFF: return turn_spooling_off_in_all_spool_specs();
    case TAKE_NO_ACTION: return;
    }
}

void tr_configure_1(void)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    pthread_once(&sp_thread_once, mk_sp_thread);
    {
        const mutex_lock last_modified(configuration_file_last_modified_mutex);
        configuration_file_last_modified = 0;
    }
    const mutex_lock queue(spq.mutex);
    store_relaxed(configuration_forced, 1);
    pthread_cond_signal(&spq.cond);
}

namespace qn::tr
{
bool configuration_is_forced() { return load_relaxed(configuration_forced) != 0; }
} // namespace qn::tr
