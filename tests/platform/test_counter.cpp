// The counter: usable at any time, never going back, the same choice for everybody.
#include <cstdlib>
#include <cstring>
#include <sys/mount.h>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <qn_cu.h>

#include "platform/cu/clock_pair.h"
#include "platform/cu/counter.h"
#include "support/private_var.h"

namespace
{
qn_uint64_t counter()
{
    qn_uint64_t value = 0;
    cu_get_ctr_1(&value);
    return value;
}

// Runs before the constructors of the library, which have no priority.
qn_uint64_t counter_before_constructors = 0;
[[gnu::constructor(101)]] void read_early() { counter_before_constructors = counter(); }

TEST(Counter, IsStoredAtAnyAlignment)
{
    alignas(qn_uint64_t) unsigned char place[2 * sizeof(qn_uint64_t) + 1] = {};
    for (size_t offset = 0; offset <= sizeof(qn_uint64_t); ++offset) {
        const qn_uint64_t before = counter();
        cu_get_ctr_1(reinterpret_cast<qn_uint64_t *>(place + offset));
        qn_uint64_t stored = 0;
        std::memcpy(&stored, place + offset, sizeof stored);
        EXPECT_GE(stored, before);
        EXPECT_LE(stored, counter());
    }
}

TEST(Counter, CountsBeforeTheLibrarysConstructors)
{
    ASSERT_NE(counter_before_constructors, 0U);
    cu_timeinfo_t base;
    ASSERT_EQ(cu_get_procspeed_1(&base), 0);
    const qn_uint64_t later = counter();
    EXPECT_LT(counter_before_constructors, later);
    EXPECT_LT((later - counter_before_constructors) / base.timeinfo1, 600U) << "not the same counter";
}

TEST(Counter, NeverGoesBackInAThread)
{
    qn_uint64_t before = counter();
    for (int i = 0; i < 100'000; ++i) {
        const qn_uint64_t now = counter();
        ASSERT_LE(before, now);
        before = now;
    }
}

TEST(Counter, AThreadThatIsStartedLaterReadsLaterValues)
{
    const qn_uint64_t before = counter();
    qn_uint64_t inside = 0;
    std::thread([&] { inside = counter(); }).join();
    EXPECT_LE(before, inside);
    EXPECT_LE(inside, counter());
}

TEST(Counter, ThreadsAgreeOnItsSource)
{
    std::vector<qn::cu::counter_source> seen(4);
    std::vector<std::thread> threads;
    for (auto &source : seen)
        threads.emplace_back([&source] {
            counter();
            source = qn::cu::source_of_counter();
        });
    for (std::thread &thread : threads) thread.join();
    for (const auto source : seen) {
        EXPECT_NE(source, qn::cu::counter_source::undecided);
        EXPECT_EQ(source, seen[0]);
    }
}

TEST(Counter, IsTheMonotonicClockWhereTheTimeStampCounterIsNotTrusted)
{
    EXPECT_TRUE(qn::test::in_private_var([] {
        // An empty list of clock sources names no time-stamp counter.
        constexpr const char *clock_sources = "/sys/devices/system/clocksource";
        if (mount("tmpfs", clock_sources, "tmpfs", 0, nullptr) != 0) return false;
        return std::system(QN_MONOTONIC_COUNTER) == 0;
    }));
}

TEST(Counter, PairsOfCounterAndClockGrowTogether)
{
    qn::cu::clock_pair narrow, single;
    ASSERT_EQ(qn::cu::read_narrow_pair(CLOCK_MONOTONIC, &narrow), 0);
    ASSERT_EQ(qn::cu::read_pair(CLOCK_MONOTONIC, &single), 0);
    EXPECT_LE(narrow.counter, single.counter);
    EXPECT_LE(narrow.ns, single.ns);
}

TEST(Counter, AClockThatDoesNotExistIsReported)
{
    qn::cu::clock_pair pair;
    EXPECT_NE(qn::cu::read_pair(static_cast<clockid_t>(12345), &pair), 0);
    EXPECT_NE(qn::cu::read_narrow_pair(static_cast<clockid_t>(12345), &pair), 0);
}
} // namespace
