// Unregistering: the client's levels fall to 0, the component goes, files that have nothing left to trace stop.
#include <filesystem>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/mutexes.h"
#include "components/outcome.h"
#include "components/page_set.h"
#include "support/scratch.h"
#include "support/system_log.h"

namespace
{
using namespace qn::test;

outcome not_registered(const std::string &id)
{
    return failure(26, 26, "2625-025 Component \"" + id + "\" is not registered.\n");
}

TEST(Unregistration, ZeroesTheLevelsAndRemovesTheComponent)
{
    client a("A", 3);
    client b("B", 3);
    client c("C", 3);
    for (client *each : {&a, &b, &c}) ASSERT_EQ(each->register_now(), 0);
    leave_marker();
    EXPECT_EQ(after(tr_unregister_component_1("B")), success());
    EXPECT_EQ(registered_ids(), (std::vector<std::string>{"C", "A"}));
    EXPECT_EQ(a.levels, levels(3, 1));
    EXPECT_EQ(b.levels, levels(3, 0));
    EXPECT_EQ(c.levels, levels(3, 1));
}

TEST(Unregistration, TakesTheFirstFourCharactersForTheIdentifier)
{
    client made("ABCD");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_unregister_component_1("ABC")), not_registered("ABC"));
    EXPECT_EQ(after(tr_unregister_component_1("ABCDxyz")), success());
    EXPECT_EQ(anchors.pFirstComp, nullptr);
}

TEST(Unregistration, LetsTheIdentifierBeRegisteredAgain)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_EQ(tr_unregister_component_1("AB"), 0);
    EXPECT_EQ(after(made.register_now()), success());
    EXPECT_EQ(made.levels, levels{1});
}

TEST(Unregistration, StopsTheFileThatHasNothingLeftToTrace)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    ASSERT_EQ(tr_set_file_size_1((files / "b.trc").c_str(), 8192), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_NE(anchors.pMap, nullptr);
    ASSERT_NE(anchors.next->pMap, nullptr);
    EXPECT_EQ(tr_unregister_component_1("AB"), 0);
    EXPECT_EQ(anchors.pMap, nullptr);
    EXPECT_EQ(anchors.next->pMap, nullptr) << "every file of the list, not the default file alone";
    EXPECT_TRUE(std::filesystem::exists(files / "a.trc"));
    EXPECT_EQ(anchors.fileName, files / "a.trc") << "the name stays";
}

TEST(Unregistration, KeepsTheFileThatAnotherComponentTracesTo)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client one("ONE");
    client two("TWO");
    client silent("OFF", 1, 0);
    for (client *each : {&one, &two, &silent}) ASSERT_EQ(each->register_now(), 0);
    EXPECT_EQ(tr_unregister_component_1("ONE"), 0);
    EXPECT_NE(anchors.pMap, nullptr);
    EXPECT_EQ(tr_unregister_component_1("TWO"), 0);
    EXPECT_EQ(anchors.pMap, nullptr) << "a component whose levels are 0 keeps no file";
}

TEST(Unregistration, StopsEveryPageOfASet)
{
    const scratch files;
    trace_anchor_t *set = make_page_set(files / "set", 3, 16384);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    for (const trace_anchor_t *page : pages_of(set)) ASSERT_NE(page->pMap, nullptr);
    EXPECT_EQ(after(tr_unregister_component_1("AB")), success());
    for (const trace_anchor_t *page : pages_of(set)) EXPECT_EQ(page->pMap, nullptr) << page->fileName;
    EXPECT_EQ(pages_of(set).size(), 3U) << "the set itself stays";
}

TEST(Unregistration, LeavesAFileAloneThatIsNotStarted)
{
    setenv("QN_TR_DEBUG_LEVEL", "8", 1);
    ASSERT_EQ(tr_set_file_size_1("/tmp/never.trc", 8192), 0);
    client silent("OFF", 1, 0);
    ASSERT_EQ(silent.register_now(), 0);
    clear_system_log();
    ASSERT_EQ(tr_unregister_component_1("OFF"), 0);
    EXPECT_FALSE(system_log_has("*** stop_trace for /tmp/never.trc"));
}

TEST(Unregistration, RefusesAMissingIdentifier)
{
    const outcome no_identifier = failure(2, 2, "2625-001 Component identifier is missing.\n");
    EXPECT_EQ(after(tr_unregister_component_1(nullptr)), no_identifier);
    EXPECT_EQ(after(tr_unregister_component_1("")), no_identifier);
}

TEST(Unregistration, NamesTheIdentifierThatIsUnknown)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    EXPECT_EQ(after(tr_unregister_component_1("WRONG")), not_registered("WRONG"));
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_EQ(made.levels, levels{1});
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
}

TEST(Unregistration, Returns9AndChangesNothingOnceTracingIsStopped)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    global_stop_trace();
    leave_marker();
    EXPECT_EQ(tr_unregister_component_1("AB"), 9);
    EXPECT_EQ(tr_unregister_component_1(nullptr), 9) << "before it looks at the identifier";
    EXPECT_TRUE(marker_is_there());
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_EQ(made.levels, levels{1});
}

TEST(Unregistration, Returns9AfterTermination)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    tr_term();
    leave_marker();
    EXPECT_EQ(tr_unregister_component_1("AB"), 9);
    EXPECT_TRUE(marker_is_there());
}

TEST(Unregistration, FailsWhenTheGlobalMutexCannotBeTaken)
{
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    outcome seen;
    {
        const exhausted_mutex exhausted(anchors.anchorMutex);
        seen = after(tr_unregister_component_1("AB"));
    }
    EXPECT_EQ(seen, lock_failure(exhausted_mutex::lock_result));
    EXPECT_EQ(registered_ids(), std::vector<std::string>{"AB"});
    EXPECT_EQ(made.levels, levels{1});
}

TEST(Unregistration, LeavesTheMutexFreeWhenTheThreadIsCancelledInIt)
{
    const scratch files;
    ASSERT_EQ(tr_set_filename_1((files / "a.trc").c_str()), 0);
    client made("AB");
    ASSERT_EQ(made.register_now(), 0);
    ASSERT_TRUE(is_cancelled_in([] { tr_unregister_component_1("AB"); })); // while it stops the file
    EXPECT_TRUE(free_for_others(anchors.anchorMutex));
    EXPECT_EQ(made.levels, levels{0});
    EXPECT_EQ(after(made.register_now()), success());
}
} // namespace
