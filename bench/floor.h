// The least that a record can cost in this design: an uncontended recursive mutex, the counter, and a copy of the same
// number of bytes into an equally large mapped ring. No checks, no sequence numbers, no fillers.
#pragma once

#include <cstddef>
#include <pthread.h>

namespace qn::bench
{
class floor_ring
{
public:
    floor_ring(const char *file_name, size_t bytes);
    floor_ring(const floor_ring &) = delete;
    floor_ring &operator=(const floor_ring &) = delete;
    ~floor_ring();

    // `bytes` of `record`, with the counter in its bytes 20 to 27; a multiple of 4, from 28 on.
    void write(const void *record, size_t bytes);

private:
    pthread_mutex_t mutex_;
    unsigned char *map_ = nullptr;
    size_t size_;
    size_t next_ = 0;
};
} // namespace qn::bench
