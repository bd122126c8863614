#include "faults/all_allocations.h"

#include <atomic>
#include <cerrno>
#include <cstddef>

#include <regex.h>

namespace
{
std::atomic<uint64_t> to_go{0}; // 0: none fails
std::atomic<bool> for_good{false};
std::atomic<uint64_t> failures{0};
std::atomic<uint64_t> live{0};
thread_local int64_t live_of_thread = 0; // allocated less freed by it

bool fails()
{
    uint64_t left = to_go.load();
    do {
        if (left == 0) return false;
        if (left == 1 && for_good) break;
    } while (!to_go.compare_exchange_weak(left, left - 1));
    if (left != 1) return false;
    ++failures;
    errno = ENOMEM;
    return true;
}

void add_to_live(int64_t blocks)
{
    live += static_cast<uint64_t>(blocks);
    live_of_thread += blocks;
}

void *counted(void *block)
{
    if (block != nullptr) add_to_live(1);
    return block;
}
} // namespace

#pragma GCC visibility push(default)
extern "C" {
void *__libc_malloc(size_t bytes);
void *__libc_calloc(size_t count, size_t bytes);
void *__libc_realloc(void *block, size_t bytes);
void *__libc_memalign(size_t alignment, size_t bytes);
void __libc_free(void *block);

void *malloc(size_t bytes) { return fails() ? nullptr : counted(__libc_malloc(bytes)); }
void *calloc(size_t count, size_t bytes) { return fails() ? nullptr : counted(__libc_calloc(count, bytes)); }
void *realloc(void *block, size_t bytes)
{
    if (fails()) return nullptr;
    void *moved = __libc_realloc(block, bytes);
    if (block == nullptr) return counted(moved);
    if (moved == nullptr && bytes == 0) add_to_live(-1);
    return moved;
}
void *memalign(size_t alignment, size_t bytes)
{
    return fails() ? nullptr : counted(__libc_memalign(alignment, bytes));
}
void *aligned_alloc(size_t alignment, size_t bytes) { return memalign(alignment, bytes); }
int posix_memalign(void **block, size_t alignment, size_t bytes)
{
    *block = memalign(alignment, bytes);
    return *block == nullptr ? ENOMEM : 0;
}
void free(void *block)
{
    if (block != nullptr) add_to_live(-1);
    __libc_free(block);
}

// A pattern that cannot be compiled for want of memory costs the C library some of it, for good. That is not held
// against whoever compiled it.
int __real_regcomp(regex_t *regex, const char *pattern, int flags);
int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    const int64_t before = live_of_thread;
    const int result = __real_regcomp(regex, pattern, flags);
    if (result != 0) add_to_live(before - live_of_thread);
    return result;
}
}
#pragma GCC visibility pop

namespace qn::test
{
void fail_allocations(uint64_t number, running_out how)
{
    for_good = how == running_out::for_good;
    failures = 0;
    to_go = number;
}

uint64_t stop_failing_allocations()
{
    to_go = 0;
    return failures;
}

uint64_t live_allocations() { return live; }
} // namespace qn::test
