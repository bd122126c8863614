// What a report keeps of a trace: the limits, and what is left out beyond them.
#include <gtest/gtest.h>

#include "tools/qntrace/report/component_rates.h"
#include "tools/qntrace/report/loss_marks.h"
#include "tools/qntrace/report/timeline.h"

namespace qn::test
{
namespace
{

using dump::timeline;

void add(timeline &to, std::uint32_t thread, std::int64_t from, std::int64_t count, bool errors = false)
{
    for (std::int64_t i = from; i < from + count; ++i)
        to.add(0, thread, errors, [i] { return dump::timeline_record{i, 0, 0, {}}; });
}

std::vector<std::int64_t> times_of(const dump::thinned_records &records)
{
    std::vector<std::int64_t> times;
    for (const auto &kept : records.kept()) times.push_back(kept.record.time_ns);
    return times;
}

TEST(Timeline, KeepsAllRecordsUpToItsLimit)
{
    timeline all({.records = 10, .errors = 5, .rows = 5});
    add(all, 1, 0, 10);
    EXPECT_EQ(all.shown(), 10U);
    EXPECT_EQ(times_of(all.sorted().at(0)->usual).size(), 10U);
}

TEST(Timeline, KeepsEverySecondRecordBeyondItsLimit)
{
    timeline all({.records = 10, .errors = 5, .rows = 5});
    add(all, 1, 0, 15);
    EXPECT_EQ(times_of(all.sorted().at(0)->usual), (std::vector<std::int64_t>{0, 2, 4, 6, 8, 10, 12, 14}));
    EXPECT_EQ(all.records(), 15U);
}

TEST(Timeline, LeavesAThreadThatSaysLittleWhole)
{
    timeline all({.records = 100, .errors = 5, .rows = 5});
    add(all, 1, 0, 5);
    add(all, 2, 5, 10'000);
    EXPECT_EQ(times_of(all.sorted().at(0)->usual), (std::vector<std::int64_t>{0, 1, 2, 3, 4}));
    EXPECT_LE(all.shown(), 100U);
    EXPECT_GE(all.shown(), 50U);
}

TEST(Timeline, NeverHoldsMoreThanItsLimit)
{
    timeline all({.records = 100, .errors = 10, .rows = 20});
    for (int round = 0; round < 1000; ++round) {
        for (std::uint32_t thread = 0; thread < 30; ++thread) add(all, thread, round, 1, thread % 7 == 0);
        ASSERT_LE(all.shown(), 110U);
    }
    EXPECT_EQ(all.records(), 30'000U);
}

TEST(Timeline, KeepsErrorsBesideTheOthers)
{
    timeline all({.records = 10, .errors = 50, .rows = 5});
    add(all, 1, 0, 1000);
    add(all, 1, 0, 50, true);
    EXPECT_EQ(all.sorted().at(0)->errors.kept().size(), 50U);
    EXPECT_EQ(all.errors_left_out(), 0U);
    add(all, 1, 50, 1, true);
    EXPECT_EQ(all.errors_left_out(), 25U);
}

TEST(Timeline, PutsThreadsThatHaveNoRoomIntoOneRow)
{
    timeline all({.records = 100, .errors = 5, .rows = 2});
    for (std::uint32_t thread = 9; thread > 4; --thread) add(all, thread, 0, 1);
    const auto rows = all.sorted();
    ASSERT_EQ(rows.size(), 3U);
    EXPECT_EQ(rows[0]->thread, 8U);
    EXPECT_EQ(rows[1]->thread, 9U);
    EXPECT_TRUE(rows[2]->all_others);
    EXPECT_EQ(rows[2]->records(), 3U);
}

TEST(ComponentRates, CountComponentsThatHaveNoRoomTogether)
{
    dump::component_rates rates;
    for (int i = 0; i < 70; ++i) rates.add(rates.index_of(std::to_string(i)), 10, i);
    rates.finish();
    ASSERT_EQ(rates.components().size(), dump::component_rates::most_components + 1);
    EXPECT_EQ(rates.components().back().name, "(other)");
    EXPECT_EQ(rates.components().back().records, 6U);
    EXPECT_EQ(rates.components().back().bytes, 60U);
}

TEST(ComponentRates, HaveBucketsOfOneWidth)
{
    dump::component_rates rates;
    const auto often = rates.index_of("A");
    const auto once = rates.index_of("B");
    for (std::int64_t i = 0; i < 100'000; ++i) rates.add(often, 1, i * 1'000'000);
    rates.add(once, 1, 5);
    rates.finish();
    EXPECT_EQ(rates.all().width(), 100'000'000);
    EXPECT_EQ(rates.components()[once].buckets.width(), rates.all().width());
    EXPECT_EQ(rates.components()[often].buckets.width(), rates.all().width());
}

TEST(LossMarks, ReachFromTheRecordBeforeToTheOneBehind)
{
    dump::loss_marks marks(1);
    dump::losses lost;
    marks.pass(0, lost, 100);
    lost.missing = 3;
    marks.pass(0, lost, 200);
    ASSERT_EQ(marks.marks().size(), 1U);
    EXPECT_EQ(marks.marks()[0].count, 3U);
    EXPECT_EQ(marks.marks()[0].from_ns, 100);
    EXPECT_EQ(marks.marks()[0].to_ns, 200);
}

TEST(LossMarks, StandAtTheLastRecordForWhatTheEndOfAFileTells)
{
    dump::loss_marks marks(1);
    dump::losses lost;
    marks.pass(0, lost, 100);
    lost.unfinished = 1;
    marks.finish(0, lost);
    ASSERT_EQ(marks.marks().size(), 1U);
    EXPECT_EQ(marks.marks()[0].to_ns, 100);
}

TEST(LossMarks, AreCountedWhereThereIsNoTime)
{
    dump::loss_marks marks(1);
    dump::losses lost;
    lost.missing = 7;
    marks.finish(0, lost);
    EXPECT_TRUE(marks.marks().empty());
    EXPECT_EQ(marks.not_marked(), 7U);
}

TEST(LossMarks, AreNoMoreThanTheirLimit)
{
    dump::loss_marks marks(1);
    dump::losses lost;
    for (std::size_t i = 0; i < dump::loss_marks::most_marks + 2; ++i) {
        ++lost.missing;
        marks.pass(0, lost, static_cast<std::int64_t>(i));
    }
    EXPECT_EQ(marks.marks().size(), dump::loss_marks::most_marks);
    EXPECT_EQ(marks.not_marked(), 2U);
}

} // namespace
} // namespace qn::test
