// Spool specifications: making one, with its twin for a cluster's identifier, and the lists of them. Global mutex, held by
// the caller; what is written into a specification in use, the queue mutex too.
#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "trace/files/cluster.h"
#include "trace/files/compiled_pattern.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/locks.h"
#include "trace/files/text.h"
#include "trace/spooling/spool_list.h"
#include "trace/spooling/spool_shape.h"

trace_spool_spec_t dfltSpoolSpec;

namespace
{
using namespace qn::tr;

constexpr qn_int32_t could_not_add = 39;

using pattern_buffer = std::array<char, sizeof(trace_spool_spec_t::pattern)>;

// A group of a match in a pattern, if it took part in it.
bool group_of(const char *pattern, const regmatch_t &place, pattern_buffer &group)
{
    if (place.rm_so == -1 || place.rm_eo == -1) return false;
    const auto length = static_cast<size_t>(place.rm_eo - place.rm_so);
    std::memcpy(group.data(), pattern + place.rm_so, length);
    group[length] = '\0';
    return true;
}

// True when the node's cluster goes by a name that the pattern's cluster part matches whole.
bool is_this_cluster(const char *base_cl_pat, const char *cluster_name)
{
    std::array<char, sizeof(pattern_buffer) + 2> whole_name;
    std::snprintf(whole_name.data(), whole_name.size(), "^%s$", base_cl_pat);
    const compiled_pattern cluster_pattern(whole_name.data());
    if (!cluster_pattern) return false;
    if (cluster_pattern.matches(cluster_name)) return true;
    debug("This cluster name (%s) NOT matched on %s.\n", cluster_name, whole_name.data());
    return false;
}

// Traces live under the cluster's name and, the same, under its identifier: the pattern with the identifier for the name,
// when `pattern` is about this node's cluster. Only the pattern that first asks for the cluster gets one.
bool pattern_with_cluster_id(const char *pattern, pattern_buffer &twin)
{
    const compiled_pattern under_cluster("/var/qn/([^/]+)(.*)", 0);
    std::array<regmatch_t, 3> places;
    if (!under_cluster || !under_cluster.matches(pattern, places)) return false;
    debug("addSpoolCfgElement: Cluster name pattern detected\n");

    const cluster_facts cluster = known_cluster();
    if (!cluster.asked_now || cluster.result != 0) return false;

    pattern_buffer base_cl_pat;
    pattern_buffer rest_of_pat;
    if (!group_of(pattern, places[1], base_cl_pat)) return false;
    debug("base_cl_pat(%d..%d): '%s'\n", places[1].rm_so, places[1].rm_eo, base_cl_pat.data());
    if (!group_of(pattern, places[2], rest_of_pat)) return false;
    debug("rest_of_pat(%d..%d): '%s'\n", places[2].rm_so, places[2].rm_eo, rest_of_pat.data());
    if (!is_this_cluster(base_cl_pat.data(), cluster.info.cu_cluster_name)) return false;

    debug("cluster name/pattern match: creating new spec from cluster id'\n");
    const int length =
        std::snprintf(twin.data(), twin.size(), "/var/qn/%s%s", cluster.info.cu_cluster_ID, rest_of_pat.data());
    if (length >= static_cast<int>(twin.size())) return false;
    debug("Creating new element with pattern: %s.\n", twin.data());
    return true;
}
} // namespace

namespace qn::tr
{
void spec_list::append(trace_spool_spec_t *spec)
{
    spec->pPrev = last;
    spec->pNext = nullptr;
    if (last != nullptr) last->pNext = spec;
    if (first == nullptr) first = spec;
    last = spec;
}

bool spec_list::remove(trace_spool_spec_t *spec)
{
    trace_spool_spec_t *found = first;
    while (found != nullptr && found != spec) found = found->pNext;
    if (found == nullptr) return false;
    (spec->pPrev != nullptr ? spec->pPrev->pNext : first) = spec->pNext;
    (spec->pNext != nullptr ? spec->pNext->pPrev : last) = spec->pPrev;
    return true;
}

void set_destination(trace_spool_spec_t *spec, const char *path)
{
    const mutex_lock queue(spq.mutex);
    copy_cut(spec->dest, path);
}

void set_directory(trace_spool_spec_t *spec, char *directory)
{
    const mutex_lock queue(spq.mutex);
    spec->dir = directory;
}
} // namespace qn::tr

qn_int32_t addSpoolCfgElement(const char *dest, const char *pattern, qn_uint32_t pages, qn_int32_t onoff,
                              qn_int32_t interval, trace_spool_spec_t **pFirstSpoolSpec,
                              trace_spool_spec_t **pLastSpoolSpec, int dupForClusterLink, qn_uint32_t pageSize)
{
    auto *spec = static_cast<trace_spool_spec_t *>(std::calloc(1, sizeof(trace_spool_spec_t)));
    if (spec == nullptr) {
        set_error(QN_TR_ENOMEM, 14);
        return could_not_add;
    }
    copy_cut(spec->dest, dest);
    copy_cut(spec->pattern, pattern);
    spec->pages = pages;
    spec->onoff = onoff;
    spec->pg_size = pageSize;
    spec->sync_interval = spool_sync_seconds(interval);
    debug("Spooling spec '%s:%u:%u:%s', sync_interval=%d'\n", spec->pattern, static_cast<unsigned>(spec->onoff),
          spec->pages, spec->dest, static_cast<int>(spec->sync_interval));

    spec_list list{*pFirstSpoolSpec, *pLastSpoolSpec};
    list.append(spec);
    *pFirstSpoolSpec = list.first;
    *pLastSpoolSpec = list.last;

    pattern_buffer twin;
    if (dupForClusterLink != 1 || !pattern_with_cluster_id(spec->pattern, twin)) return 0;
    return addSpoolCfgElement(spec->dest, twin.data(), spec->pages, spec->onoff,
                              static_cast<qn_int32_t>(spec->sync_interval), pFirstSpoolSpec, pLastSpoolSpec, 0,
                              pageSize);
}

void free_spool_spec_linked_list(trace_spool_spec_t *head)
{
    while (head != nullptr) {
        trace_spool_spec_t *next = head->pNext;
        std::free(head);
        head = next;
    }
}
