// The memory of a fresh trace file: mapped by the start, not by the first records.
#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <fstream>

#include <sys/mman.h>

#include <gtest/gtest.h>

#include "files/support_files.h"

namespace
{
using namespace qn::test;

bool kernel_can_map_pages_for_writing()
{
    void *page = mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    const bool can = madvise(page, 4096, MADV_POPULATE_WRITE) == 0;
    munmap(page, 4096);
    return can;
}

// Bytes of the mapping at that address that are mapped to memory now; -1 when there is no such mapping.
int64_t resident_bytes(const void *address)
{
    std::ifstream maps("/proc/self/smaps");
    std::string line;
    bool found = false;
    while (std::getline(maps, line)) {
        uintptr_t first = 0;
        uintptr_t end = 0;
        if (std::sscanf(line.c_str(), "%" SCNxPTR "-%" SCNxPTR, &first, &end) == 2)
            found = first == reinterpret_cast<uintptr_t>(address);
        int64_t kibibytes = 0;
        if (found && std::sscanf(line.c_str(), "Rss: %" SCNd64, &kibibytes) == 1) return kibibytes * 1024;
    }
    return -1;
}

TEST(FreshFile, HasAllItsPagesMappedBeforeTheFirstRecord)
{
    if (!kernel_can_map_pages_for_writing()) GTEST_SKIP() << "this kernel has no MADV_POPULATE_WRITE";
    constexpr qn_uint32_t size = 4U << 20;
    const scratch folder;
    trace_anchor_t *anchor = anchor_for(folder / "f", size);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(resident_bytes(anchor->pMap), size);
    stop(anchor);
}
} // namespace
