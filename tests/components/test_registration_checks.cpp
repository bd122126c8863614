// What a registration refuses, in which order, and that a refused one changes nothing.
#include <climits>
#include <future>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"

namespace
{
using namespace qn::test;

const outcome bad_count = failure(1, 1, "2625-000 Number of categories is invalid.\n");
const outcome no_identifier = failure(2, 2, "2625-001 Component identifier is missing.\n");
const outcome no_list = failure(3, 3, "2625-002 Category list pointer is NULL.\n");
const outcome no_levels = failure(4, 3, "2625-002 Category list pointer is NULL.\n");
const outcome in_use = failure(38, 39, "2625-038 The component ID is already in use.\n");

outcome no_name(int entry)
{
    return failure(5, 5, "2625-004 Category name in entry " + std::to_string(entry) + " of category list is NULL.\n");
}

outcome bad_id(const std::string &name)
{
    return failure(6, 6,
                   "2625-005 Identifier for category \"" + name + "\" is greater than the number of categories.\n");
}

outcome bad_default(const std::string &name)
{
    return failure(
        7, 7, "2625-006 The default level for category \"" + name + "\" is greater than the maximum possible (256).\n");
}

outcome bad_minimum(const std::string &name)
{
    return failure(
        8, 8, "2625-007 The minimum level for category \"" + name + "\" is greater than the maximum possible (256).\n");
}

TEST(RegistrationChecks, RefuseNoCategoriesAnd256AndMore)
{
    client many("AB", 256);
    for (const qn_uint32_t count : {0U, 256U, 257U, 0x80000001U, UINT_MAX})
        EXPECT_EQ(after(tr_register_component_1("AB", many.levels.data(), many.categories.data(), count)), bad_count)
            << count;
}

TEST(RegistrationChecks, Accept255Categories)
{
    client many("AB", 255);
    EXPECT_EQ(after(many.register_now()), success());
    EXPECT_EQ(many.levels, levels(255, 1));
}

TEST(RegistrationChecks, RefuseAMissingIdentifier)
{
    client one("AB");
    EXPECT_EQ(after(tr_register_component_1(nullptr, one.levels.data(), one.categories.data(), 1)), no_identifier);
    EXPECT_EQ(after(tr_register_component_1("", one.levels.data(), one.categories.data(), 1)), no_identifier);
}

TEST(RegistrationChecks, RefuseAMissingCategoryList)
{
    client one("AB");
    EXPECT_EQ(after(tr_register_component_1("AB", one.levels.data(), nullptr, 1)), no_list);
}

TEST(RegistrationChecks, ReportAMissingLevelArrayWithTheTextOfTheMissingList)
{
    client one("AB");
    EXPECT_EQ(after(tr_register_component_1("AB", nullptr, one.categories.data(), 1)), no_levels);
}

TEST(RegistrationChecks, RefuseAnIdentifierThatIsTaken)
{
    client first("ABCD");
    client second("ABCD");
    ASSERT_EQ(first.register_now(), 0);
    EXPECT_EQ(after(second.register_now()), in_use);
}

TEST(RegistrationChecks, CompareTheFirstFourCharactersOfIdentifiers)
{
    client first("ABCD");
    ASSERT_EQ(first.register_now(), 0);
    EXPECT_EQ(after(client("ABCDE").register_now()), in_use);
    client other("ABCE");
    EXPECT_EQ(after(other.register_now()), success());
}

TEST(RegistrationChecks, KeepAShorterIdentifierApartFromALongerOne)
{
    client longer("ABC");
    client shorter("AB");
    ASSERT_EQ(longer.register_now(), 0);
    EXPECT_EQ(after(shorter.register_now()), success());
    EXPECT_EQ(after(client("AB").register_now()), in_use);
    EXPECT_EQ(after(client("ABC").register_now()), in_use);
}

TEST(RegistrationChecks, HeedCaseInIdentifiers)
{
    client upper("AB");
    client lower("ab");
    ASSERT_EQ(upper.register_now(), 0);
    EXPECT_EQ(after(lower.register_now()), success());
}

TEST(RegistrationChecks, RefuseATakenIdentifierWhileAnotherThreadHoldsTheGlobalMutex)
{
    client first("ABCD");
    ASSERT_EQ(first.register_now(), 0);
    ASSERT_EQ(lockGlobalMutex(), 0);
    auto answer = std::async(std::launch::async, [] { return after(client("ABCDE").register_now()); });
    const bool answered = answer.wait_for(std::chrono::seconds(30)) == std::future_status::ready;
    unlockGlobalMutex();
    EXPECT_TRUE(answered) << "the identifier is compared only once the mutex is free";
    EXPECT_EQ(answer.get(), in_use);
}

TEST(RegistrationChecks, RefuseACategoryWithoutAName)
{
    client three("AB", 3);
    three.categories[2].category_name = nullptr;
    EXPECT_EQ(after(three.register_now()), no_name(2));
    three.categories[2].category_name = "";
    EXPECT_EQ(after(three.register_now()), no_name(2));
    three.categories[0].category_name = nullptr;
    EXPECT_EQ(after(three.register_now()), no_name(0));
}

TEST(RegistrationChecks, RefuseACategoryIdentifierThatIsNoIndex)
{
    client three("AB", 3);
    three.categories[1].category_id = 3;
    EXPECT_EQ(after(three.register_now()), bad_id("c1"));
    three.categories[1].category_id = UINT_MAX;
    EXPECT_EQ(after(three.register_now()), bad_id("c1"));
    three.categories[1].category_id = 2;
    EXPECT_EQ(after(three.register_now()), success());
}

TEST(RegistrationChecks, RefuseADefaultLevelAbove255)
{
    client one("AB");
    one.categories[0].default_level_of_detail = 256;
    EXPECT_EQ(after(one.register_now()), bad_default("c0"));
    one.categories[0].default_level_of_detail = 255;
    EXPECT_EQ(after(one.register_now()), success());
}

TEST(RegistrationChecks, RefuseAMinimumLevelAbove255)
{
    client one("AB");
    one.categories[0].minimum_level_of_detail = 256;
    EXPECT_EQ(after(one.register_now()), bad_minimum("c0"));
    one.categories[0].minimum_level_of_detail = 255;
    EXPECT_EQ(after(one.register_now()), success());
    EXPECT_EQ(one.levels, levels{255});
}

TEST(RegistrationChecks, AreMadeInTheirOrder)
{
    client taken("USED");
    ASSERT_EQ(taken.register_now(), 0);

    // Everything is wrong; one thing after the other is put right.
    client all("AB", 2);
    all.categories[0] = {2, nullptr, 256, 256};
    const char *id = nullptr;
    const tr_category_description_t *categories = nullptr;
    tr_detail_level_t *level_array = nullptr;
    qn_uint32_t count = 0;
    const auto attempt = [&] { return after(tr_register_component_1(id, level_array, categories, count)); };

    EXPECT_EQ(attempt(), bad_count);
    count = 2;
    EXPECT_EQ(attempt(), no_identifier);
    id = "USED";
    EXPECT_EQ(attempt(), no_list);
    categories = all.categories.data();
    EXPECT_EQ(attempt(), no_levels);
    level_array = all.levels.data();
    EXPECT_EQ(attempt(), in_use);
    id = "AB";
    EXPECT_EQ(attempt(), no_name(0));
    all.categories[0].category_name = "c0";
    EXPECT_EQ(attempt(), bad_id("c0"));
    all.categories[0].category_id = 0;
    EXPECT_EQ(attempt(), bad_default("c0"));
    all.categories[0].default_level_of_detail = 0;
    EXPECT_EQ(attempt(), bad_minimum("c0"));
    all.categories[0].minimum_level_of_detail = 0;
    EXPECT_EQ(attempt(), success());
}

TEST(RegistrationChecks, FinishOneCategoryBeforeTheNext)
{
    client two("AB", 2);
    two.categories[0].minimum_level_of_detail = 256;
    two.categories[1].category_name = nullptr;
    EXPECT_EQ(after(two.register_now()), bad_minimum("c0"));
}

TEST(RegistrationChecks, LeaveEverythingAsItWasWhenTheyFail)
{
    client two("AB", 2);
    two.categories[1].minimum_level_of_detail = 256;
    ASSERT_EQ(two.register_now(), 8);
    EXPECT_EQ(two.levels, levels(2, 0xEE));
    EXPECT_EQ(two.tokens, nullptr);
    EXPECT_EQ(anchors.pFirstComp, nullptr);
}
} // namespace
