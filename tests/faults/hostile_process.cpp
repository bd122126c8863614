#include "faults/hostile_process.h"

#include <array>
#include <csignal>
#include <cstdint>
#include <random>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace
{
using namespace qn::test;

// Offsets of the file format.
constexpr uint32_t header_bytes = 200;
constexpr uint32_t record_header_bytes = 28;
constexpr uint32_t seq_lock = 12;
constexpr uint32_t tail_request = 16;
constexpr uint32_t oldest_offset = 44;
constexpr uint32_t length_of_record = 0;
constexpr uint32_t sequence_of_record = 8;

constexpr int stores_a_mapping = 500;

class attacker
{
public:
    explicit attacker(const std::string &file)
    {
        const int fd = open(file.c_str(), O_RDWR | O_CLOEXEC);
        struct stat status {
        };
        if (fd == -1) return;
        if (fstat(fd, &status) == 0 && status.st_size > header_bytes + record_header_bytes) {
            void *map = mmap(nullptr, static_cast<size_t>(status.st_size), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
            if (map != MAP_FAILED) {
                map_ = static_cast<char *>(map);
                size_ = static_cast<uint32_t>(status.st_size);
            }
        }
        close(fd);
    }
    attacker(const attacker &) = delete;
    attacker &operator=(const attacker &) = delete;
    ~attacker()
    {
        if (map_ != nullptr) munmap(map_, size_);
    }

    void attack(hostility how, std::mt19937 &random)
    {
        if (map_ == nullptr) return;
        for (int i = 0; i < stores_a_mapping; ++i) {
            const auto now = how != hostility::everything ? how : static_cast<hostility>(random() % 3);
            switch (now) {
            case hostility::header_words: set(static_cast<uint32_t>(random() % 50) * 4, value(random)); break;
            case hostility::held_records: hold(random); break;
            default: damage_record(random); break;
            }
        }
    }

private:
    uint32_t get(uint32_t at) const
    {
        return __atomic_load_n(reinterpret_cast<const uint32_t *>(map_ + at), __ATOMIC_RELAXED);
    }
    void set(uint32_t at, uint32_t value)
    {
        __atomic_store_n(reinterpret_cast<uint32_t *>(map_ + at), value, __ATOMIC_RELAXED);
    }

    uint32_t value(std::mt19937 &random) const
    {
        const std::array<uint32_t, 20> edges = {
            0,    1,          3,          4,         27,    28,        29,         32,         200,        4095,
            4096, size_ - 29, size_ - 28, size_ - 4, size_, size_ + 4, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFC, 0xFFFFFFFF};
        return random() % 4 == 0 ? static_cast<uint32_t>(random()) : edges[random() % edges.size()];
    }

    // Where a record header fits: the next one to be overwritten, or anywhere.
    uint32_t record(std::mt19937 &random) const
    {
        const uint32_t oldest = get(oldest_offset) & ~3U;
        const bool fits = oldest >= header_bytes && oldest <= size_ - record_header_bytes;
        if (fits && random() % 2 == 0) return oldest;
        return header_bytes + static_cast<uint32_t>(random() % ((size_ - header_bytes - record_header_bytes) / 4)) * 4;
    }

    void hold(std::mt19937 &random)
    {
        set(seq_lock, get(record(random) + sequence_of_record));
        if (random() % 8 == 0) set(tail_request, value(random));
    }

    void damage_record(std::mt19937 &random)
    {
        const uint32_t at = record(random);
        set(at + (random() % 2 == 0 ? length_of_record : static_cast<uint32_t>(random() % 3) * 4), value(random));
    }

    char *map_ = nullptr;
    uint32_t size_ = 0;
};
} // namespace

namespace qn::test
{
hostile_process::hostile_process(const std::vector<std::string> &files, hostility how) : process_(fork())
{
    if (process_ != 0) return;
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    std::mt19937 random(static_cast<uint32_t>(getpid()));
    for (;;)
        for (const std::string &file : files) attacker(file).attack(how, random);
}

hostile_process::~hostile_process()
{
    kill(process_, SIGKILL);
    waitpid(process_, nullptr, 0);
}
} // namespace qn::test
