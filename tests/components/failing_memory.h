// Memory that runs out when a test says so. A program linked with this file and with the linker's --wrap for calloc,
// malloc, strdup, strndup and regcomp sends the calls of the library and of the test, and no others, through here.
#pragma once

#include <cstddef>
#include <vector>

namespace qn::test
{
// While it lives, the allocation with that number (counted from 1, in this thread) fails, and only that one.
class failing_allocation
{
public:
    explicit failing_allocation(int number);
    failing_allocation(const failing_allocation &) = delete;
    failing_allocation &operator=(const failing_allocation &) = delete;
    ~failing_allocation();

    bool happened() const;
};

// While it lives, the sizes of what this thread allocates are written down.
class allocation_sizes
{
public:
    allocation_sizes();
    allocation_sizes(const allocation_sizes &) = delete;
    allocation_sizes &operator=(const allocation_sizes &) = delete;
    ~allocation_sizes();

    bool has(size_t bytes) const;

private:
    std::vector<size_t> sizes_;
};

// While it lives, the compilation of a pattern with that number (counted from 1, in this thread) is a cancellation point.
class cancellation_in_pattern
{
public:
    explicit cancellation_in_pattern(int number);
    cancellation_in_pattern(const cancellation_in_pattern &) = delete;
    cancellation_in_pattern &operator=(const cancellation_in_pattern &) = delete;
    ~cancellation_in_pattern();
};
} // namespace qn::test
