// The languages of file maps and file sizes once more, written without the library: what the random test and the fuzz
// targets compare the library with.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace qn::test
{
struct map_element {
    std::string file;
    std::string component;
    std::string category;
    bool operator==(const map_element &) const = default;
};

// A code with its offset, or 0; and what was taken, also before a fault.
struct map_verdict {
    int code = 0;
    int offset = 0;
    std::vector<map_element> elements;
};

struct size_element {
    std::string file;
    uint32_t size = 0;
};

struct size_verdict {
    int code = 0;
    int offset = 0;
    std::vector<size_element> elements;
};

inline constexpr int refused_without_message = 17;

// One selection for one file.
map_verdict judge_selection(const std::string &file, const std::string &selection);

// A value of QN_TR_FILE_MAP, and one of QN_TR_FILE_SIZE. A ';' that ends a value adds nothing.
map_verdict judge_map(const std::string &value);
size_verdict judge_sizes(const std::string &value);
} // namespace qn::test
