#include "tools/qntrace/traces/origin_members.h"

namespace qn::dump
{

text_members origin_members(const trace_source &source)
{
    text_members origin;
    if (!source.cluster.empty()) origin.emplace_back("cluster", source.cluster);
    origin.emplace_back("node", source.node());
    if (!source.node_id.empty()) origin.emplace_back("node_id", source.node_id);
    origin.emplace_back("program", source.program);
    origin.emplace_back("trace", source.trace);
    return origin;
}

text_members origin_with_path(const trace_source &source)
{
    text_members origin = origin_members(source);
    origin.emplace_back("path", source.path);
    return origin;
}

} // namespace qn::dump
