#include "components/failing_memory.h"

#include <algorithm>
#include <cstdint>

#include <pthread.h>
#include <regex.h>

namespace
{
thread_local int allocations_to_go = 0; // 0: none fails
thread_local bool failed = false;
thread_local std::vector<size_t> *written_down = nullptr;
thread_local int patterns_to_go = 0;

bool fails(size_t bytes)
{
    if (written_down != nullptr) {
        auto *list = written_down;
        written_down = nullptr; // the list allocates too
        list->push_back(bytes);
        written_down = list;
    }
    if (allocations_to_go == 0 || --allocations_to_go != 0) return false;
    failed = true;
    return true;
}
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
void *__real_calloc(size_t count, size_t bytes);
void *__real_malloc(size_t bytes);
char *__real_strdup(const char *text);
char *__real_strndup(const char *text, size_t bytes);
int __real_regcomp(regex_t *regex, const char *pattern, int flags);

void *__wrap_calloc(size_t count, size_t bytes) { return fails(count * bytes) ? nullptr : __real_calloc(count, bytes); }
void *__wrap_malloc(size_t bytes) { return fails(bytes) ? nullptr : __real_malloc(bytes); }
char *__wrap_strdup(const char *text) { return fails(0) ? nullptr : __real_strdup(text); }
char *__wrap_strndup(const char *text, size_t bytes) { return fails(0) ? nullptr : __real_strndup(text, bytes); }
int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    if (patterns_to_go != 0 && --patterns_to_go == 0) pthread_testcancel();
    return __real_regcomp(regex, pattern, flags);
}
}
#pragma GCC visibility pop

namespace qn::test
{
failing_allocation::failing_allocation(int number)
{
    failed = false;
    allocations_to_go = number;
}
failing_allocation::~failing_allocation() { allocations_to_go = 0; }
bool failing_allocation::happened() const { return failed; }

allocation_sizes::allocation_sizes() { written_down = &sizes_; }
allocation_sizes::~allocation_sizes() { written_down = nullptr; }
bool allocation_sizes::has(size_t bytes) const
{
    return std::find(sizes_.begin(), sizes_.end(), bytes) != sizes_.end();
}

cancellation_in_pattern::cancellation_in_pattern(int number) { patterns_to_go = number; }
cancellation_in_pattern::~cancellation_in_pattern() { patterns_to_go = 0; }
} // namespace qn::test
