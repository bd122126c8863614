// Sizes of trace files: the language of QN_TR_FILE_SIZE, resizing, and the exported calls.
//
//   element { ";" element }     element: file [","] size
//
// A trace is resized with the global mutex and its anchor set lock held: it is stopped and started again meanwhile.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "trace/components/specifications.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"
#include "trace/spooling/spool_types.h"

namespace
{
using namespace qn::tr;

constexpr qn_uint32_t spooled_page_bytes = 262144;
constexpr qn_uint32_t fewest_spooled_pages = 4;

void set_requested_size(trace_anchor_t *page, qn_uint32_t size)
{
    debug("^^^ setting size in %s", page->fileName);
    page->uRequestedFileSize = size;
    if (!spooling_is_on(page)) return;
    const qn_uint32_t pages = std::max(size / spooled_page_bytes, fewest_spooled_pages);
    store_relaxed(page->spool->pages, pages); // of other traces too, whose writers read it
    // The expression is the interface: other programs reckon with its results.
    const auto memory_page = static_cast<qn_uint32_t>(page->pageSize);
    page->uRequestedFileSize = (size / pages + memory_page) & ~memory_page;
}

qn_int32_t restart(trace_anchor_t *anchor)
{
    if (anchor->pMap == nullptr) return 0;
    const qn_int32_t status = stop_trace(anchor, load_relaxed(this_is_child));
    return status != 0 ? status : start_trace(anchor);
}

// The anchor that a size call is about; null with the status to return.
trace_anchor_t *anchor_for_size(const char *file_name, int create, qn_int32_t &status)
{
    trace_anchor_t *anchor = findOrCreateAnchorForFile(file_name, create);
    if (anchor == nullptr) status = create != 0 ? set_error(QN_TR_ENOMEM, 14) : set_error(QN_TR_EFILENAME, 17);
    return anchor;
}
} // namespace

int parse_fileSize_spec(const char *pString)
{
    if (pString[0] == '\0') return QN_TR_EFILENAME; // no message: the value says nothing
    for (const char *at = pString; *at != '\0';) {
        const char *end = strchrnul(at, ';');
        char file_name[trace_file_name_bytes];
        const char *size = parseFileName(at, end, file_name, sizeof file_name);
        if (size >= end) return set_error_int(QN_TR_ESPECSEP, 11, static_cast<int>(size - pString));
        trace_anchor_t *anchor = findOrCreateAnchorForFile(file_name, 1);
        if (anchor == nullptr) return set_error(QN_TR_ENOMEM, 14);
        const int status = tr_set_size_in_anchor(anchor, static_cast<qn_uint32_t>(std::strtoul(size, nullptr, 0)));
        if (status != 0) return status;
        at = *end == ';' ? end + 1 : end;
    }
    return 0;
}

qn_int32_t tr_set_size_in_anchor(trace_anchor_t *pAnchor, qn_uint32_t newSize)
{
    if (master_override_off()) return 0;
    qn_int32_t status = 0;
    {
        const anchor_set_lock set(pAnchor);
        if (!set) return set_error_int(QN_TR_ELOCK, 9, set.result());
        if (pAnchor->uRequestedTraceSize != 0) pAnchor->uRequestedTraceSize = newSize; // a page set's, as a whole
        if (pAnchor->uRequestedFileSize != newSize)
            for_each_page(pAnchor, [=](trace_anchor_t *page) { set_requested_size(page, newSize); });
        status = restart(pAnchor);
    }
    return status != 0 ? status : cu_set_no_error_1();
}

qn_int32_t tr_set_file_size_1(const char *fileName, const qn_uint32_t size)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    if (master_override_off()) return 0;
    if (fileName == nullptr) return set_error(QN_TR_EFILENAME, 17);
    const global_lock global; // the lock's result is not looked at
    qn_int32_t status = init_default_anchor();
    if (status != 0) return status;
    debug("tr_set_file_size: %s\n", fileName);
    trace_anchor_t *anchor = anchor_for_size(fileName, 1, status);
    return anchor != nullptr ? tr_set_size_in_anchor(anchor, size) : status;
}

qn_int32_t tr_set_size_1(const qn_uint32_t newSize) { return tr_set_file_size_1("", newSize); }

qn_int32_t tr_get_size_from_anchor(trace_anchor_t *pAnchor, qn_uint32_t *pSize)
{
    if (master_override_off()) return 0;
    {
        const anchor_set_lock set(pAnchor);
        if (!set) return set_error_int(QN_TR_ELOCK, 9, set.result());
        const bool active = pAnchor->pMap != nullptr;
        *pSize = active ? pAnchor->uActualFileSize : pAnchor->uRequestedFileSize;
        if (!active) return set_error(QN_TR_WINACTIVE, 25);
    }
    return cu_set_no_error_1();
}

qn_int32_t tr_get_file_size_1(const char *fileName, qn_uint32_t *pSize)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    if (master_override_off()) return 0;
    if (fileName == nullptr) return set_error(QN_TR_EFILENAME, 17);
    const global_lock global; // the lock's result is not looked at
    qn_int32_t status = init_default_anchor();
    if (status != 0) return status;
    trace_anchor_t *anchor = anchor_for_size(fileName, 0, status);
    return anchor != nullptr ? tr_get_size_from_anchor(anchor, pSize) : status;
}

qn_int32_t tr_get_size_1(qn_uint32_t *pSize) { return tr_get_file_size_1("", pSize); }
