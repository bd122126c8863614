// What the tests of `qntrace export` export, and what other programs make of the outputs.
#pragma once

#include <cstdint>
#include <map>
#include <ostream>
#include <string>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "reader/trace_set_files.h"

namespace qn::test
{

// Files, made anew in each test, and the arguments of a command that reads them.
struct sample {
    const char *name;
    strings (*make)(const scratch_folder &);

    friend std::ostream &operator<<(std::ostream &out, const sample &printed) { return out << printed.name; }
};

// Both byte orders, pages with losses, nodes, clocks that step back, selections, offsets, damage.
const std::vector<sample> &samples();
std::string sample_name(const testing::TestParamInfo<sample> &info);

// Runs `qntrace export --to FORMAT -o OUT ARGUMENTS`.
outcome export_to(const std::string &format, const std::string &out, const strings &arguments,
                  const surroundings &around = {});
// The same; fails the test when the status is not the one with which `qntrace merge` reads the files.
void exported(const std::string &format, const std::string &out, const strings &arguments);

// The standard output of a shell command; fails the test when that fails.
std::string shell(const std::string &command);
strings lines_of(const std::string &text);
// Everything below a folder, by its path from there.
strings tree_of(const std::string &folder);

// The lines of `qntrace merge --json --utc`.
strings merged_lines(const strings &arguments);

// How many records there are of each component, kind, id and thread: "kind id" 17, "id IDX 5" 1.
using counts = std::map<std::string, std::uint64_t>;
counts counts_by_stats(const strings &arguments);
// From lines NAME TAB NUMBER.
counts counts_in(const std::string &lines);

// Members of the total of `qntrace stats`: unfinished, missing, overwritten and unspooled_pages.
counts losses_by_stats(const strings &arguments);

} // namespace qn::test
