#include "tools/qntrace/traces/clock_offsets.h"

#include <algorithm>
#include <optional>
#include <stdexcept>

#include <fmt/format.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/format/durations.h"

namespace qn::dump
{
namespace
{

bool names_node(const std::string &name, const trace_source &source)
{
    return name == source.host || name == source.node_id || name == source.node();
}

} // namespace

clock_offsets::clock_offsets(const std::vector<std::string> &texts)
{
    for (const auto &text : texts) {
        const auto equals = text.rfind('=');
        const auto offset = equals == std::string::npos ? std::nullopt : parse_duration(text.substr(equals + 1));
        if (!offset || equals == 0) throw std::invalid_argument("--offset takes NODE=DURATION, like host3=+1.5ms");
        by_node_[text.substr(0, equals)] = *offset;
    }
}

void clock_offsets::check(const std::vector<trace_source> &sources) const
{
    for (const auto &node : by_node_) {
        const bool known = std::any_of(sources.begin(), sources.end(),
                                       [&](const trace_source &source) { return names_node(node.first, source); });
        if (!known) throw std::invalid_argument(fmt::format("no file is of the node {}", printable_name(node.first)));
    }
}

std::int64_t clock_offsets::of(const trace_source &source) const
{
    for (const auto &[name, offset] : by_node_)
        if (names_node(name, source)) return offset;
    return 0;
}

void add_offset_option(CLI::App &command, std::vector<std::string> &texts)
{
    command
        .add_option("--offset", texts,
                    "NODE=DURATION: add this to the times of a node's records, like host3=+1.5ms;\n"
                    "the node is named by its host or its 16-digit identifier")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
}

} // namespace qn::dump
