// The cache of the cluster's facts. Guarded by a leaf mutex of its own: writers of headers and of spool directories ask
// for them, on whichever thread.
#include "trace/files/cluster.h"

#include <cstring>

#include "trace/files/locks.h"

cu_cluster_info_t clusterInfo;
qn_int32_t clusterInfoRC = 0;

namespace
{
using namespace qn::tr;

cluster_facts ask_if_unknown()
{
    const bool ask = clusterInfo.cu_cluster_name[0] == '\0';
    if (ask) clusterInfoRC = cu_get_cluster_info_1(&clusterInfo);
    return {clusterInfo, clusterInfoRC, ask};
}
} // namespace

namespace qn::tr
{
cluster_facts known_cluster()
{
    const mutex_lock cache(cluster_info_mutex);
    return ask_if_unknown();
}

cluster_facts cached_cluster()
{
    const mutex_lock cache(cluster_info_mutex);
    return {clusterInfo, clusterInfoRC, false};
}

cluster_facts known_cluster_or_none()
{
    const mutex_lock cache(cluster_info_mutex);
    cluster_facts facts = ask_if_unknown();
    if (facts.result != 0) {
        std::memset(&clusterInfo, 0, sizeof clusterInfo);
        facts.info = clusterInfo;
    }
    return facts;
}
} // namespace qn::tr
