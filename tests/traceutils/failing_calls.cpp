#include "traceutils/failing_calls.h"

#include <set>

#include <regex.h>

namespace
{
int allocations_to_go = 0; // 0: none fails
int patterns_to_go = 0;
int matches_to_go = 0;
bool failed = false;
size_t last_bytes = 0;

// What was allocated here and not freed. A block from elsewhere may be freed here too.
std::set<void *> &live()
{
    static std::set<void *> blocks;
    return blocks;
}

bool fails(size_t bytes)
{
    last_bytes = bytes;
    if (allocations_to_go == 0 || --allocations_to_go != 0) return false;
    failed = true;
    return true;
}

template <typename pointer>
pointer *counted(pointer *block)
{
    if (block != nullptr) live().insert(block);
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
    if (block != nullptr) live().erase(block);
    return counted(__real_realloc(block, bytes));
}
char *__wrap_strdup(const char *text) { return fails(0) ? nullptr : counted(__real_strdup(text)); }
void __wrap_free(void *block)
{
    live().erase(block);
    __real_free(block);
}
int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    if (patterns_to_go != 0 && --patterns_to_go == 0) return REG_ESPACE;
    return __real_regcomp(regex, pattern, flags);
}
int __wrap_regexec(const regex_t *regex, const char *text, size_t count, regmatch_t *matches, int flags)
{
    if (matches_to_go != 0 && --matches_to_go == 0) {
        failed = true;
        return REG_ESPACE;
    }
    return __real_regexec(regex, text, count, matches, flags);
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

failing_pattern::failing_pattern(int number) { patterns_to_go = number; }
failing_pattern::~failing_pattern() { patterns_to_go = 0; }

failing_match::failing_match(int number)
{
    failed = false;
    matches_to_go = number;
}
failing_match::~failing_match() { matches_to_go = 0; }
bool failing_match::happened() const { return failed; }

size_t live_blocks() { return live().size(); }
size_t last_allocation() { return last_bytes; }
} // namespace qn::test
