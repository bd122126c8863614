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

// A number of 1 to 16 hexadecimal digits, with or without "0x"; nothing else may stand in `digits`.
std::optional<qn_uint64_t> parse_hexadecimal(std::string_view digits);
} // namespace qn::cu
