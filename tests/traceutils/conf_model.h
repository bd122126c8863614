// The configuration file once more, written without the library and without regular expressions: what the random test
// and the fuzz target compare the library with.
#pragma once

#include <string>
#include <vector>

#include "traceutils/conf_seen.h"

namespace qn::test
{
conf_seen judge_conf(const std::string &bytes);

// What a good section means, as the name and the values of the element that it becomes, in the order of its fields.
struct element_seen {
    std::string name;
    std::vector<std::string> values;

    bool operator==(const element_seen &) const = default;
};

std::ostream &operator<<(std::ostream &out, const element_seen &element);

std::vector<element_seen> judge_sections(const std::vector<chunk_seen> &chunks);
std::vector<element_seen> elements_of(const trace_conf_data_t &data); // what the library made of them
} // namespace qn::test
