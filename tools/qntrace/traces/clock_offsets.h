// Clocks of nodes put right: what is added to the times of a node's records.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include "tools/qntrace/traces/trace_set.h"

namespace qn::dump
{

class clock_offsets
{
public:
    // From texts NODE=DURATION. Throws std::invalid_argument.
    explicit clock_offsets(const std::vector<std::string> &texts);

    // Throws std::invalid_argument for a node that no file is of: its offset would be lost without a word.
    void check(const std::vector<trace_source> &sources) const;
    // In nanoseconds.
    std::int64_t of(const trace_source &source) const;

private:
    std::map<std::string, std::int64_t> by_node_;
};

// Adds --offset, whose values go to `texts`.
void add_offset_option(CLI::App &command, std::vector<std::string> &texts);

} // namespace qn::dump
