// The cluster that this node belongs to, as the common-utilities library tells it: asked for once, then kept.
#pragma once

#include <qn_cu.h>

extern cu_cluster_info_t clusterInfo; // an empty name: not known yet
extern qn_int32_t clusterInfoRC;      // what asking gave; 0 also before it was asked

namespace qn::tr
{
struct cluster_facts {
    cu_cluster_info_t info;
    qn_int32_t result;
    bool asked_now; // this call asked; it was not known before
};

// What is known, asking when the name is still empty. These take a leaf mutex.
cluster_facts known_cluster();
cluster_facts cached_cluster(); // without asking

// Empties identifier, name and node number when asking had failed; what is known then.
cluster_facts known_cluster_or_none();
} // namespace qn::tr
