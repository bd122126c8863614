// The text of cluster.conf. Pure functions, no state.
#pragma once

#include <optional>
#include <string_view>

#include <qn_cu.h>

namespace qn::cu
{
struct cluster_conf {
    cu_cluster_info_t info{};
    std::optional<qn_uint64_t> node_id;
};

cluster_conf parse_cluster_conf(std::string_view text);
} // namespace qn::cu
