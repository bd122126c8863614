// Calls of the record writers with random arguments, and what each of them should write.
#pragma once

#include <random>
#include <string>

#include "recording/expected_bytes.h"

namespace qn::test
{
// What one call asked for, cut as the trace's longest record demands.
struct random_record {
    uint16_t function;
    std::string component;
    expected_bytes body;
};

class random_writer
{
public:
    // Writes to the default trace, whose longest record has that many bytes.
    random_writer(unsigned seed, uint32_t longest) : random_(seed), longest_(longest) {}

    // Makes one call; fails the test unless it returns 0.
    random_record write();

private:
    uint32_t below(uint32_t bound) { return static_cast<uint32_t>(random_() % bound); }
    // Mostly some dozens; at times thousands; seldom what a record can be at most, or more.
    uint32_t length();
    std::string text(uint32_t length); // without NULs

    random_record write_id();
    random_record write_strings();
    random_record write_formatted();
    random_record write_data();
    random_record write_values_32();
    random_record write_values_64();
    random_record write_error();

    std::mt19937_64 random_;
    uint32_t longest_;
};
} // namespace qn::test
