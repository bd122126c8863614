// What a level specification does to the levels of registered components.
#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/outcome.h"

namespace
{
using namespace qn::test;

void set_levels(const char *specification) { ASSERT_EQ(tr_set_trace_levels_1(specification), 0) << specification; }

// Categories with default 3 and minimum 0.
client categories_named(const char *id, const std::vector<const char *> &names)
{
    std::vector<tr_category_description_t> categories;
    for (const char *name : names) categories.push_back({static_cast<qn_uint32_t>(categories.size()), name, 3, 0});
    return client_with(id, categories);
}

TEST(LevelApplication, SetsEveryCategoryToItsDefault)
{
    client ab = client_with("AB", {{0, "x", 7, 1}, {1, "y", 0, 2}});
    client cd = client_with("CD", {{0, "z", 255, 0}});
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(cd.register_now(), 0);
    set_levels("*:*");
    EXPECT_EQ(ab.levels, (levels{7, 0})) << "a default may lie below the minimum";
    EXPECT_EQ(cd.levels, levels{255});
}

TEST(LevelApplication, RaisesALevelToTheCategorysMinimum)
{
    client ab = client_with("AB", {{0, "x", 7, 1}, {1, "y", 7, 200}});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("*:*=9");
    EXPECT_EQ(ab.levels, (levels{9, 200}));
    set_levels("*:*=0");
    EXPECT_EQ(ab.levels, (levels{1, 200}));
}

TEST(LevelApplication, KeepsTheLowEightBitsOfALevel)
{
    client ab = client_with("AB", {{0, "x", 7, 5}});
    ASSERT_EQ(ab.register_now(), 0);
    const std::vector<std::pair<const char *, tr_detail_level_t>> cases = {
        {"AB:*=255", 255}, {"AB:*=256", 0},     {"AB:*=300", 44},       {"AB:*=0x10", 16},
        {"AB:*=020", 16},  {"AB:*=-2", 254},    {"AB:*=2147483648", 0}, {"AB:*=-1", 7},
        {"AB:*=3", 5},     {"AB:*=0x1ff", 255}, {"AB:*=4294967295", 7}, {"AB:*=4294967296", 5}};
    for (const auto &[specification, level] : cases) {
        set_levels(specification);
        EXPECT_EQ(ab.levels[0], level) << specification;
    }
}

TEST(LevelApplication, GoesByCategoryIdentifierNotByPosition)
{
    client ab = client_with("AB", {{2, "a", 10, 0}, {0, "b", 20, 0}, {1, "c", 30, 0}});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB:a=100");
    EXPECT_EQ(ab.levels, (levels{0, 0, 100}));
    set_levels("AB:[bc]");
    EXPECT_EQ(ab.levels, (levels{20, 30, 100}));
}

TEST(LevelApplication, LetsTheLastOfTwoEntriesWithOneIdentifierWin)
{
    client ab = client_with("AB", {{0, "a", 10, 0}, {0, "b", 20, 0}});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB:*");
    EXPECT_EQ(ab.levels, (levels{20, 0}));
}

TEST(LevelApplication, MatchesAnywhereInTheIdentifierAndWithoutRegardToCase)
{
    client ab = categories_named("AB", {"x"});
    client ab01 = categories_named("AB01", {"x"});
    client zab = categories_named("zAb", {"x"});
    client other = categories_named("CD", {"x"});
    for (client *each : {&ab, &ab01, &zab, &other}) ASSERT_EQ(each->register_now(), 0);
    set_levels("ab:X=1");
    EXPECT_EQ(ab.levels[0], 1);
    EXPECT_EQ(ab01.levels[0], 1);
    EXPECT_EQ(zab.levels[0], 1);
    EXPECT_EQ(other.levels[0], 0);
    set_levels("^AB$:x=2");
    EXPECT_EQ(ab.levels[0], 2);
    EXPECT_EQ(ab01.levels[0], 1);
    EXPECT_EQ(zab.levels[0], 1);
}

TEST(LevelApplication, TakesALeadingBlankForPartOfTheCategory)
{
    client ab = categories_named("AB", {"Info", " Info", "My Info"});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB: Info=3");
    EXPECT_EQ(ab.levels, (levels{0, 3, 3}));
}

TEST(LevelApplication, LetsALineEndStandBetweenAnchors)
{
    client ab = categories_named("AB", {"one\ntwo", "two three", "oneXtwo"});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB:^two$=1,AB:one.two=2");
    EXPECT_EQ(ab.levels, (levels{1, 0, 2})) << "a dot does not match the line end";
}

TEST(LevelApplication, UnderstandsExtendedExpressions)
{
    client ab = categories_named("AB", {"red", "green", "blue", "aaa"});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB:red|^b.+e$=1,[[:upper:]]{2}:(a){3}=2");
    EXPECT_EQ(ab.levels, (levels{1, 0, 1, 2}));
}

TEST(LevelApplication, LetsALaterElementOverrideAnEarlierOne)
{
    client ab = categories_named("AB", {"x", "y", "z"});
    ASSERT_EQ(ab.register_now(), 0);
    set_levels("AB:*=4,AB:y=5,AB:z=6,*:z=7");
    EXPECT_EQ(ab.levels, (levels{4, 5, 7}));
}

TEST(LevelApplication, ReachesOneComponentWhenAskedTo)
{
    client ab = categories_named("AB", {"x"});
    client cd = categories_named("CD", {"x"});
    ASSERT_EQ(ab.register_now(), 0);
    ASSERT_EQ(cd.register_now(), 0);
    level_list list;
    ASSERT_EQ(list.parse("*:*=9"), 0);
    EXPECT_EQ(process_trace_spec(&anchors, list.first, registered("CD")), 0);
    EXPECT_EQ(ab.levels[0], 0);
    EXPECT_EQ(cd.levels[0], 9);
    ASSERT_EQ(list.parse("AB:*=8"), 0);
    EXPECT_EQ(process_trace_spec(&anchors, list.last, registered("CD")), 0);
    EXPECT_EQ(cd.levels[0], 9) << "the pattern counts there too";
    EXPECT_EQ(process_trace_spec(&anchors, list.first, nullptr), 0);
    EXPECT_EQ(ab.levels[0], 9);
}

TEST(LevelApplication, DoesNothingWithAPatternThatDoesNotCompile)
{
    client ab = categories_named("AB", {"x"});
    ASSERT_EQ(ab.register_now(), 0);
    char good[] = ".*";
    char bad[] = "(";
    trace_level_spec_t spec{nullptr, nullptr, bad, good, 9};
    EXPECT_EQ(process_trace_spec(&anchors, &spec, nullptr), 0);
    spec = {nullptr, nullptr, good, bad, 9};
    EXPECT_EQ(process_trace_spec(&anchors, &spec, nullptr), 0);
    EXPECT_EQ(ab.levels[0], 0);
}
} // namespace
