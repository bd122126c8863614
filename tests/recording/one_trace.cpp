#include "recording/one_trace.h"

#include <climits>
#include <cstdlib>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>

#include "trace/trace.h"

namespace qn::test
{
one_trace::one_trace(uint32_t file_bytes) : file_(folder_ / "app.trc")
{
    setenv("QN_TR_SIZE", std::to_string(file_bytes).c_str(), 1);
    EXPECT_EQ(tr_set_filename_1(file_.c_str()), 0);
    EXPECT_EQ(component_.register_now(), 0);
}

std::vector<record_image> one_trace::written() const
{
    std::vector<record_image> records = image().records();
    std::erase_if(records, [](const record_image &record) { return record.component() == "____"; });
    return records;
}

record_image one_trace::only_record() const
{
    const auto records = written();
    EXPECT_EQ(records.size(), 1U);
    return records.empty() ? record_image{0, std::string(128, '\0')} : records.back();
}

tr_file_token_t start_another(const std::string &file, uint32_t file_bytes)
{
    trace_anchor_t *anchor = findOrCreateAnchorForFile(file.c_str(), 1);
    EXPECT_NE(anchor, nullptr);
    if (anchor == nullptr) return nullptr;
    anchor->uRequestedFileSize = file_bytes;
    EXPECT_EQ(qn::tr::start_trace_locked(anchor), 0);
    return anchor;
}

tail_reader::tail_reader(const std::string &file)
{
    const int fd = open(file.c_str(), O_RDWR | O_CLOEXEC);
    struct stat status {
    };
    EXPECT_EQ(fstat(fd, &status), 0) << file;
    size_ = static_cast<size_t>(status.st_size);
    void *map = mmap(nullptr, size_, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    if (map == MAP_FAILED) std::abort();
    map_ = static_cast<char *>(map);
    close(fd);
}

tail_reader::~tail_reader() { munmap(map_, size_); }

uint32_t tail_reader::u32(size_t at) const
{
    return __atomic_load_n(reinterpret_cast<const uint32_t *>(map_ + at), __ATOMIC_SEQ_CST);
}

uint16_t tail_reader::u16(size_t at) const
{
    return __atomic_load_n(reinterpret_cast<const uint16_t *>(map_ + at), __ATOMIC_SEQ_CST);
}

void tail_reader::set_u32(size_t at, uint32_t value)
{
    __atomic_store_n(reinterpret_cast<uint32_t *>(map_ + at), value, __ATOMIC_SEQ_CST);
}

unlockable::unlockable(pthread_mutex_t &mutex) : mutex_(mutex)
{
    EXPECT_EQ(pthread_mutex_lock(&mutex_), 0);
    mutex_.__data.__count = UINT_MAX;
}

unlockable::~unlockable()
{
    mutex_.__data.__count = 1;
    pthread_mutex_unlock(&mutex_);
}

bool is_free(pthread_mutex_t &mutex)
{
    bool locked = false;
    std::thread([&] {
        locked = pthread_mutex_trylock(&mutex) == 0;
        if (locked) pthread_mutex_unlock(&mutex);
    }).join();
    return locked;
}
} // namespace qn::test
