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
thread_local bool in_regcomp = false;

bool fails()
{
    if (in_regcomp) return false;
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

void *counted(void *block)
{
    if (block != nullptr) ++live;
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
    if (moved == nullptr && bytes == 0) --live;
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
    if (block != nullptr) --live;
    __libc_free(block);
}

// Memory runs out before a pattern is compiled, not meanwhile: the C library's compiler frees a block twice when one of
// several tables cannot grow, and loses memory.
int __real_regcomp(regex_t *regex, const char *pattern, int flags);
int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    if (fails()) return REG_ESPACE;
    in_regcomp = true;
    const int result = __real_regcomp(regex, pattern, flags);
    in_regcomp = false;
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
