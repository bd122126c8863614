#include "tools/qntrace/report/component_rates.h"

namespace qn::dump
{

std::size_t component_rates::index_of(std::string_view name)
{
    const auto known = by_name_.find(std::string(name));
    if (known != by_name_.end()) return known->second;
    const bool has_room = components_.size() < most_components;
    if (components_.size() <= most_components) {
        components_.emplace_back();
        components_.back().name = has_room ? name : "(other)";
    }
    const std::size_t index = components_.size() - 1;
    if (has_room) by_name_.emplace(name, index);
    return index;
}

void component_rates::add(std::size_t index, std::uint64_t bytes, std::optional<std::int64_t> time_ns)
{
    component_rate &component = components_[index];
    ++component.records;
    component.bytes += bytes;
    if (!time_ns) return;
    component.buckets.add(*time_ns, bytes, 0);
    all_.add(*time_ns, bytes, 0);
}

void component_rates::finish()
{
    all_.finish(most_buckets);
    for (component_rate &component : components_) component.buckets.widen_to(all_.width());
}

} // namespace qn::dump
