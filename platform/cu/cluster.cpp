// Who this host is in its cluster. No state: the files are read anew by each call, who wants to remember does
// so.
#include <cerrno>
#include <memory>
#include <new>
#include <string_view>

#include <qn_cu.h>

#include "platform/common/files.h"
#include "platform/common/machine_id.h"
#include "platform/cu/cluster_conf.h"

namespace qn::cu
{
namespace
{
constexpr const char *cluster_file = "/var/qn/cfg/cluster.conf";
constexpr size_t most_cluster_bytes = 64 << 10;

// Of a longer text the lines that end within the bytes that count.
std::string_view whole_lines(std::string_view text)
{
    return text.size() <= most_cluster_bytes ? text : text.substr(0, text.rfind('\n') + 1);
}

int read_cluster_conf(cluster_conf *conf)
{
    constexpr size_t bytes = most_cluster_bytes + 1; // one more tells whether the last line ends there
    const std::unique_ptr<char[]> text(new (std::nothrow) char[bytes]);
    if (!text) return ENOMEM;
    size_t length = 0;
    const int error = platform::read_file(cluster_file, {text.get(), bytes}, &length);
    if (error == 0) *conf = parse_cluster_conf(whole_lines({text.get(), length}));
    return error;
}
} // namespace
} // namespace qn::cu

int cu_get_cluster_info_1(cu_cluster_info_t *info)
{
    if (info == nullptr) return EINVAL;
    qn::cu::cluster_conf conf;
    const int error = qn::cu::read_cluster_conf(&conf);
    *info = conf.info;
    return error;
}

int cu_get_node_id_1(qn_uint64_t *node_id)
{
    if (node_id == nullptr) return EINVAL;
    *node_id = 0;
    qn::cu::cluster_conf conf;
    if (qn::cu::read_cluster_conf(&conf) == 0 && conf.node_id) {
        *node_id = *conf.node_id;
        return 0;
    }
    return qn::platform::read_machine_id(node_id);
}
