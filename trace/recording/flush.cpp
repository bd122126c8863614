// Getting mapped pages to the disk, and keeping them in memory. Global mutex; records may be written meanwhile.
#include <cerrno>
#include <sys/mman.h>
#include <sys/syslog.h>
#include <utility>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

int memory_is_pinned = 0;

namespace
{
using namespace qn::tr;

constexpr size_t touch_step_bytes = 512;

volatile qn_uint32_t memvar_to_visit; // where the words that were read go, so that they are read

// Calls visit(anchor, page) for the pages of every trace file, mapped or not, and for those that were cut off from its
// ring: one of them may be being written. Goes on while visit returns 0 and tracing goes on. The last result.
template <class Visit>
int walk_pages(Visit visit)
{
    int result = 0;
    trace_anchor_t *anchor = &anchors;
    do {
        trace_anchor_t *page = anchor;
        do {
            result = visit(anchor, page);
            page = page->nextPage;
        } while (result == 0 && !master_override_off() && page != nullptr && page != anchor);
        page = anchor->p_obsolete_pages;
        for (; result == 0 && !master_override_off() && page != nullptr; page = page->next)
            result = visit(anchor, page);
        anchor = load_acquire(anchor->next);
    } while (result == 0 && anchor != nullptr && !master_override_off());
    return result;
}

// A trace may be re-initialised by one of its writers meanwhile, which unmaps it under the queue's mutex. That mutex is
// not held while the disk works; a mapping that has gone by then is no failure.
int sync_page(trace_anchor_t *page, int flags, bool ignore_error)
{
    const auto mapping = [page] {
        const mutex_lock queue(spq.mutex);
        return std::pair(page->pMap, page->uActualFileSize);
    };
    const auto [map, size] = mapping();
    if (map == nullptr || msync(map, size, flags) == 0 || ignore_error) return 0;
    const int error = errno;
    return mapping().first == map ? set_error_int(QN_TR_EMSYNC, 32, error) : 0;
}

// One word of every 512 bytes. A writer may be storing into the same words: what is read does not matter, so this is
// no race.
__attribute__((no_sanitize("thread"))) qn_uint32_t read_words(const unsigned char *from, const unsigned char *end)
{
    qn_uint32_t words = 0;
    for (const unsigned char *place = from; place < end - sizeof words; place += touch_step_bytes)
        words |= *reinterpret_cast<const volatile qn_uint32_t *>(place);
    return words;
}

void touch_page(const trace_anchor_t *anchor, const trace_anchor_t *page)
{
    const mutex_lock queue(spq.mutex);
    if (page->pMap == nullptr) return;
    debug("\ttrace: Load all part of the pages to bring into memory (%s)\n", anchor->fileName);
    memvar_to_visit = memvar_to_visit | read_words(page->pMap, page->pMapEnd);
    if (debug_level_above(7)) log_line(LOG_DEBUG, "\ttrace: memvar_to_visit=0x%x\n", memvar_to_visit);
}

// All that load_trace_pages_to_memory() does but for the error record. The result of locking the global mutex.
int touch_all_traces()
{
    debug("load_trace_pages_to_memory Entered\n");
    {
        const global_lock global;
        if (!global) {
            debug("load_trace_pages_to_memory Leaving with rc=%d\n", QN_TR_ELOCK);
            return global.result();
        }
        if (anchors.bInitialized)
            walk_pages([](const trace_anchor_t *anchor, const trace_anchor_t *page) {
                touch_page(anchor, page);
                return 0;
            });
    }
    debug("load_trace_pages_to_memory() Leaving, rc=%d\n", 0);
    return 0;
}
} // namespace

namespace qn::tr
{
void touch_trace(trace_anchor_t *anchor)
{
    for_each_page(anchor, [anchor](const trace_anchor_t *page) { touch_page(anchor, page); });
}
} // namespace qn::tr

int msync_trace_pages(int incl_all_pages, int msync_flags, int ignore_error)
{
    debug("msync_trace_pages (incl_all_pages=%d flags=%d, ignore=%d) Entered\n", incl_all_pages, msync_flags,
          ignore_error);
    int status = 0;
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        status = init_default_anchor();
        if (status != 0) return status;
        status = walk_pages([=](trace_anchor_t *anchor, trace_anchor_t *page) {
            if (incl_all_pages != 0) return sync_page(page, msync_flags, ignore_error != 0);
            const bool active = anchor->ppActivePg != nullptr && *anchor->ppActivePg == page;
            return active ? sync_page(page, msync_flags, ignore_error != 0) : 0;
        });
    }
    debug("msync_trace_pages() Leaving\n");
    return status != 0 ? status : cu_set_no_error_1();
}

int load_trace_pages_to_memory(void)
{
    const int lock_result = touch_all_traces();
    return lock_result != 0 ? set_error_int(QN_TR_ELOCK, 9, lock_result) : cu_set_no_error_1();
}

qn_int32_t tr_flush_1(void)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    const qn_int32_t status = msync_trace_pages(1, MS_SYNC, 0);
    // The error record is that of the msync().
    if (load_relaxed(memory_is_pinned) != 0 && !master_override_off()) touch_all_traces();
    return status;
}

qn_int32_t tr_pin_pages_1(int pin_or_unpin)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    store_relaxed(memory_is_pinned, pin_or_unpin);
    debug("tr_pin_pages(%d) Entered\n", pin_or_unpin);
    const qn_int32_t status = pin_or_unpin != 0 && !master_override_off() ? load_trace_pages_to_memory() : 0;
    debug("tr_pin_pages(%d) Leaving rc=%d\n", pin_or_unpin, status);
    return status;
}
