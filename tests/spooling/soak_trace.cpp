#include "spooling/soak_trace.h"

#include <cstdlib>
#include <filesystem>

#include <gtest/gtest.h>
#include <sched.h>

#include "trace/trace.h"

namespace qn::test
{
soak_trace::soak_trace(uint32_t pages, uint32_t page_bytes, const std::string &destination)
    : spool_folder_(destination.empty() ? folder_ / "spool" : destination)
{
    std::filesystem::create_directory(live_folder());
    // Its presence keeps the library from the configuration file, and there is no specification in it.
    setenv("QN_TR_SPOOL", "none", 1);
    EXPECT_EQ(tr_set_size_1(page_bytes), 0);
    {
        const qn::tr::global_lock global;
        EXPECT_EQ(addSpoolCfgElement(spool_folder_.c_str(), "/soak\\.trc", pages, 1, 60, &anchors.pFirstSpoolSpec,
                                     &anchors.pLastSpoolSpec, 0, page_bytes),
                  0);
    }
    EXPECT_EQ(tr_set_filename_1(file().c_str()), 0);
    EXPECT_EQ(component_.register_now(), 0);
}

soak_trace::~soak_trace() { tr_term(); }

void wait_for_queue(int most)
{
    for (;; sched_yield()) {
        const qn::tr::mutex_lock queue(spq.mutex);
        if (spq.cnt <= most) return;
    }
}
} // namespace qn::test
