// A signal handler that traces, run behind every single instruction of the calls it interrupts: the processor traps after
// each of them. A record is written whole or refused, which the handler is told; the interrupted call's record is there.
#include <csignal>
#include <cstdlib>

#include <x86intrin.h>

#include <gtest/gtest.h>

#include "faults/campaign.h"
#include "recording/numbered_records.h"
#include "recording/one_trace.h"

namespace
{
using namespace qn::test;

constexpr unsigned long long trap_flag = 0x100;
constexpr uint32_t roomy_file = 16 * 1024 * 1024;
constexpr qn_int32_t refused = 9;

volatile uint32_t interruptions = 0;
volatile uint32_t handler_written = 0;
volatile uint32_t handler_refused = 0;
volatile uint32_t handler_failed = 0;

void trace_in_handler(int)
{
    interruptions = interruptions + 1;
    const qn_int32_t status = tr_record_id_1("HAND", handler_written);
    if (status == 0)
        handler_written = handler_written + 1;
    else if (status == refused)
        handler_refused = handler_refused + 1;
    else
        handler_failed = handler_failed + 1;
}

template <class Body>
void interrupt_everywhere(Body body)
{
    __writeeflags(__readeflags() | trap_flag);
    body();
    __writeeflags(__readeflags() & ~trap_flag);
}

class TracingSignalHandler : public testing::Test
{
protected:
    void SetUp() override { std::signal(SIGTRAP, trace_in_handler); }
    void TearDown() override
    {
        EXPECT_EQ(handler_failed, 0U);
        EXPECT_GT(handler_refused, 0U);
        uint32_t next = 0;
        for (const record_image &record : trace.image().ring())
            if (record.component() == "HAND" && record.is_data()) {
                ASSERT_EQ(record.u32(28), next) << "at " << record.offset;
                ++next;
            }
        EXPECT_EQ(next, handler_written);
        count("Signal handlers that trace", "rounds", 1);
        count("Signal handlers that trace", "faults", interruptions);
    }

    one_trace trace{roomy_file};
};

volatile uint32_t pair[2] = {0, 0};
volatile uint32_t torn = 0;

void look_at_pair(int)
{
    if (pair[0] != pair[1]) torn = torn + 1;
}

// The one instruction between two stores is enough to be seen behind.
TEST(PlantedTear, OfAPairOfWordsIsSeen)
{
    std::signal(SIGTRAP, look_at_pair);
    interrupt_everywhere([] {
        pair[0] = 1;
        pair[1] = 1;
    });
    EXPECT_GT(torn, 0U);
    count("Planted harm is found", "rounds", 1);
}

TEST_F(TracingSignalHandler, TearsAndLosesNoRecordOfAnyWriter)
{
    constexpr record_author author = {1, 0};
    const uint32_t records = rounds(7, 140);
    qn_int32_t status = 0;
    for (uint32_t number = 0; number < records; ++number)
        interrupt_everywhere([&] { status |= write_numbered(author, number); });
    EXPECT_EQ(status, 0);
    const auto numbers = numbers_in(trace.image().ring());
    ASSERT_TRUE(numbers.contains(author));
    ASSERT_EQ(numbers.at(author).size(), records);
    for (uint32_t i = 0; i < records; ++i) EXPECT_EQ(numbers.at(author)[i], i);
    EXPECT_GT(handler_written, records);
}

TEST_F(TracingSignalHandler, MayInterruptTheOtherCalls)
{
    client component("CTRL", 2);
    for (uint32_t round = 0; round < rounds(1, 10); ++round)
        interrupt_everywhere([&] {
            char name[4096];
            qn_uint32_t size = 0;
            int count = 0;
            tr_mini_component_anchor_t *levels = nullptr;
            tr_mini_spooling_anchor_t *spooling = nullptr;
            qn_int32_t status = component.register_now() | tr_get_filename_1(name) | tr_get_size_1(&size);
            status |= tr_get_current_trace_levels_1(&count, &levels);
            tr_release_comp_info_1(count, levels);
            status |= tr_get_current_spooling_status_1(&count, &spooling);
            tr_release_spool_info_1(count, spooling);
            status |= tr_unregister_component_1("CTRL");
            if (status != 0) std::abort();
        });
}
} // namespace
