#include "support/failing_memory.h"

#include <algorithm>
#include <mutex>
#include <set>

#include <pthread.h>
#include <regex.h>

namespace
{
// How many calls it takes until the one that is meant; 0: none is.
thread_local int allocations_to_go = 0;
thread_local int failing_patterns_to_go = 0;
thread_local int cancelled_patterns_to_go = 0;
thread_local int matches_to_go = 0;

thread_local bool failed = false;
thread_local size_t last_bytes = 0;
thread_local std::vector<size_t> *written_down = nullptr;

bool is_meant(int &to_go) { return to_go != 0 && --to_go == 0; }

// What was allocated here and not freed, by all threads. It outlives the exit handlers, which free too.
std::mutex guard;
std::set<void *> &live()
{
    static auto *const blocks = new std::set<void *>;
    return *blocks;
}

// A block from elsewhere may be freed here.
void forget(void *block)
{
    const std::lock_guard lock(guard);
    live().erase(block);
}

bool fails(size_t bytes)
{
    last_bytes = bytes;
    if (written_down != nullptr) {
        auto *list = written_down;
        written_down = nullptr; // the list allocates too
        list->push_back(bytes);
        written_down = list;
    }
    if (!is_meant(allocations_to_go)) return false;
    failed = true;
    return true;
}

template <typename pointer>
pointer *counted(pointer *block)
{
    if (block == nullptr) return block;
    const std::lock_guard lock(guard);
    live().insert(block);
    return block;
}
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
void *__real_calloc(size_t count, size_t bytes);
void *__real_malloc(size_t bytes);
void *__real_realloc(void *block, size_t bytes);
char *__real_strdup(const char *text);
char *__real_strndup(const char *text, size_t bytes);
void __real_free(void *block);
int __real_regcomp(regex_t *regex, const char *pattern, int flags);
int __real_regexec(const regex_t *regex, const char *text, size_t count, regmatch_t *matches, int flags);

void *__wrap_calloc(size_t count, size_t bytes)
{
    return fails(count * bytes) ? nullptr : counted(__real_calloc(count, bytes));
}
void *__wrap_malloc(size_t bytes) { return fails(bytes) ? nullptr : counted(__real_malloc(bytes)); }
void *__wrap_realloc(void *block, size_t bytes)
{
    if (fails(bytes)) return nullptr;
    if (block != nullptr) forget(block);
    return counted(__real_realloc(block, bytes));
}
char *__wrap_strdup(const char *text) { return fails(0) ? nullptr : counted(__real_strdup(text)); }
char *__wrap_strndup(const char *text, size_t bytes)
{
    return fails(0) ? nullptr : counted(__real_strndup(text, bytes));
}
void __wrap_free(void *block)
{
    forget(block);
    __real_free(block);
}
int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    if (is_meant(cancelled_patterns_to_go)) pthread_testcancel();
    if (is_meant(failing_patterns_to_go)) return REG_ESPACE;
    return __real_regcomp(regex, pattern, flags);
}
int __wrap_regexec(const regex_t *regex, const char *text, size_t count, regmatch_t *matches, int flags)
{
    if (!is_meant(matches_to_go)) return __real_regexec(regex, text, count, matches, flags);
    failed = true;
    return REG_ESPACE;
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

size_t live_blocks()
{
    const std::lock_guard lock(guard);
    return live().size();
}
size_t last_allocation() { return last_bytes; }

failing_pattern::failing_pattern(int number) { failing_patterns_to_go = number; }
failing_pattern::~failing_pattern() { failing_patterns_to_go = 0; }

cancellation_in_pattern::cancellation_in_pattern(int number) { cancelled_patterns_to_go = number; }
cancellation_in_pattern::~cancellation_in_pattern() { cancelled_patterns_to_go = 0; }

failing_match::failing_match(int number)
{
    failed = false;
    matches_to_go = number;
}
failing_match::~failing_match() { matches_to_go = 0; }
bool failing_match::happened() const { return failed; }
} // namespace qn::test
