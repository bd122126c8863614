// Which trace files the process has, and where each is spooled. Global mutex, and each anchor's own.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "trace/files/debug.h"
#include "trace/files/locks.h"
#include "trace/files/releases.h"
#include "trace/files/text.h"
#include "trace/spooling/spool.h"

namespace
{
using namespace qn::tr;

// Names that are longer than the record's fields are cut.
void describe(const trace_anchor_t *anchor, tr_mini_spooling_anchor_t &record)
{
    const trace_spool_spec_t *spec = anchor->spool;
    if (spec != nullptr && spec->onoff != 0 && spec->dir != nullptr) {
        char name_and_pages[sizeof anchor->fileName + 32];
        std::snprintf(name_and_pages, sizeof name_and_pages, "%s (%u page%s", anchor->fileName, spec->pages,
                      spec->pages > 1 ? "s)" : ")");
        copy_cut(record.fileName, name_and_pages);
        copy_cut(record.dest, spec->dir);
    } else {
        copy_cut(record.fileName, anchor->fileName);
        copy_cut(record.dest, "spooling not enabled");
    }
}

// The default anchor's mutex is the global one, which the caller holds. Without that, nothing changes of what is read here:
// a thread that writes records by a bias is not kept out.
int lock_anchor(trace_anchor_t *anchor)
{
    const int result = anchor != &anchors ? lock_mutex(&anchor->anchorMutex) : 0;
    if (result != 0) debug("get_current_spool_info: failed to get mutex: %d\n", result);
    return result;
}

int unlock_anchor(trace_anchor_t *anchor)
{
    const int result = anchor != &anchors ? unlock_mutex(&anchor->anchorMutex) : 0;
    if (result != 0) debug("get_current_spool_info: failed to release mutex: %d\n", result);
    return result;
}

// Fills one record per anchor; how many, or -1.
qn_int32_t fill_records(tr_mini_spooling_anchor_t *records, qn_int32_t most)
{
    qn_int32_t filled = 0;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr && filled < most; anchor = load_acquire(anchor->next)) {
        debug("get_current_spool_info in %s (%p)\n", anchor->fileName, static_cast<void *>(anchor));
        if (lock_anchor(anchor) != 0) return -1;
        describe(anchor, records[filled]);
        if (unlock_anchor(anchor) != 0) return -1;
        filled += 1;
    }
    return filled;
}
} // namespace

int _strcmp(const void *s1, const void *s2)
{
    return std::strcmp(static_cast<const tr_mini_spooling_anchor_t *>(s1)->fileName,
                       static_cast<const tr_mini_spooling_anchor_t *>(s2)->fileName);
}

qn_int32_t tr_get_current_spooling_status_1(qn_int32_t *cnt, tr_mini_spooling_anchor_t **spa)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    *spa = nullptr;
    *cnt = 0;
    global_lock_that_may_stay global;
    qn_int32_t most = 0;
    {
        const mutex_lock list(anchor_list_mutex);
        most = static_cast<qn_int32_t>(anchors.numAnchors);
    }
    const auto count = static_cast<size_t>(most);
    std::unique_ptr<tr_mini_spooling_anchor_t, releases<std::free>> records(
        static_cast<tr_mini_spooling_anchor_t *>(std::calloc(count, sizeof(tr_mini_spooling_anchor_t))));
    *cnt = most;
    debug("get_current_spool_info: allocated %d structs\n", most);
    if (records == nullptr) {
        global.stay(); // that is the documented behaviour of the call
        return -1;
    }
    const qn_int32_t filled = fill_records(records.get(), most);
    *cnt = filled >= 0 ? filled : 0;
    if (filled < 0) return -1;
    std::qsort(records.get(), static_cast<size_t>(filled), sizeof *records, _strcmp);
    *spa = records.release();
    return 0;
}

void tr_release_spool_info_1(qn_int32_t, tr_mini_spooling_anchor_t *spa) { std::free(spa); }
