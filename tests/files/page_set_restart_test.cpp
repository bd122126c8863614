// A page set that is started again: which page is active, and what a damaged or foreign page becomes.
#include <gtest/gtest.h>

#include "files/page_set.h"

namespace
{
using namespace qn::test;

class StoppedPageSet : public PageSet
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(start_set("t", 3), 0);
        stop(head);
        debug_on();
    }

    // Makes a page of an older format of it: one free record from `ring` on.
    void age(int number, uint16_t version, uint32_t ring)
    {
        std::string image = file_bytes(file(number));
        std::memcpy(&image[2], &version, sizeof version);
        std::memcpy(&image[8], &ring, sizeof ring);
        std::memcpy(&image[44], &ring, sizeof ring);
        put_record(image, ring, static_cast<uint32_t>(image.size()) - ring, 0, 0);
        write_file(file(number), image);
    }

    std::string file(int number) const { return page(number)->fileName; }
    uint8_t state(int number) const { return trace_image::of_file(file(number)).u8(192); }
    bool says(int number, const std::string &reason) const
    {
        return system_log_has("\ttrace: reInit for " + file(number) + " due to " + reason + "\n");
    }
};

constexpr uint8_t active = 1;
constexpr uint8_t full = 2;
constexpr uint8_t ready = 4;
constexpr uint8_t being_spooled = 8;

TEST_F(StoppedPageSet, GoesOnInThePageThatWasActive)
{
    put<uint8_t>(file(1), 192, ready);
    put<uint8_t>(file(2), 192, active);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_TRUE(system_log_has("start_trace_page: found active page (" + file(2) + ")\n"));
    EXPECT_EQ(trace_image::of_file(file(2)).records_of(16).size(), 1U);
    EXPECT_EQ(trace_image::of_file(file(1)).records_of(16).size(), 1U) << "the one of the first start";
    write_ids(head, 2);
    EXPECT_EQ(ids_in(file(2)), (std::vector<uint32_t>{1, 2}));
}

TEST_F(StoppedPageSet, KeepsTheStateOfThePageThatWasActive)
{
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(state(1), active);
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(trace_image::of_file(file(1)).records_of(16).size(), 2U);
}

TEST_F(StoppedPageSet, KeepsFurtherBitsOfTheActivePage)
{
    put<uint8_t>(file(1), 192, ready);
    put<uint8_t>(file(3), 192, active | full);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(head->pActivePg, page(3));
    EXPECT_EQ(state(3), active | full);
}

TEST_F(StoppedPageSet, HasEveryOtherPageReady)
{
    put<uint8_t>(file(2), 192, full);
    put<uint8_t>(file(3), 192, being_spooled);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(state(1), active);
    EXPECT_EQ(state(2), ready);
    EXPECT_EQ(state(3), ready);
}

// The state is looked at before the ring: damage does not take the page's turn away.
TEST_F(StoppedPageSet, TakesADamagedPageForTheActiveOne)
{
    put<uint8_t>(file(1), 192, ready);
    put<uint8_t>(file(2), 192, active);
    put<uint32_t>(file(2), 44, 70000);
    ASSERT_EQ(start(head), 0);
    EXPECT_TRUE(says(2, "corruption 1"));
    EXPECT_EQ(head->pActivePg, page(2));
    EXPECT_EQ(state(2), active);
}

TEST_F(StoppedPageSet, MakesADamagedPageReadyThatWasNotActive)
{
    put<uint8_t>(file(2), 192, full);
    put<uint32_t>(file(2), 200, 0);
    ASSERT_EQ(start(head), 0);
    EXPECT_TRUE(says(2, "corruption 2"));
    EXPECT_EQ(state(2), ready);
    EXPECT_TRUE(trace_image::of_file(file(2)).records().empty());
}

// The state of a file that is not ours is not looked at.
TEST_F(StoppedPageSet, DoesNotTakeAForeignPageForTheActiveOne)
{
    put<uint8_t>(file(2), 192, active);
    put<uint16_t>(file(2), 2, 7);
    ASSERT_EQ(start(head), 0);
    EXPECT_TRUE(says(2, "size,version,program name"));
    EXPECT_EQ(head->pActivePg, head);
    EXPECT_EQ(state(2), ready);
}

TEST_F(StoppedPageSet, KeepsTheStateOfAPageOfVersionFour)
{
    put<uint16_t>(file(2), 2, 4);
    put<uint8_t>(file(2), 192, full);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(state(2), full);
}

// The state of a page is written whatever its version is, and must not lie in the ring.
TEST_F(StoppedPageSet, InitialisesAPageWhoseRingBeginsBeforeTheEndOfTheState)
{
    age(1, 4, 192);
    age(2, 4, 188);
    age(3, 3, 180);
    ASSERT_EQ(start(head), 0);
    for (int number = 1; number <= 3; ++number) {
        EXPECT_TRUE(says(number, "corruption 1")) << number;
        EXPECT_EQ(trace_image::of_file(file(number)).ring_offset(), 200U) << number;
    }
}

TEST_F(StoppedPageSet, ContinuesAPageWhoseRingBeginsBehindTheState)
{
    age(2, 4, 196);
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(trace_image::of_file(file(2)).ring_offset(), 196U);
    EXPECT_EQ(trace_image::of_file(file(2)).u16(2), 4);
}

TEST_F(StoppedPageSet, HasTheFlagsOfEachPageCleared)
{
    for (int number = 1; number <= 3; ++number) put<uint16_t>(file(number), 4, 0x8000);
    ASSERT_EQ(start(head), 0);
    for (int number = 1; number <= 3; ++number) EXPECT_EQ(trace_image::of_file(file(number)).u16(4), 0);
}

TEST_F(StoppedPageSet, IsNotMadeASecondTime)
{
    const trace_anchor_t *second = page(2);
    clear_system_log();
    ASSERT_EQ(start(head), 0);
    EXPECT_EQ(page(2), second);
    EXPECT_EQ(page(3)->nextPage, head);
    EXPECT_STREQ(head->fileName, (folder / "t.1.sp").c_str());
    EXPECT_FALSE(system_log_has("creating page '" + folder / "t.1.sp" + "'\n"));
}
} // namespace
