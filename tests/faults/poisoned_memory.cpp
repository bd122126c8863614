#include "faults/poisoned_memory.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstring>
#include <malloc.h>

namespace
{
using pattern = std::array<unsigned char, 8>;
constexpr pattern patterns[] = {{0x5A, 0xC3, 0x96, 0xE1, 0xB7, 0x8D, 0xD2, 0xF4},
                                {0xA5, 0x3C, 0x69, 0x1E, 0x48, 0x72, 0x2D, 0x0B}};

constinit std::atomic<const pattern *> in_use{nullptr};

void fill(void *memory, size_t bytes)
{
    const pattern *with = in_use.load(std::memory_order_relaxed);
    if (with == nullptr || memory == nullptr) return;
    auto *place = static_cast<unsigned char *>(memory);
    for (; bytes >= with->size(); place += with->size(), bytes -= with->size())
        std::memcpy(place, with->data(), with->size());
    std::memcpy(place, with->data(), bytes);
}

void *filled(void *block)
{
    if (block != nullptr) fill(block, malloc_usable_size(block));
    return block;
}

// Deep enough for everything that the library calls.
[[gnu::noinline]] void fill_stack()
{
    unsigned char below[128 * 1024];
    fill(below, sizeof below);
    asm volatile("" : : "r"(below) : "memory");
}

[[gnu::noinline]] void fill_registers()
{
    const pattern *with = in_use.load(std::memory_order_relaxed);
    if (with == nullptr) return;
    unsigned char twice[16];
    fill(twice, sizeof twice);
    asm volatile("movdqu %0, %%xmm0\n\tmovdqa %%xmm0, %%xmm1\n\tmovdqa %%xmm0, %%xmm2\n\tmovdqa %%xmm0, %%xmm3\n\t"
                 "movdqa %%xmm0, %%xmm4\n\tmovdqa %%xmm0, %%xmm5\n\tmovdqa %%xmm0, %%xmm6\n\tmovdqa %%xmm0, %%xmm7\n\t"
                 "movdqa %%xmm0, %%xmm8\n\tmovdqa %%xmm0, %%xmm9\n\tmovdqa %%xmm0, %%xmm10\n\t"
                 "movdqa %%xmm0, %%xmm11\n\tmovdqa %%xmm0, %%xmm12\n\tmovdqa %%xmm0, %%xmm13\n\t"
                 "movdqa %%xmm0, %%xmm14\n\tmovdqa %%xmm0, %%xmm15"
                 :
                 : "m"(twice)
                 : "xmm0", "xmm1", "xmm2", "xmm3", "xmm4", "xmm5", "xmm6", "xmm7", "xmm8", "xmm9", "xmm10", "xmm11",
                   "xmm12", "xmm13", "xmm14", "xmm15");
}
} // namespace

#pragma GCC visibility push(default)
extern "C" {
void *__libc_malloc(size_t bytes);
void *__libc_realloc(void *block, size_t bytes);
void *__libc_memalign(size_t alignment, size_t bytes);
void __libc_free(void *block);

void *malloc(size_t bytes) { return filled(__libc_malloc(bytes)); }
void *realloc(void *block, size_t bytes)
{
    const size_t before = block != nullptr ? malloc_usable_size(block) : 0;
    auto *moved = static_cast<char *>(__libc_realloc(block, bytes));
    const size_t behind = moved != nullptr ? malloc_usable_size(moved) : 0;
    if (behind > before) fill(moved + before, behind - before);
    return moved;
}
void *memalign(size_t alignment, size_t bytes) { return filled(__libc_memalign(alignment, bytes)); }
void *aligned_alloc(size_t alignment, size_t bytes) { return memalign(alignment, bytes); }
int posix_memalign(void **block, size_t alignment, size_t bytes)
{
    *block = memalign(alignment, bytes);
    return *block == nullptr ? ENOMEM : 0;
}
void free(void *block)
{
    if (block == nullptr) return;
    filled(block);
    __libc_free(block);
}
}
#pragma GCC visibility pop

namespace qn::test
{
void poison_memory(poison with) { in_use = &patterns[with == poison::one ? 0 : 1]; }

void with_poisoned_stack(const std::function<void()> &call)
{
    fill_stack();
    fill_registers();
    call();
}

size_t find_poison(std::string_view bytes)
{
    constexpr size_t in_a_row = 3;
    size_t found = std::string_view::npos;
    for (const pattern &one : patterns) {
        for (size_t phase = 0; phase < one.size(); ++phase) {
            char piece[in_a_row];
            for (size_t i = 0; i < in_a_row; ++i) piece[i] = static_cast<char>(one[(phase + i) % one.size()]);
            found = std::min(found, bytes.find({piece, in_a_row}));
        }
    }
    return found;
}

std::string_view poison_pattern()
{
    const pattern *with = in_use.load();
    return {reinterpret_cast<const char *>(with->data()), with->size()};
}
} // namespace qn::test
