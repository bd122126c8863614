// Page sets of 2 to 8 pages, filled by four threads a thousand times over: with a spooler that keeps up, nothing is
// lost, doubled or out of order, wherever a page ends.
#include <gtest/gtest.h>

#include "spooling/soak_trace.h"

namespace
{
using namespace qn::test;

constexpr uint32_t writers = 4;
constexpr uint32_t records_each = SOAK_RECORDS / writers;

class SpoolSoak : public testing::TestWithParam<uint32_t>
{
};

TEST_P(SpoolSoak, FindsEveryRecordOnceAndInOrder)
{
    const uint32_t pages = GetParam();
    const soak_trace trace(pages);
    in_threads(writers, [=](uint32_t thread) {
        for (uint32_t number = 0; number < records_each; ++number) {
            wait_for_queue(static_cast<int>(pages) - 2);
            ASSERT_EQ(write_numbered({0, thread}, number), 0);
        }
    });
    wait_for_queue(0);

    const auto written = trace.pages();
    for (const page_file &page : written) ASSERT_EQ(overwritten_before(page, page.image()), 0U) << page.path;
    const auto numbers = numbers_in_pages(written);
    ASSERT_EQ(numbers.size(), writers);
    for (const auto &[author, found] : numbers) {
        ASSERT_EQ(found.size(), records_each) << "thread " << author.thread;
        for (uint32_t number = 0; number < records_each; ++number) ASSERT_EQ(found[number], number);
    }
}

INSTANTIATE_TEST_SUITE_P(Pages, SpoolSoak, testing::Range(2U, 9U));
} // namespace
