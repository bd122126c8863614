// What all fuzz targets share: reading an input as a text, and a way to fail loudly. Each target is one function,
// LLVMFuzzerTestOneInput; the tests run it over its seed corpus too.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace qn::fuzz
{
// The input up to its first NUL. Empty and `ok` false when its patterns would keep the regular expression engine busy
// for longer than a fuzz run can wait: repetitions of repetitions copy their operand, so their cost multiplies.
struct input {
    std::string text;
    bool ok = false;
};

input read_input(const uint8_t *data, size_t size);

// Ends the run with the input at hand when something is not as it should be.
void require(bool holds, const char *what, const std::string &text);
} // namespace qn::fuzz
