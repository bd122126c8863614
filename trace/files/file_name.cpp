// The default trace file's name, and whether traces may have pages: the exported calls. Global mutex.
#include <cstdlib>
#include <cstring>
#include <unistd.h>

#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"

namespace
{
using namespace qn::tr;

constexpr const char *multipage_marker = "/var/qn/cfg/disable_multipage_trace_logic";

// A page set goes by its name without the page suffix as well as by its first page's.
bool is_current_name(const char *file_name)
{
    return std::strncmp(anchors.fileName, file_name, sizeof anchors.fileName - 1) == 0 ||
           (anchors.nextPage != nullptr && spool_name_match(anchors.fileName, file_name) == 0);
}

qn_int32_t stop_every_trace()
{
    qn_int32_t status = 0;
    for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = load_acquire(anchor->next)) {
        const qn_int32_t stopped = stop_trace_locked(anchor);
        if (stopped != 0) status = stopped;
    }
    return status;
}

qn_int32_t change_default_file(const char *file_name)
{
    if (is_current_name(file_name)) return 0;
    const qn_int32_t status = become_unbound(&anchors);
    if (status != 0) return status;
    set_file_name(&anchors, file_name);
    return is_trace_on(&anchors) ? start_trace_locked(&anchors) : 0;
}
} // namespace

qn_int32_t tr_set_filename_1(const qn_char_t *pFileName)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    qn_int32_t status = 0;
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        status = init_default_anchor();
        if (status != 0) return status;
        status = pFileName == nullptr ? stop_every_trace() : change_default_file(pFileName);
    }
    return status != 0 ? status : cu_set_no_error_1();
}

qn_int32_t tr_get_filename_1(qn_char_t *pFileName)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        const qn_int32_t status = init_default_anchor();
        if (status != 0) return status;
        std::memcpy(pFileName, anchors.fileName, std::strlen(anchors.fileName) + 1);
    }
    return cu_set_no_error_1();
}

qn_int32_t tr_set_multipage_1(const qn_uint32_t state)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    if (master_override_off()) return 0;

    const global_lock global; // the lock's result is not looked at
    const qn_int32_t status = init_default_anchor();
    const bool forbidden =
        access(multipage_marker, F_OK) == 0 || std::getenv("QN_TR_DISABLE_DEFAULT_MULTIPAGE") != nullptr;
    store_relaxed(anchors.bMultipageEnabled, forbidden ? 0 : static_cast<int>(state));
    if (status == 0) debug("tr_set_multipage has been called with value : %d\n", static_cast<int>(state));
    return status;
}
