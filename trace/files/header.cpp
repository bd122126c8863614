// Writing a fresh file header. Anchor set lock, held by the caller.
#include <cstring>

#include "trace/files/cluster.h"
#include "trace/files/debug.h"
#include "trace/files/trace_file.h"
#include "trace/recording/recording.h"

// Tells the host's byte order: its first byte in memory is 1 on a little-endian one.
qn_uint16_t endian_test = 0x0001;

namespace
{
using namespace qn::tr;

constexpr const char *build_identifier = QN_TR_BUILD_IDENTIFIER;

pthread_once_t cluster_once = PTHREAD_ONCE_INIT;

void ask_for_cluster() { (void)known_cluster(); }

qn_uint16_t node_number()
{
    pthread_once(&cluster_once, ask_for_cluster);
    const cluster_facts cluster = cached_cluster();
    return cluster.result == 0 ? static_cast<qn_uint16_t>(cluster.info.cu_node_number) : qn_uint16_t{0};
}

qn_uint8_t properties_of_this_host()
{
    return format::properties::always | (host_is_little_endian() ? format::properties::little_endian : 0);
}

qn_uint8_t initial_page_state(const trace_anchor_t *anchor)
{
    if (!is_spooled_page(anchor)) return 0;
    const bool active = *anchor->ppActivePg == anchor;
    debug("init_trace_header: setting %s to %s\n", anchor->fileName, active ? "TR_ACTIVE" : "TR_READY");
    return active ? format::page_state::active : format::page_state::ready;
}
} // namespace

namespace qn::tr
{
bool host_is_little_endian()
{
    unsigned char first = 0;
    std::memcpy(&first, &endian_test, 1);
    return first != 0;
}

void restore_layout(trace_anchor_t *anchor, const trace_record_header_t *ring)
{
    trace_file_header_t *header = header_of(anchor);
    header->uProperties = properties_of_this_host();
    if (header->uVersion > format::format_version) header->uVersion = format::format_version;
    header->uOffset = static_cast<qn_uint32_t>(reinterpret_cast<const unsigned char *>(ring) - anchor->pMap);
    header->uActualFileSize = static_cast<qn_uint32_t>(anchor->pMapEnd - anchor->pMap);
}

void set_build_name(trace_file_header_t *header, const char *identifier)
{
    const char *name = identifier[0] != '\0' ? identifier : "Unknown";
    std::memset(header->buildName, 0, sizeof header->buildName);
    std::memcpy(header->buildName, name, strnlen(name, sizeof header->buildName - 1));
}
} // namespace qn::tr

qn_int32_t init_trace_header(trace_anchor_t *anchor)
{
    trace_file_header_t *header = header_of(anchor);
    header->uProperties = properties_of_this_host();
    header->uPlatform = format::platform_linux;
    header->uVersion = format::format_version;
    header->uOffset = format::header_bytes;
    store_relaxed(header->uOldestRecordOffset, header->uOffset);
    header->uActualFileSize = anchor->uActualFileSize;
    store_relaxed(header->uTailReq, 0);
    store_relaxed(header->uSeqLock, format::seq_lock_none);
    store_relaxed(header->uFlags, 0);
    header->machineId = 0;
    set_build_name(header, build_identifier);
    cu_get_procspeed_1(&header->timeInfo);
    header->uNodeNumber = node_number();
    qn_uint64_t node_id = 0;
    header->uNode_ID = cu_get_node_id_1(&node_id) == 0 ? node_id : 0;
    header->sp_flags = initial_page_state(anchor);
    header->sp_reuse_tm = 0;
    header->tz_offset = get_tz_offset();
    return 0;
}
