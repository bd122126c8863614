// Allocations and patterns that fail when a test says so, and a count of what is allocated. A program linked with
// this file needs the linker's --wrap for calloc, malloc, realloc, strdup, free, regcomp and regexec; the calls of
// the library and of the test, and no others, come through here.
#pragma once

#include <cstddef>

namespace qn::test
{
// While it lives, the allocation with that number (counted from 1) fails, and only that one.
class failing_allocation
{
public:
    explicit failing_allocation(int number);
    failing_allocation(const failing_allocation &) = delete;
    failing_allocation &operator=(const failing_allocation &) = delete;
    ~failing_allocation();

    bool happened() const;
};

// While it lives, the compilation of the pattern with that number (counted from 1) fails.
class failing_pattern
{
public:
    explicit failing_pattern(int number);
    failing_pattern(const failing_pattern &) = delete;
    failing_pattern &operator=(const failing_pattern &) = delete;
    ~failing_pattern();
};

// While it lives, the match with that number (counted from 1) runs out of memory.
class failing_match
{
public:
    explicit failing_match(int number);
    failing_match(const failing_match &) = delete;
    failing_match &operator=(const failing_match &) = delete;
    ~failing_match();

    bool happened() const;
};

// Blocks allocated and not freed.
size_t live_blocks();

// Bytes asked for by the last allocation.
size_t last_allocation();
} // namespace qn::test
