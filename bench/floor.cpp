#include "bench/floor.h"

#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <qn_cu.h>

namespace qn::bench
{
floor_ring::floor_ring(const char *file_name, size_t bytes) : size_(bytes)
{
    pthread_mutexattr_t attributes;
    pthread_mutexattr_init(&attributes);
    pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
    pthread_mutex_init(&mutex_, &attributes);
    pthread_mutexattr_destroy(&attributes);

    const int fd = open(file_name, O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    if (fd == -1 || posix_fallocate(fd, 0, static_cast<off_t>(bytes)) != 0) std::abort();
    void *map = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    if (map == MAP_FAILED) std::abort();
    close(fd);
    map_ = static_cast<unsigned char *>(map);
    std::memset(map_, 0xA5, bytes);
}

floor_ring::~floor_ring() { munmap(map_, size_); }

void floor_ring::write(const void *record, size_t bytes)
{
    pthread_mutex_lock(&mutex_);
    if (next_ + bytes > size_) next_ = 0;
    unsigned char *place = map_ + next_;
    std::memcpy(place, record, bytes);
    qn_uint64_t now = 0;
    cu_get_ctr_1(&now);
    std::memcpy(place + 20, &now, sizeof now);
    next_ += bytes;
    pthread_mutex_unlock(&mutex_);
}
} // namespace qn::bench
