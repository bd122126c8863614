// Lazy initialisation from the environment, the fork handlers and the stop switch. Global mutex, held by init's caller.
#include "trace/files/library.h"

#include <cstdlib>
#include <cstring>
#include <string_view>
#include <sys/syslog.h>
#include <unistd.h>

#include <cu_tr_proxy.h>

#include "platform/common/descriptors.h"
#include "platform/common/system_log.h"
#include "trace/components/specifications.h"
#include "trace/files/debug.h"
#include "trace/files/locks.h"
#include "trace/files/text.h"
#include "trace/spooling/spool.h"

int global_switch = 0;
int this_is_child = 0;
int use_msync_enabled_except_flush = 0;
pthread_once_t register_once = PTHREAD_ONCE_INIT;
pthread_once_t sp_read_cfg = PTHREAD_ONCE_INIT;

namespace
{
using namespace qn::tr;

// The value of an environment variable, or null when it is unset or empty.
const char *environment(const char *name)
{
    const char *value = std::getenv(name);
    return value != nullptr && value[0] != '\0' ? value : nullptr;
}

// Cut to the field, like every file name.
void add_to_file_name(trace_anchor_t *anchor, const char *text)
{
    const size_t length = std::strlen(anchor->fileName);
    copy_cut(anchor->fileName + length, sizeof anchor->fileName - length, text);
}

void name_default_file(trace_anchor_t *anchor, const char *name)
{
    if (name[0] == '/') {
        set_file_name(anchor, name);
        return;
    }
    char directory[trace_file_name_bytes];
    if (getcwd(directory, sizeof directory) == nullptr) directory[0] = '\0';
    set_file_name(anchor, directory);
    if (!std::string_view(directory).ends_with('/')) add_to_file_name(anchor, "/");
    add_to_file_name(anchor, name);
}

void size_default_file(trace_anchor_t *anchor, const char *value)
{
    const unsigned long size = std::strtoul(value, nullptr, 0);
    if (size != 0) anchor->uRequestedFileSize = static_cast<qn_uint32_t>(size);
}

tr_proxy_func_table_t _trp_funcs = {tr_flush_1, tr_record_vfmt_string_1};

// A child that is forked before the library was initialised traces, and has a spool thread of its own.
void be_usable_in_child()
{
    reset_locks_in_child();
    if (!anchors.bInitialized) forget_spool_thread();
}

// Some calls take locks without initialising the library. So this handler is there from the start, and so are biased
// locks: to a process that has several threads already, the system needs some 20 ms to promise its barrier.
[[gnu::constructor]] void prepare_locks()
{
    pthread_atfork(nullptr, nullptr, be_usable_in_child);
    allow_bias();
}
} // namespace

int init(trace_anchor_t *anchor)
{
    if (anchor == &anchors)
        anchor->pageSize = static_cast<qn_int32_t>(sysconf(_SC_PAGESIZE));
    else
        initAnchor(anchor);
    pthread_once(&register_once, register_atfork);

    const char *value = std::getenv("QN_TR_USE_MSYNC");
    if (value != nullptr) use_msync_enabled_except_flush = std::atoi(value) != 0;
    value = environment("QN_TR_FILENAME");
    if (value != nullptr) name_default_file(anchor, value);
    value = environment("QN_TR_SIZE");
    if (value != nullptr) size_default_file(anchor, value);
    value = environment("QN_TR_DEBUG_LEVEL");
    if (value != nullptr) store_relaxed(global_debug_level, static_cast<qn_uint32_t>(std::strtoul(value, nullptr, 0)));
    if (debug_level_above(0)) {
        const qn::platform::standard_numbers_taken other_numbers;
        const qn::platform::system_log_turn turn;
        if (turn) openlog("opal_trace", LOG_CONS | LOG_NDELAY | LOG_PID, LOG_DAEMON);
    }

    value = environment("QN_TR_TRACE_LEVELS");
    if (value != nullptr) parse_trace_spec(value, &anchor->pFirstTraceSpec, &anchor->pLastTraceSpec);
    value = environment("QN_TR_FILE_MAP");
    if (value != nullptr) parse_map_spec(value, &anchor->pFirstMapSpec, &anchor->pLastMapSpec);
    value = environment("QN_TR_FILE_SIZE");
    if (value != nullptr) parse_fileSize_spec(value);

    pthread_once(&sp_read_cfg, read_spool_cfg);
    determine_configuration_action_from_the_configuration_file();
    std::atexit(tr_term);
    cu_trp_register(&_trp_funcs);
    anchor->bInitialized = 1;
    return 0;
}

void global_stop_trace(void) { store_relaxed(global_switch, 1); }

void register_atfork(void) { pthread_atfork(nullptr, nullptr, atfork_child); }

void atfork_child(void)
{
    store_relaxed(this_is_child, 1);
    global_stop_trace();
}

namespace qn::tr
{
int init_default_anchor() { return anchors.bInitialized ? 0 : init(&anchors); }
} // namespace qn::tr
