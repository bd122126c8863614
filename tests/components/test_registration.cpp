// What a registration makes: the component's block, its place in the list, its levels, its tokens, its trace files.
#include <cstring>
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "components/page_set.h"
#include "support/failing_memory.h"
#include "support/scratch.h"
#include "support/system_log.h"

namespace
{
using namespace qn::test;

TEST(Registration, StoresTheFirstFourCharactersOfTheIdentifier)
{
    client longer("ABCDEFG");
    client shorter("X");
    ASSERT_EQ(longer.register_now(), 0);
    ASSERT_EQ(shorter.register_now(), 0);
    const component_anchor_t *newest = anchors.pFirstComp;
    EXPECT_EQ(std::memcmp(newest->compId, "X\0\0\0\0", 5), 0);
    EXPECT_EQ(std::memcmp(newest->pNext->compId, "ABCD\0", 5), 0);
}

TEST(Registration, PutsTheNewestComponentFirst)
{
    client a("A");
    client b("B");
    client c("C");
    for (client *each : {&a, &b, &c}) ASSERT_EQ(each->register_now(), 0);
    EXPECT_EQ(registered_ids(), (std::vector<std::string>{"C", "B", "A"}));
}

TEST(Registration, KeepsTheCategoriesInOneBlockBehindTheFixedPart)
{
    client made = client_with("AB", {{1, "Errors", 4, 2}, {0, "Flow", 9, 0}, {2, "x", 255, 255}});
    const allocation_sizes allocated;
    ASSERT_EQ(made.register_now(), 0);
    const component_anchor_t *component = registered("AB");
    ASSERT_NE(component, nullptr);
    ASSERT_EQ(component->numberOfCategories, 3);

    const char *name = reinterpret_cast<const char *>(component->categories + 3);
    for (int i = 0; i < 3; ++i) {
        const tr_category_description_t &copy = component->categories[i];
        EXPECT_EQ(copy.category_id, made.categories[i].category_id);
        EXPECT_EQ(copy.default_level_of_detail, made.categories[i].default_level_of_detail);
        EXPECT_EQ(copy.minimum_level_of_detail, made.categories[i].minimum_level_of_detail);
        EXPECT_EQ(copy.category_name, name) << "names stand back to back behind the descriptions";
        EXPECT_STREQ(copy.category_name, made.categories[i].category_name);
        name += std::strlen(name) + 1;
    }
    EXPECT_TRUE(allocated.has(sizeof(component_anchor_t) + 2 * sizeof(tr_category_description_t) + 7 + 5 + 2));
    EXPECT_TRUE(allocated.has(3 * sizeof(tr_file_token_t)));
}

TEST(Registration, CopiesTheDescriptions)
{
    char name[] = "Errors";
    client made = client_with("AB", {{0, name, 5, 0}});
    ASSERT_EQ(made.register_now(), 0);
    name[0] = 'X';
    made.categories[0].default_level_of_detail = 77;
    ASSERT_EQ(tr_set_trace_levels_1("AB:^Errors$"), 0);
    EXPECT_EQ(made.levels, levels{5});
}

TEST(Registration, SetsMinimumLevelsByPosition)
{
    client made = client_with("AB", {{2, "a", 110, 10}, {0, "b", 120, 20}, {1, "c", 130, 30}});
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(made.levels, (levels{10, 20, 30}));
    EXPECT_EQ(registered("AB")->pDetailLevels, made.levels.data());
}

TEST(Registration, ClearsTheLevelsThatNoEntryStandsFor)
{
    tr_detail_level_t bytes[4] = {0xEE, 0xEE, 0xEE, 0xEE};
    const tr_category_description_t categories[3] = {{0, "a", 1, 0}, {0, "b", 1, 0}, {0, "c", 1, 0}};
    ASSERT_EQ(tr_register_component_1("AB", bytes, categories, 3), 0);
    EXPECT_EQ(bytes[0], 0);
    EXPECT_EQ(bytes[1], 0);
    EXPECT_EQ(bytes[2], 0);
    EXPECT_EQ(bytes[3], 0xEE) << "one byte per category, no more";
}

TEST(Registration, AppliesPendingLevelSpecificationsByCategoryIdentifier)
{
    ASSERT_EQ(tr_set_trace_levels_1("AB:*"), 0);
    client made = client_with("AB", {{2, "a", 110, 10}, {0, "b", 120, 20}, {1, "c", 130, 30}});
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(made.levels, (levels{120, 130, 110}));
}

TEST(Registration, AppliesPendingLevelSpecificationsInTheirOrder)
{
    ASSERT_EQ(tr_set_trace_levels_1("AB:*=9,AB:c1=4"), 0);
    ASSERT_EQ(tr_set_trace_levels_1("AB:c2=6"), 0);
    ASSERT_EQ(tr_set_trace_levels_1("CD:*=99"), 0);
    client made("AB", 3);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(made.levels, (levels{9, 4, 6}));
}

TEST(Registration, AppliesLevelsOfTheEnvironment)
{
    setenv("QN_TR_TRACE_LEVELS", "AB:*=9,AB:c1=4", 1);
    client made("AB", 2);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(made.levels, (levels{9, 4}));
}

TEST(Registration, LeavesOtherComponentsAlone)
{
    ASSERT_EQ(tr_set_trace_levels_1("*:*=9"), 0);
    client first("AB");
    ASSERT_EQ(first.register_now(), 0);
    first.levels[0] = 77;
    client second("CD");
    ASSERT_EQ(second.register_now(), 0);
    EXPECT_EQ(first.levels, levels{77}) << "pending specifications are for the new component";
    EXPECT_EQ(second.levels, levels{9});
}

TEST(Registration, GivesATokenPerCategoryAllOfTheDefaultFile)
{
    client made("AB", 3);
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_NE(made.tokens, nullptr);
    EXPECT_EQ(made.tokens, registered("AB")->pFileTokens);
    for (int i = 0; i < 3; ++i) EXPECT_EQ(made.tokens[i], nullptr);
}

TEST(Registration, GivesTheTokensOfPendingFileMaps)
{
    const scratch files;
    setenv("QN_TR_FILE_MAP", (files / "cd.trc" + ",AB:c1").c_str(), 1);
    client made("AB", 3, 0);
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(made.tokens[0], nullptr);
    EXPECT_EQ(made.tokens[1], findOrCreateAnchorForFile((files / "cd.trc").c_str(), 0));
    EXPECT_NE(made.tokens[1], nullptr);
    EXPECT_EQ(made.tokens[2], nullptr);
}

TEST(Registration, NeedsNoPlaceForTheTokens)
{
    client made("AB");
    EXPECT_EQ(after(tr_register_component_1("AB", made.levels.data(), made.categories.data(), 1)), success());
    EXPECT_NE(registered("AB"), nullptr);
}

TEST(Registration, ClearsTheErrorRecord)
{
    leave_marker();
    client made("AB");
    EXPECT_EQ(after(made.register_now()), success());
}

TEST(Registration, StartsTheDefaultFileWhenItHasSomethingToTrace)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client silent("OFF", 1, 0);
    ASSERT_EQ(silent.register_now(), 0);
    EXPECT_FALSE(std::filesystem::exists(files / "a.trc"));
    client traced("ON", 1, 1);
    ASSERT_EQ(traced.register_now(), 0);
    EXPECT_TRUE(std::filesystem::exists(files / "a.trc"));
    EXPECT_NE(anchors.pMap, nullptr);
}

TEST(Registration, StandsAlthoughItsFileDoesNotStart)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "missing/a.trc").c_str()), 0);
    client made("AB", 2);
    EXPECT_EQ(after(made.register_now()), no_such_file());
    EXPECT_EQ(made.levels, levels(2, 1));
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_EQ(made.tokens, registered("AB")->pFileTokens);
    EXPECT_EQ(tr_unregister_component_1("AB"), 0);
}

// The list of trace files is walked from the default file to the oldest.
TEST(Registration, ReturnsWhatTheLastStartReturned)
{
    const scratch files;
    setenv("QN_TR_FILE_SIZE", (files / "good.trc" + ",4096;" + files / "missing/bad.trc" + ",4096").c_str(), 1);
    client made("AB");
    EXPECT_EQ(after(made.register_now()), success());
    EXPECT_TRUE(std::filesystem::exists(files / "good.trc")) << "a failed start does not end the walk";
}

TEST(Registration, ReturnsTheFailureOfTheLastStart)
{
    const scratch files;
    setenv("QN_TR_FILE_SIZE", (files / "missing/bad.trc" + ",4096;" + files / "good.trc" + ",4096").c_str(), 1);
    client made("AB");
    EXPECT_EQ(after(made.register_now()), no_such_file());
    EXPECT_TRUE(std::filesystem::exists(files / "good.trc"));
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
}

TEST(Registration, SaysInTheLogWhatItRegisters)
{
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    client first("AB");
    ASSERT_EQ(first.register_now(), 0);
    clear_system_log();
    client made("ABCDEFG");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_TRUE(system_log_has("Registering component ABCDEFG\n"));
}

TEST(Registration, FailsWhenTheGlobalMutexCannotBeTaken)
{
    client first("AB"); // the library initialises its mutexes
    ASSERT_EQ(first.register_now(), 0);
    client made("CD");
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(made.register_now());
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(made.levels, levels{0xEE});
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
}

TEST(Registration, ChangesNothingWhenMemoryRunsOut)
{
    client first("AB");
    ASSERT_EQ(first.register_now(), 0);
    for (int number = 1; number <= 3; ++number) { // the block, the tokens, what they are mapped by
        client made("CD", 2);
        const failing_allocation out_of_memory(number);
        const qn_int32_t status = made.register_now();
        ASSERT_TRUE(out_of_memory.happened());
        EXPECT_EQ(after(status), no_memory()) << number;
        EXPECT_EQ(made.levels, levels(2, 0xEE));
        EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    }
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(Registration, StandsAlthoughMemoryRanOutForAMappedFile)
{
    ASSERT_EQ(tr_set_file_map_1("/tmp/never.trc", "AB:*"), 0);
    client made("AB", 1, 0);
    const failing_allocation of_the_anchor(4); // behind the block, the tokens and what they are mapped by
    const qn_int32_t status = made.register_now();
    ASSERT_TRUE(of_the_anchor.happened());
    EXPECT_EQ(after(status), no_memory());
    EXPECT_EQ(made.tokens[0], nullptr);
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
}

TEST(Registration, StandsAlthoughMemoryRanOutForItsPageSet)
{
    const scratch files;
    setenv("QN_TR_SPOOL", ("a.trc:ON:4:" + files / "spool").c_str(), 1);
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    std::vector<outcome> seen;
    for (int number = 4;; ++number) { // behind the component's own
        client made("AB", 2);
        qn_int32_t status = 0;
        {
            const failing_allocation out_of_memory(number);
            status = made.register_now();
            if (!out_of_memory.happened()) break;
        }
        seen.push_back(after(status));
        EXPECT_EQ(made.levels, levels(2, 1));
        EXPECT_EQ(made.register_now(), 38) << "it is registered";
        EXPECT_EQ(anchors.pMap, nullptr);
        ASSERT_EQ(tr_unregister_component_1("AB"), 0);
    }
    EXPECT_NE(anchors.pMap, nullptr) << "the next registration starts it";
    outcome no_page = no_memory();
    no_page.status = -1;
    const std::vector<outcome> of_the_others(pages_of(&anchors).size() - 2, no_page); // the mutex is kept
    ASSERT_FALSE(seen.empty());
    EXPECT_EQ(seen.front(), no_memory()) << "of the set's mutex";
    EXPECT_EQ(std::vector(seen.begin() + 1, seen.end()), of_the_others);
}

TEST(Registration, IsUndoneWhenTheThreadIsCancelledWhileItStartsAFile)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB");
    ASSERT_TRUE(is_cancelled_in([&] { made.register_now(); }));
    EXPECT_EQ(anchors.pFirstComp, nullptr);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_EQ(after(made.register_now()), success());
}

TEST(Registration, LeavesTheLevelsAt0WhenTheThreadIsCancelledInIt)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB", 2);
    ASSERT_TRUE(is_cancelled_in([&] { made.register_now(); })); // while it starts the file
    EXPECT_EQ(made.levels, levels(2, 0)) << "nothing can switch them off any more";
}

TEST(RegistrationCleanup, UnlinksAndFreesTheComponentAtTheHeadAndUnlocks)
{
    client first("AB");
    client made("CD");
    ASSERT_EQ(first.register_now(), 0);
    ASSERT_EQ(made.register_now(), 0);
    component_anchor_t *building = anchors.pFirstComp;
    ASSERT_EQ(lockGlobalMutex(), 0);
    register_cleanup(&building);
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(RegistrationCleanup, FreesAComponentThatIsNotInTheList)
{
    client first("AB");
    ASSERT_EQ(first.register_now(), 0);
    auto *building = static_cast<component_anchor_t *>(std::calloc(1, sizeof(component_anchor_t)));
    ASSERT_EQ(lockGlobalMutex(), 0);
    register_cleanup(&building);
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}
} // namespace
