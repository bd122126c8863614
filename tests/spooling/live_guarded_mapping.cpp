// Behind every file that the library maps, in the whole program, there is a stretch that cannot be read: whoever looks
// beyond the end of a page is caught.
#include <sys/mman.h>

namespace
{
constexpr size_t guard_bytes = 4096;
} // namespace

// Visible, because the linker looks at the shared libraries' calls too.
#pragma GCC visibility push(default)
extern "C" {
void *__real_mmap(void *address, size_t bytes, int protection, int flags, int fd, off_t offset);
void *__wrap_mmap(void *address, size_t bytes, int protection, int flags, int fd, off_t offset)
{
    if (fd == -1 || address != nullptr) return __real_mmap(address, bytes, protection, flags, fd, offset);
    void *place = __real_mmap(nullptr, bytes + guard_bytes, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (place == MAP_FAILED) return place;
    return __real_mmap(place, bytes, protection, flags | MAP_FIXED, fd, offset);
}
}
#pragma GCC visibility pop
