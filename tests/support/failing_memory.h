// Memory that runs out when a test says so. A program that links qn_failing_memory has the linker's --wrap for malloc(),
// calloc(), realloc(), strdup(), strndup(), free(), regcomp() and regexec(): the calls of the library and of the test,
// and no others, come through here. Calls are counted from 1, each thread its own.
#pragma once

#include <cstddef>
#include <vector>

namespace qn::test
{
// While it lives, the allocation with that number fails, and only that one.
class failing_allocation
{
public:
    explicit failing_allocation(int number);
    failing_allocation(const failing_allocation &) = delete;
    failing_allocation &operator=(const failing_allocation &) = delete;
    ~failing_allocation();

    bool happened() const;
};

// While it lives, the sizes of what is allocated are written down.
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

// Blocks allocated and not freed, by all threads.
size_t live_blocks();

// Bytes asked for by the last allocation.
size_t last_allocation();

// While it lives, the compilation of the pattern with that number fails.
class failing_pattern
{
public:
    explicit failing_pattern(int number);
    failing_pattern(const failing_pattern &) = delete;
    failing_pattern &operator=(const failing_pattern &) = delete;
    ~failing_pattern();
};

// While it lives, the compilation of the pattern with that number is a cancellation point.
class cancellation_in_pattern
{
public:
    explicit cancellation_in_pattern(int number);
    cancellation_in_pattern(const cancellation_in_pattern &) = delete;
    cancellation_in_pattern &operator=(const cancellation_in_pattern &) = delete;
    ~cancellation_in_pattern();
};

// While it lives, the match with that number runs out of memory.
class failing_match
{
public:
    explicit failing_match(int number);
    failing_match(const failing_match &) = delete;
    failing_match &operator=(const failing_match &) = delete;
    ~failing_match();

    bool happened() const;
};
} // namespace qn::test
