// Spool directories for the tests of `qntrace spool`, and what the command says of them.
#pragma once

#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "reader/program.h"
#include "reader/trace_builder.h"

namespace qn::test
{

// Two records, the first `seconds` after 05:12:00 and the other a microsecond later.
trace_builder two_records(std::uint64_t seconds = 1, std::size_t size = 4096);

// Cluster, cluster id, host, node id and program.
inline const std::string usual_folder = "c1/id1/h1/000000000000002a/mydaemon";

// A spool directory to put copies into.
struct spool_directory {
    spool_directory();
    // Gives the path of the copy.
    std::string put(const std::string &below, const std::string &name, const trace_builder &file) const;
    std::string put(const std::string &name, const trace_builder &file = two_records()) const;

    scratch_folder folder;
    std::string root;
};

// The objects that the command has printed.
std::vector<nlohmann::json> rows(const outcome &shown);
// Those of directories in which everything is sound; fails the test when the command does not say so.
std::vector<nlohmann::json> sound_rows(const std::vector<std::string> &directories);

} // namespace qn::test
