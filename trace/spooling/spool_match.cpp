// Which specification governs a trace file. Global mutex, held by the caller; the exported call takes it.
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "trace/files/compiled_pattern.h"
#include "trace/files/debug.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/page_names.h"
#include "trace/files/text.h"
#include "trace/spooling/spool_list.h"

namespace
{
using namespace qn::tr;

bool matches(const trace_spool_spec_t *spec, const char *trc_file)
{
    debug("match_spool_file_name: checking '%s' on '%s'\n", trc_file, spec->pattern);
    const compiled_pattern pattern(spec->pattern);
    if (!pattern) {
        debug_error("Invalid pattern: '%s'\n", spec->pattern);
        return false;
    }
    if (!pattern.matches(trc_file)) return false;
    debug("Matched: '%s' on '%s'\n", trc_file, spec->pattern);
    return true;
}

// The directory of another specification with the same destination, which has made it already.
char *directory_made_by_another(const trace_spool_spec_t *spec, trace_spool_spec_t *first)
{
    for (const trace_spool_spec_t *other = first; other != nullptr; other = other->pNext)
        if (other != spec && other->dir != nullptr && std::strcmp(other->dest, spec->dest) == 0) return other->dir;
    return nullptr;
}

// A directory that was given to a client stays readable for it: the specification it came from may be freed by the next
// change of the configuration. One copy of each is kept for the life of the process.
struct given_directory {
    given_directory *next;
    char path[sizeof(trace_spool_spec_t::dest)];
};

given_directory *given_directories = nullptr; // global mutex

char *for_the_client(const char *directory)
{
    given_directory *given = given_directories;
    while (given != nullptr && std::strcmp(given->path, directory) != 0) given = given->next;
    if (given != nullptr) return given->path;

    given = static_cast<given_directory *>(std::calloc(1, sizeof(given_directory)));
    if (given == nullptr) return nullptr;
    std::memcpy(given->path, directory, std::strlen(directory));
    given->next = given_directories;
    given_directories = given;
    return given->path;
}
} // namespace

trace_spool_spec_t *match_spool_file_name(const char *trc_file, trace_spool_spec_t *pFirstSpoolSpec)
{
    char name[trace_file_name_bytes]; // a page goes by its trace's
    copy_cut(name, trace_name_of_page(trc_file).value_or(trc_file));

    trace_spool_spec_t *spec = pFirstSpoolSpec;
    while (spec != nullptr && !(matches(spec, name) && spec->pages > 1)) spec = spec->pNext;
    if (spec == nullptr) return nullptr;

    if (spec->dir == nullptr) {
        char *directory = directory_made_by_another(spec, pFirstSpoolSpec);
        set_directory(spec, directory != nullptr ? directory : mkspooldir(spec, name));
    }
    if (spec->dir != nullptr) return spec;
    spec->onoff = 0;
    debug_error("Could not create or access spooling directory: '%s'\n", spec->dest);
    return nullptr;
}

char *tr_get_spool_dir_1(const char *trc_file)
{
    if (trc_file == nullptr) return nullptr;
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    const global_lock global; // the lock's result is not looked at
    pthread_once(&sp_read_cfg, read_spool_cfg);
    const trace_spool_spec_t *spec = match_spool_file_name(trc_file, anchors.pFirstSpoolSpec);
    const bool copies =
        spec != nullptr && spec->onoff != 0 && spec->dir != nullptr && std::strcmp(spec->dir, recycle_only) != 0;
    char *directory = copies ? for_the_client(spec->dir) : nullptr;
    debug_error("tr_get_spool_dir returning: '%s'\n", directory != nullptr ? directory : "(NULL)");
    return directory;
}
