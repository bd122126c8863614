// The end of a page's mapping: nothing behind it can be read (live_guarded_mapping.cpp).
#include <gtest/gtest.h>

#include "spooling/soak_trace.h"
#include "trace/trace.h"

namespace
{
using namespace qn::test;

constexpr size_t page_bytes = soak_trace::usual_page_bytes;

TEST(PageEnd, IsNotReadBeyondByTheRecordBehindOneThatFillsThePage)
{
    const soak_trace trace(2);
    // Behind the header and the start record, records of 40 and of 32 bytes; the last one takes the 28 bytes too that
    // are too few for another.
    constexpr size_t room = page_bytes - 200 - 52;
    static_assert((room - 40 - (32 + 28)) % 32 == 0);
    ASSERT_EQ(tr_record_values_32_1("END", 0, 1, 0), 0);
    for (size_t i = 0; i < (room - 40 - 28) / 32; ++i) ASSERT_EQ(tr_record_id_1("END", 1), 0);
    ASSERT_EQ(reinterpret_cast<unsigned char *>(anchors.pNextFree), anchors.pMapEnd);

    EXPECT_EQ(tr_record_id_1("END", 2), 0);
    EXPECT_EQ(anchors.pActivePg, anchors.nextPage);
    const auto records = trace_image::of_file(trace.live_folder() + "/soak.trc.2.sp").records();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].u32(28), 2U);
}
} // namespace
