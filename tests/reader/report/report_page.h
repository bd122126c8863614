// A page that `qntrace report` has made, taken apart.
#pragma once

#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "reader/program.h"
#include "reader/trace_builder.h"

namespace qn::test
{

struct report_page {
    outcome made;
    std::string html;

    // What stands between two texts; fails the test when they are not there.
    std::string between(const std::string &begin, const std::string &end) const;
    std::string data_text() const;
    nlohmann::json data() const { return nlohmann::json::parse(data_text()); }
};

// Runs the command with these arguments and `-o` a file of its own.
report_page make_page(std::vector<std::string> arguments);
// The same for one file with these contents.
report_page page_of(const trace_builder &file, std::vector<std::string> arguments = {});

} // namespace qn::test
