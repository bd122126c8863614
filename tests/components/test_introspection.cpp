// Snapshots of the registered components.
#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "support/failing_memory.h"

namespace
{
using namespace qn::test;

struct snapshot {
    int status = 0;
    int count = -77;
    tr_mini_component_anchor_t *components = nullptr;

    snapshot() { status = tr_get_current_trace_levels_1(&count, &components); }
    snapshot(const snapshot &) = delete;
    snapshot &operator=(const snapshot &) = delete;
    ~snapshot()
    {
        if (count > 0)
            tr_release_comp_info_1(count, components);
        else
            std::free(components); // releasing a count of 0 frees nothing
    }
};

levels levels_of(const tr_mini_component_anchor_t &component)
{
    return {component.pDetailLevels, component.pDetailLevels + component.numberOfCategories};
}

TEST(Snapshot, IsEmptyWithoutComponents)
{
    const snapshot taken;
    EXPECT_EQ(taken.status, 0);
    EXPECT_EQ(taken.count, 0);
    tr_release_comp_info_1(0, taken.components);
}

TEST(Snapshot, HoldsTheCategoriesAndCurrentLevels)
{
    client made = client_with("ABCDE", {{2, "Errors", 1, 10}, {0, "Flow", 2, 20}, {1, "x", 3, 30}});
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(tr_set_trace_levels_1("*:Flow=99"), 0);
    const snapshot taken;
    ASSERT_EQ(taken.status, 0);
    ASSERT_EQ(taken.count, 1);
    const tr_mini_component_anchor_t &copy = taken.components[0];
    EXPECT_STREQ(copy.compId, "ABCD");
    ASSERT_EQ(copy.numberOfCategories, 3);
    EXPECT_EQ(levels_of(copy), (levels{99, 20, 30}));
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(copy.categories[i].category_id, made.categories[i].category_id);
        EXPECT_STREQ(copy.categories[i].category_name, made.categories[i].category_name);
        EXPECT_NE(copy.categories[i].category_name, registered("ABCD")->categories[i].category_name);
    }
}

TEST(Snapshot, ListsTheNewestComponentFirst)
{
    client a("A");
    client b("B", 2);
    client c("C", 3);
    for (client *each : {&a, &b, &c}) ASSERT_EQ(each->register_now(), 0);
    const snapshot taken;
    ASSERT_EQ(taken.count, 3);
    EXPECT_STREQ(taken.components[0].compId, "C");
    EXPECT_EQ(taken.components[0].numberOfCategories, 3);
    EXPECT_STREQ(taken.components[1].compId, "B");
    EXPECT_STREQ(taken.components[2].compId, "A");
}

TEST(Snapshot, KeepsTheLevelsOfItsMoment)
{
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    const snapshot taken;
    ASSERT_EQ(tr_set_trace_levels_1("*:*=9"), 0);
    EXPECT_EQ(levels_of(taken.components[0]), (levels{1, 1}));
}

TEST(Snapshot, OutlivesTheComponent)
{
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    const snapshot taken;
    ASSERT_EQ(tr_unregister_component_1("AB"), 0);
    EXPECT_STREQ(taken.components[0].categories[1].category_name, "c1");
    EXPECT_EQ(levels_of(taken.components[0]), (levels{1, 1}));
}

TEST(Snapshot, LeavesTheErrorRecordAloneAndTheMutexFree)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    leave_marker();
    const snapshot taken;
    EXPECT_EQ(taken.status, 0);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(Snapshot, ReleasesNothingForNoArrayOrNoComponents)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    const snapshot taken;
    tr_release_comp_info_1(1, nullptr);
    tr_release_comp_info_1(0, taken.components);
    EXPECT_STREQ(taken.components[0].compId, "AB");
}

TEST(Snapshot, ReleasesARecordWithoutLevels)
{
    auto *record = static_cast<tr_mini_component_anchor_t *>(std::calloc(1, sizeof(tr_mini_component_anchor_t)));
    tr_release_comp_info_1(1, record);
}

TEST(Snapshot, KeepsTheGlobalMutexWhenTheArrayCannotBeAllocated)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    leave_marker();
    int count = -77;
    tr_mini_component_anchor_t place{};
    tr_mini_component_anchor_t *components = &place;
    int status = 0;
    {
        const failing_allocation out_of_memory(1);
        status = tr_get_current_trace_levels_1(&count, &components);
    }
    EXPECT_EQ(status, -1);
    EXPECT_EQ(components, nullptr);
    EXPECT_EQ(count, -77) << "the count is stored after the array";
    EXPECT_FALSE(free_for_others(anchors.anchorMutex));
    unlockGlobalMutex();
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_TRUE(marker_is_there());
}

TEST(Snapshot, KeepsTheGlobalMutexWhicheverCopyCannotBeAllocated)
{
    client made("AB", 2);
    client other("CD", 1);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(other.register_now(), 0);
    leave_marker();
    int number = 2;
    for (bool failed = true; failed; ++number) {
        int count = -77;
        tr_mini_component_anchor_t *components = nullptr;
        int status = 0;
        {
            const failing_allocation out_of_memory(number);
            status = tr_get_current_trace_levels_1(&count, &components);
            failed = out_of_memory.happened();
        }
        EXPECT_EQ(count, 2);
        EXPECT_EQ(status, failed ? -1 : 0) << number;
        EXPECT_EQ(components == nullptr, failed) << number;
        if (failed) {
            EXPECT_FALSE(free_for_others(anchors.anchorMutex)) << number;
            unlockGlobalMutex();
        }
        EXPECT_TRUE(free_for_others(anchors.anchorMutex)) << number;
        tr_release_comp_info_1(count, components);
    }
    // The array, then per component its descriptions and levels, and each name.
    EXPECT_EQ(number - 2, 1 + 2 * 2 + 3);
    EXPECT_TRUE(marker_is_there());
}
} // namespace
