// Which error records belong together, and how much of them is kept.
#include <gtest/gtest.h>

#include "tools/qntrace/errors/error_groups.h"

namespace qn::test
{
namespace
{

using dump::error_event;
using dump::error_grouping;
using dump::error_groups;
using dump::error_order;

std::vector<dump::trace_source> two_nodes()
{
    std::vector<dump::trace_source> sources(2);
    sources[0].host = "host1";
    sources[1].host = "host2";
    return sources;
}

error_event event(std::string message, std::optional<time_t> seconds = 1)
{
    error_event made;
    if (seconds) made.time = timespec{*seconds, 0};
    made.component = "IDX";
    made.default_message = message;
    made.message.text = std::move(message);
    return made;
}

struct groups_of_two_nodes {
    explicit groups_of_two_nodes(error_grouping by = error_grouping::message) : groups(sources, by) {}
    std::vector<std::string> messages(error_order order) const
    {
        std::vector<std::string> texts;
        for (const auto *group : groups.sorted(order, 0)) texts.push_back(group->latest.message.text);
        return texts;
    }

    std::vector<dump::trace_source> sources = two_nodes();
    error_groups groups;
};

TEST(ErrorGroups, ShowTheLatestOfTheirRecords)
{
    groups_of_two_nodes all;
    auto one = event("%d");
    one.message.text = "1";
    auto two = event("%d", 3);
    two.message.text = "2";
    auto three = event("%d", 2);
    three.message.text = "3";
    all.groups.add(one);
    all.groups.add(two);
    all.groups.add(three);
    const auto sorted = all.groups.sorted(error_order::count, 0);
    ASSERT_EQ(sorted.size(), 1U);
    EXPECT_EQ(sorted[0]->count, 3U);
    EXPECT_EQ(sorted[0]->latest.message.text, "2");
    EXPECT_EQ(sorted[0]->first->tv_sec, 1);
    EXPECT_EQ(sorted[0]->last->tv_sec, 3);
}

TEST(ErrorGroups, CountWhatHasNoTime)
{
    groups_of_two_nodes all;
    all.groups.add(event("a", 5));
    all.groups.add(event("a", std::nullopt));
    const auto sorted = all.groups.sorted(error_order::count, 0);
    ASSERT_EQ(sorted.size(), 1U);
    EXPECT_EQ(sorted[0]->count, 2U);
    EXPECT_EQ(sorted[0]->first->tv_sec, 5);
    EXPECT_TRUE(sorted[0]->latest.time);
}

TEST(ErrorGroups, DifferInEveryPartOfTheirIdentity)
{
    groups_of_two_nodes all;
    auto changed = event("a");
    all.groups.add(changed);
    changed.error_id = 1;
    all.groups.add(changed);
    changed.message_set = 1;
    all.groups.add(changed);
    changed.message_number = 1;
    all.groups.add(changed);
    changed.catalogue = "app.cat";
    all.groups.add(changed);
    changed.default_message = "b";
    all.groups.add(changed);
    EXPECT_EQ(all.groups.size(), 6U);
}

TEST(ErrorGroups, ComeLargestFirst)
{
    groups_of_two_nodes all;
    all.groups.add(event("late", 9));
    all.groups.add(event("often", 1));
    all.groups.add(event("often", 2));
    all.groups.add(event("early", 3));
    EXPECT_EQ(all.messages(error_order::count), (std::vector<std::string>{"often", "late", "early"}));
}

TEST(ErrorGroups, ComeLatestFirstWhenAskedFor)
{
    groups_of_two_nodes all;
    all.groups.add(event("often", 1));
    all.groups.add(event("often", 2));
    all.groups.add(event("late", 9));
    all.groups.add(event("early", 3));
    EXPECT_EQ(all.messages(error_order::last), (std::vector<std::string>{"late", "early", "often"}));
}

TEST(ErrorGroups, CountByNode)
{
    groups_of_two_nodes all;
    auto made = event("a");
    all.groups.add(made);
    made.source = 1;
    all.groups.add(made);
    all.groups.add(made);
    const auto sorted = all.groups.sorted(error_order::count, 0);
    ASSERT_EQ(sorted.size(), 1U);
    EXPECT_EQ(sorted[0]->nodes, (std::map<std::string, std::uint64_t>{{"host1", 1}, {"host2", 2}}));
}

TEST(ErrorGroups, OfANodeHoldAllItsMessages)
{
    groups_of_two_nodes all(error_grouping::node);
    auto made = event("a");
    all.groups.add(made);
    all.groups.add(event("b"));
    made.source = 1;
    all.groups.add(made);
    EXPECT_EQ(all.groups.size(), 2U);
}

TEST(ErrorGroups, OfAComponentHoldAllItsMessages)
{
    groups_of_two_nodes all(error_grouping::component);
    auto made = event("a");
    all.groups.add(made);
    all.groups.add(event("b"));
    made.component = "WALK";
    all.groups.add(made);
    EXPECT_EQ(all.groups.size(), 2U);
}

TEST(ErrorGroups, AreNoMoreThanTheirLimit)
{
    groups_of_two_nodes all;
    for (std::size_t i = 0; i < error_groups::most_groups + 3; ++i) all.groups.add(event(std::to_string(i)));
    all.groups.add(event("0"));
    EXPECT_EQ(all.groups.size(), error_groups::most_groups);
    EXPECT_EQ(all.groups.without_group(), 3U);
    EXPECT_EQ(all.groups.errors(), error_groups::most_groups + 4);
    EXPECT_EQ(all.groups.sorted(error_order::count, 1).at(0)->count, 2U);
}

TEST(ErrorGroups, SayHowMuchOfALongTextIsLeftOut)
{
    groups_of_two_nodes all;
    all.groups.add(event(std::string(error_groups::longest_text - 1, 'a') + "\xc3\xa9" + "bc"));
    EXPECT_EQ(all.groups.sorted(error_order::count, 0).at(0)->latest.message.text,
              std::string(error_groups::longest_text - 1, 'a') + "... [4 bytes more]");
}

} // namespace
} // namespace qn::test
