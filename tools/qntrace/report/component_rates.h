// How many records of each component there are, in all and in each stretch of time; exact for every trace.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "tools/qntrace/stats/buckets.h"

namespace qn::dump
{

struct component_rate {
    std::string name;
    std::uint64_t records = 0;
    std::uint64_t bytes = 0;
    time_buckets buckets{std::nullopt};
};

class component_rates
{
public:
    // Damaged files may have a component in every record: those that come when there is no more room are counted
    // together, as the one at this index.
    static constexpr std::size_t most_components = 64;
    static constexpr std::int64_t most_buckets = 1000;

    component_rates() : all_(std::nullopt) { components_.reserve(most_components + 1); }

    // The component's index.
    std::size_t index_of(std::string_view name);
    // A record; without a time, or with one that is too far from 1970 to be counted in nanoseconds, only in all.
    void add(std::size_t index, std::uint64_t bytes, std::optional<std::int64_t> time_ns);
    // Makes all buckets equally wide.
    void finish();

    const std::vector<component_rate> &components() const { return components_; }
    const time_buckets &all() const { return all_; }

private:
    std::vector<component_rate> components_;
    std::unordered_map<std::string, std::size_t> by_name_;
    time_buckets all_;
};

} // namespace qn::dump
