// Binding a trace to the specification that governs it. Global mutex and anchor set lock, held by the caller.
#include <algorithm>
#include <cstdlib>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/spooling/spool_list.h"
#include "trace/spooling/spool_shape.h"

namespace
{
using namespace qn::tr;

// Gives the trace its specification, and a ring that it has already the pages that go with it. A specification that was
// made for this trace alone has then served its time.
void bind(trace_anchor_t *anchor, trace_spool_spec_t *spec)
{
    trace_spool_spec_t *before = anchor->spool;
    store_relaxed(anchor->spool, spec);
    if (before != nullptr && before != spec) {
        reconfigure_pages(anchor, before, spec);
        if (before->isDefaultSpec == 1) std::free(before);
    }
    pthread_once(&sp_thread_once, mk_sp_thread);
}

// What governs a trace of several pages that no configured specification matches; in no list.
trace_spool_spec_t *new_default_spec(const trace_anchor_t *anchor)
{
    constexpr qn_uint32_t fewest_pages = 4;
    auto *spec = static_cast<trace_spool_spec_t *>(std::calloc(1, sizeof(trace_spool_spec_t)));
    if (spec == nullptr) {
        set_error(QN_TR_ENOMEM, 14);
        return nullptr;
    }
    spec->pg_size = spool_page_bytes;
    spec->pages = std::max(anchor->uRequestedFileSize / spool_page_bytes, fewest_pages);
    spec->onoff = 1;
    spec->isDefaultSpec = 1;
    spec->sync_interval = short_sync_seconds;
    recycle_pages(spec);
    return spec;
}

void log_not_matched(const trace_anchor_t *anchor, const trace_spool_spec_t *first)
{
    debug("NOT matched: '%s' on '%s'\n", anchor->fileName, first != nullptr ? first->pattern : "");
}
} // namespace

trace_spool_spec_t *process_spool_spec(trace_anchor_t *p_anchor, trace_spool_spec_t *pFirstSpoolSpec)
{
    if (p_anchor->bSpoolProcessed) return nullptr;
    release_copied_obsolete_pages(p_anchor);

    trace_spool_spec_t *kept = nullptr;
    trace_spool_spec_t *spec = match_spool_file_name(p_anchor->fileName, pFirstSpoolSpec);
    if (spec != nullptr) {
        if (spec->onoff == 0) govern_without_copying(spec);
        bind(p_anchor, spec);
    } else if (p_anchor->spool != nullptr) {
        log_not_matched(p_anchor, pFirstSpoolSpec);
        recycle_pages(p_anchor->spool);
        if (p_anchor->spool->isDefaultSpec != 1) kept = p_anchor->spool;
    } else if (load_relaxed(anchors.bMultipageEnabled) == 1) {
        trace_spool_spec_t *implicit = new_default_spec(p_anchor);
        if (implicit == nullptr) return nullptr;
        bind(p_anchor, implicit);
    } else {
        log_not_matched(p_anchor, pFirstSpoolSpec);
    }
    p_anchor->bSpoolProcessed = 1;
    return kept;
}

namespace qn::tr
{
void forget_binding(trace_anchor_t *anchor)
{
    trace_spool_spec_t *spec = anchor->spool;
    anchor->bSpoolProcessed = 0;
    store_relaxed(anchor->spool, nullptr);
    if (spec != nullptr && spec->isDefaultSpec == 1) std::free(spec);
}
} // namespace qn::tr
