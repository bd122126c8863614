// The least that a record can cost in this design: a recursive mutex, the counter, and a copy of the same number of bytes
// into an equally large mapped ring. No checks, no sequence numbers, no fillers.
#include "bench/producers/producer.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include <fcntl.h>
#include <pthread.h>
#include <qn_cu.h>
#include <sys/mman.h>
#include <unistd.h>

namespace
{
using namespace qn::bench;

// Length of the library's record of that kind.
template <kind K>
constexpr std::size_t record_bytes = K == kind::id          ? 32
                                     : K == kind::values    ? 52
                                     : K == kind::string    ? 76
                                     : K == kind::formatted ? 52
                                                            : 104;

class floor_ring
{
public:
    floor_ring(const std::string &file, std::size_t bytes) : size_(bytes)
    {
        pthread_mutexattr_t attributes;
        pthread_mutexattr_init(&attributes);
        pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
        pthread_mutex_init(&mutex_, &attributes);
        pthread_mutexattr_destroy(&attributes);

        const int fd = open(file.c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
        if (fd == -1 || posix_fallocate(fd, 0, static_cast<off_t>(size_)) != 0) fail();
        void *map = mmap(nullptr, size_, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
        if (map == MAP_FAILED) fail();
        close(fd);
        map_ = static_cast<unsigned char *>(map);
    }
    floor_ring(const floor_ring &) = delete;
    floor_ring &operator=(const floor_ring &) = delete;
    ~floor_ring() { munmap(map_, size_); }

    template <kind K>
    void write()
    {
        if constexpr (K == kind::disabled) {
            asm volatile("" ::: "memory");
        } else if constexpr (K == kind::id || K == kind::values) {
            copy<record_bytes<K>>(record_bytes<K>);
        } else {
            if constexpr (K == kind::formatted)
                std::snprintf(reinterpret_cast<char *>(record_) + 28, sizeof record_ - 28, format, first_number,
                              second_number);
            copy<0>(record_bytes<K>);
        }
    }

private:
    [[noreturn]] static void fail()
    {
        std::perror("floor");
        std::exit(1);
    }

    // A call, as a record of the library is. Whoever writes a string or a block learns its length when he is called.
    template <std::size_t known_bytes>
    [[gnu::noinline]] void copy(std::size_t bytes)
    {
        if constexpr (known_bytes != 0)
            bytes = known_bytes;
        else
            asm("" : "+r"(bytes)); // or the compiler sees them after all, and copies by a slow string instruction
        pthread_mutex_lock(&mutex_);
        if (next_ + bytes > size_) next_ = 0;
        unsigned char *place = map_ + next_;
        std::memcpy(place, record_, bytes);
        qn_uint64_t now = 0;
        cu_get_ctr_1(&now);
        std::memcpy(place + 20, &now, sizeof now);
        next_ += bytes;
        pthread_mutex_unlock(&mutex_);
    }

    pthread_mutex_t mutex_;
    unsigned char record_[256] = {};
    unsigned char *map_ = nullptr;
    std::size_t size_;
    std::size_t next_ = 0;
};

class floor_system
{
public:
    static void add_options(CLI::App &app, options &all)
    {
        app.add_option("--files", all.files, "rings that the threads are spread over");
    }

    explicit floor_system(const options &all) : several_(all.files > 1)
    {
        for (unsigned i = 0; i < all.files; ++i)
            rings_.push_back(std::make_unique<floor_ring>(all.folder + "/floor" + std::to_string(i), all.ring));
    }

    template <kind K>
    void write(unsigned thread)
    {
        rings_[several_ ? thread % rings_.size() : 0]->template write<K>();
    }

private:
    std::vector<std::unique_ptr<floor_ring>> rings_;
    bool several_;
};
} // namespace

int main(int argc, char **argv) { return produce<floor_system>(argc, argv); }
