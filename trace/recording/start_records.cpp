// The records that the library writes itself: start, restart, time calibration. Anchor set lock, held by the caller.
#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <unistd.h>

#include "trace/files/library.h"
#include "trace/files/shared_words.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

char *gCoreMessage = nullptr;
char *gCoreTrcFile = nullptr;

namespace
{
using namespace qn::tr;

// Reserves a record, has its body filled and completes it; drops it when there is no space.
template <class Record, class Fill>
void write_own_record(trace_anchor_t *anchor, format::kind function, unsigned int length, Fill fill)
{
    trace_record_header_t *header = allocate_space(anchor, &length);
    if (header == nullptr) return;
    std::copy_n(format::library_component, sizeof header->compId, header->compId);
    fill(reinterpret_cast<Record *>(header));
    keep_store_order();
    header->function = static_cast<qn_uint16_t>(function);
}

// A copy of a text that an earlier one may still be read beside: none is freed, and each leads to the one before.
struct kept_text {
    kept_text *before;
    char text[];
};

char *kept_copy(const char *text)
{
    static kept_text *last = nullptr;
    if (text == nullptr) return nullptr;
    const size_t bytes = std::strlen(text) + 1;
    auto *copy = static_cast<kept_text *>(std::malloc(sizeof(kept_text) + bytes));
    if (copy == nullptr) return nullptr;
    std::memcpy(copy->text, text, bytes);
    copy->before = last;
    last = copy;
    return copy->text;
}

// Which process writes from here on, and how its counter relates to time.
void fill_start(trace_record_start_t *record)
{
    record->pid = static_cast<qn_uint32_t>(getpid());
    cu_timeinfo_t time_info{};
    cu_get_procspeed_1(&time_info);
    record->timeInfo = time_info;
}

qn_int32_t write_start(trace_anchor_t *anchor)
{
    write_own_record<trace_record_start_t>(anchor, format::kind::start, sizeof(trace_record_start_t), fill_start);
    return 0;
}

qn_int32_t write_restart(trace_anchor_t *anchor, const char *message)
{
    const size_t text_length = std::strlen(message);
    const auto length = static_cast<unsigned int>((text_length + sizeof(trace_record_start_t) + 4) & ~size_t{3});
    write_own_record<trace_record_start_t>(anchor, format::kind::restart, length, [=](trace_record_start_t *record) {
        fill_start(record);
        std::memcpy(record + 1, message, text_length + 1);
    });
    return 0;
}
} // namespace

qn_int32_t tr_core_event_1(const char *trc_file, const char *message)
{
    store_release(gCoreMessage, kept_copy(message));
    store_release(gCoreTrcFile, kept_copy(trc_file));
    return 0;
}

qn_int32_t int_record_start(trace_anchor_t *pAnchor)
{
    if (master_override_off() || pAnchor->uMaxSize == 0) return 0;
    // Loaded once: the event may be replaced or taken back at any moment.
    const char *message = load_acquire(gCoreMessage);
    const char *core_file = load_acquire(gCoreTrcFile);
    const bool crashed = message != nullptr && core_file != nullptr && std::strcmp(core_file, pAnchor->fileName) == 0;
    return crashed ? write_restart(pAnchor, message) : write_start(pAnchor);
}

qn_int32_t segfault_restart(trace_anchor_t *pAnchor)
{
    if (pAnchor->uMaxSize == 0) return 0;
    const char *message = load_acquire(gCoreMessage);
    return message != nullptr ? write_restart(pAnchor, message) : write_start(pAnchor);
}

qn_int32_t __time_calibration(trace_anchor_t *pAnchor)
{
    if (pAnchor->uMaxSize == 0) return 0;
    write_own_record<time_calibration_t>(pAnchor, format::kind::time_calibration, sizeof(time_calibration_t),
                                         [=](time_calibration_t *record) {
                                             cu_timeinfo_t time_info = header_of(pAnchor)->timeInfo;
                                             cu_compute_base_timeinfo_1(&time_info);
                                             record->reBase = time_info;
                                         });
    return 0;
}
