// The language of level specifications once more, written without the library: what the random test and the fuzz target
// compare the library with.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace qn::test
{
struct level_element {
    std::string component;
    std::string category;
    int32_t level = -1; // -1: each category's default
};

// Either a code with its offset, or the elements.
struct level_verdict {
    int code = 0;
    int offset = 0;
    std::vector<level_element> elements;
};

level_verdict judge_levels(const std::string &specification);

// A number in C notation: white space, a sign, then 0x.., 0.. or decimal digits. Too large a number is the largest.
struct number {
    bool found = false;
    uint64_t value = 0;
    size_t end = 0; // behind the last digit
};

number read_number(const std::string &text, size_t at);

std::string star_spelled_out(const std::string &pattern); // a lone "*" matches everything

// Whether the text compiles as a pattern, and whether it matches a name.
bool is_pattern(const std::string &text);
bool matches(const std::string &pattern, const std::string &name);

// Where the first ':' of a text stands that is in no bracket or brace group; npos when there is none.
size_t colon_outside_groups(const std::string &text);

// A component as the model keeps it.
struct model_category {
    uint32_t id;
    std::string name;
    uint32_t standard;
    uint32_t minimum;
};

struct model_component {
    std::string id;
    std::vector<model_category> categories;
    std::vector<uint8_t> levels;

    void apply(const level_element &element);
};
} // namespace qn::test
