// Which trace files a process has, and where each is spooled.
#include <atomic>
#include <cerrno>
#include <cstring>
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
std::atomic<pthread_mutex_t *> unlock_that_fails = nullptr;
} // namespace

// The name is the linker's.
extern "C" {
int __real_pthread_mutex_unlock(pthread_mutex_t *mutex);
[[gnu::visibility("default")]] int __wrap_pthread_mutex_unlock(pthread_mutex_t *mutex)
{
    const int result = __real_pthread_mutex_unlock(mutex);
    return mutex == unlock_that_fails ? EPERM : result;
}
}

namespace
{
using namespace qn::test;

static_assert(sizeof(tr_mini_spooling_anchor_t) == 2048);

using record = std::pair<std::string, std::string>; // a trace, and where it is spooled
using records = std::vector<record>;

constexpr const char *not_spooled = "spooling not enabled";

class SpoolStatus : public testing::Test
{
protected:
    ~SpoolStatus() override
    {
        for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = anchor->next) anchor->spool = nullptr;
    }

    // What the call gives.
    static records status()
    {
        qn_int32_t count = -5;
        tr_mini_spooling_anchor_t *given = nullptr;
        EXPECT_EQ(tr_get_current_spooling_status_1(&count, &given), 0);
        records found;
        for (qn_int32_t i = 0; i < count; ++i) found.emplace_back(given[i].fileName, given[i].dest);
        tr_release_spool_info_1(count, given);
        return found;
    }
    static void name_default(const char *name) { qn::tr::set_file_name(&anchors, name); }
    // A trace that is governed by a specification of its own, in that directory.
    trace_anchor_t *spooled(const char *name, const char *directory = "/d", qn_uint32_t pages = 8)
    {
        trace_anchor_t *anchor = anchor_for(name);
        anchor->spool = list.add(name, "/dest", pages);
        anchor->spool->dir = const_cast<char *>(directory);
        return anchor;
    }

    specifications list;
};

TEST_F(SpoolStatus, IsOneRecordForTheDefaultTrace)
{
    name_default("/x/default.trc");
    EXPECT_EQ(status(), (records{{"/x/default.trc", not_spooled}}));
}

TEST_F(SpoolStatus, HasARecordForAnUnnamedDefaultTrace) { EXPECT_EQ(status(), (records{{"", not_spooled}})); }

TEST_F(SpoolStatus, NamesPagesAndDirectory)
{
    spooled("/x/app.trc", "/var/spool/t/c1/id1/h1/000000000000002a/app");
    EXPECT_EQ(status(),
              (records{{"", not_spooled}, {"/x/app.trc (8 pages)", "/var/spool/t/c1/id1/h1/000000000000002a/app"}}));
}

TEST_F(SpoolStatus, NamesTheFirstPageOfAPageSet)
{
    const scratch folder;
    const no_spool_thread none;
    setenv("QN_TR_SPOOL", "t$:ON:8:/dev/null", 1);
    ASSERT_EQ(tr_set_file_map_1((folder / "t").c_str(), "TEST:c0"), 0);
    client component("TEST");
    ASSERT_EQ(component.register_now(), 0);
    EXPECT_EQ(status(), (records{{"", not_spooled}, {folder / "t.1.sp (8 pages)", "/dev/null"}}));
    tr_term();
}

TEST_F(SpoolStatus, SpeaksOfOnePageWhenThereIsOne)
{
    spooled("/x/a", "/d", 1);
    EXPECT_EQ(status()[1], (record{"/x/a (1 page)", "/d"}));
}

TEST_F(SpoolStatus, SpeaksOfPagesAsSoonAsThereAreTwo)
{
    spooled("/x/a", "/d", 2);
    EXPECT_EQ(status()[1], (record{"/x/a (2 pages)", "/d"}));
}

TEST_F(SpoolStatus, TellsThatPagesAreRecycled)
{
    spooled("/x/a", "/dev/null");
    EXPECT_EQ(status()[1], (record{"/x/a (8 pages)", "/dev/null"}));
}

// The directory is a part of the destination that is overwritten when spooling is turned off.
TEST_F(SpoolStatus, TellsThatSpoolingWasTurnedOff)
{
    trace_anchor_t *anchor = spooled("/x/a");
    anchor->spool->dir = anchor->spool->dest;
    install(list);
    turn_spooling_off_in_all_spool_specs();
    EXPECT_EQ(status()[1], (record{"/x/a (8 pages)", "/dev/null"}));
    std::swap(list.first, anchors.pFirstSpoolSpec);
    std::swap(list.last, anchors.pLastSpoolSpec);
}

TEST_F(SpoolStatus, IsNotEnabledForASpecificationThatIsOff)
{
    spooled("/x/a")->spool->onoff = 0;
    EXPECT_EQ(status()[1], (record{"/x/a", not_spooled}));
}

TEST_F(SpoolStatus, IsNotEnabledWithoutADirectory)
{
    spooled("/x/a")->spool->dir = nullptr;
    EXPECT_EQ(status()[1], (record{"/x/a", not_spooled}));
}

TEST_F(SpoolStatus, HasTheDefaultTracesDirectoryToo)
{
    name_default("/x/default.trc");
    anchors.spool = list.add("default");
    anchors.spool->dir = anchors.spool->dest;
    EXPECT_EQ(status(), (records{{"/x/default.trc (8 pages)", "/dev/null"}}));
}

TEST_F(SpoolStatus, IsSortedByTheWholeFirstField)
{
    name_default("/m");
    spooled("/a/x.trc");
    anchor_for("/a/x.trc.1.sp");
    anchor_for("/z");
    anchor_for("/A");
    spooled("/b");
    EXPECT_EQ(status(), (records{{"/A", not_spooled},
                                 {"/a/x.trc (8 pages)", "/d"},
                                 {"/a/x.trc.1.sp", not_spooled},
                                 {"/b (8 pages)", "/d"},
                                 {"/m", not_spooled},
                                 {"/z", not_spooled}}));
}

TEST_F(SpoolStatus, TakesANameThatFillsItsField)
{
    const std::string name = "/" + std::string(1022, 'n');
    anchor_for(name);
    EXPECT_EQ(status()[1].first, name);
}

TEST_F(SpoolStatus, CutsALongerName)
{
    const std::string name = "/" + std::string(4000, 'n');
    anchor_for(name);
    EXPECT_EQ(status()[1], (record{name.substr(0, 1023), not_spooled}));
}

TEST_F(SpoolStatus, CutsTheNumberOfPagesBehindALongName)
{
    const std::string name = "/" + std::string(1019, 'n');
    spooled(name.c_str());
    EXPECT_EQ(status()[1].first, name + " (8");
}

TEST_F(SpoolStatus, CutsALongerDirectory)
{
    const std::string directory = "/" + std::string(4000, 'd');
    spooled("/x/a", directory.c_str());
    EXPECT_EQ(status()[1], (record{"/x/a (8 pages)", directory.substr(0, 1023)}));
}

TEST_F(SpoolStatus, CountsOnlyTheTracesThatThereAre)
{
    anchor_for("/x/a");
    anchors.numAnchors = 7;
    EXPECT_EQ(status(), (records{{"", not_spooled}, {"/x/a", not_spooled}}));
    anchors.numAnchors = 2;
}

TEST_F(SpoolStatus, LeavesOutTracesThatAreNotCountedYet)
{
    anchor_for("/x/a");
    anchors.numAnchors = 1;
    EXPECT_EQ(status(), (records{{"", not_spooled}}));
    anchors.numAnchors = 2;
}

TEST_F(SpoolStatus, LeavesNoLockHeld)
{
    trace_anchor_t *anchor = anchor_for("/x/a");
    status();
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(is_free(anchor->anchorMutex));
}

TEST_F(SpoolStatus, HoldsTheGlobalLockAndTheTracesOwn)
{
    trace_anchor_t *anchor = anchor_for("/x/a");
    debug_on();
    int told = 0;
    spool_calls().log_line = [&](const std::string &text) {
        if (text.rfind("get_current_spool_info in ", 0) != 0) return;
        ++told;
        EXPECT_FALSE(is_free(anchors.anchorMutex));
    };
    status();
    EXPECT_EQ(told, 2);
    EXPECT_TRUE(is_free(anchor->anchorMutex));
}

TEST_F(SpoolStatus, IsNotGivenWhenATraceCannotBeLocked)
{
    trace_anchor_t *anchor = anchor_for("/x/a");
    debug_on();
    qn_int32_t count = 5;
    tr_mini_spooling_anchor_t *given = nullptr;
    {
        const exhausted_mutex unlockable(anchor->anchorMutex);
        EXPECT_EQ(tr_get_current_spooling_status_1(&count, &given), -1);
    }
    EXPECT_EQ(count, 0);
    EXPECT_EQ(given, nullptr);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(
        system_log_has(LOG_WARNING, "get_current_spool_info: failed to get mutex: " + std::to_string(EAGAIN) + "\n"));
}

TEST_F(SpoolStatus, IsNotGivenWhenATraceCannotBeUnlocked)
{
    trace_anchor_t *anchor = anchor_for("/x/a");
    debug_on();
    qn_int32_t count = 5;
    tr_mini_spooling_anchor_t *given = nullptr;
    unlock_that_fails = &anchor->anchorMutex;
    EXPECT_EQ(tr_get_current_spooling_status_1(&count, &given), -1);
    unlock_that_fails = nullptr;
    EXPECT_EQ(count, 0);
    EXPECT_EQ(given, nullptr);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
    EXPECT_TRUE(system_log_has(LOG_WARNING,
                               "get_current_spool_info: failed to release mutex: " + std::to_string(EPERM) + "\n"));
}

// A program that sees this should end: the lock stays held, and the count is that of the records wanted.
TEST_F(SpoolStatus, IsNotGivenWithoutMemory)
{
    anchor_for("/x/a");
    qn_int32_t count = 5;
    auto *given = reinterpret_cast<tr_mini_spooling_anchor_t *>(this);
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(tr_get_current_spooling_status_1(&count, &given), -1);
    calls() = {};
    EXPECT_EQ(given, nullptr);
    EXPECT_EQ(count, 2);
    EXPECT_FALSE(is_free(anchors.anchorMutex));
    EXPECT_EQ(unlockGlobalMutex(), 0);
    EXPECT_TRUE(is_free(anchors.anchorMutex));
}

TEST_F(SpoolStatus, TellsWhatItLooksAt)
{
    const trace_anchor_t *anchor = anchor_for("/x/a");
    debug_on();
    status();
    char place[32];
    std::snprintf(place, sizeof place, "%p", static_cast<const void *>(anchor));
    EXPECT_TRUE(system_log_has(LOG_WARNING, "get_current_spool_info: allocated 2 structs\n"));
    EXPECT_TRUE(system_log_has(LOG_WARNING, "get_current_spool_info in /x/a (" + std::string(place) + ")\n"));
}

TEST_F(SpoolStatus, MayBeReleasedWhenThereIsNone)
{
    tr_release_spool_info_1(0, nullptr);
    tr_release_spool_info_1(9, nullptr);
}

TEST(StatusOrder, IsThatOfTheBytesOfTheFirstFields)
{
    tr_mini_spooling_anchor_t low{};
    tr_mini_spooling_anchor_t high{};
    const auto compare = [&](const char *first, const char *second) {
        std::strcpy(low.fileName, first);
        std::strcpy(high.fileName, second);
        return _strcmp(&low, &high);
    };
    std::strcpy(low.dest, "z");
    std::strcpy(high.dest, "a");
    EXPECT_LT(compare("/a", "/b"), 0);
    EXPECT_GT(compare("/b", "/a"), 0);
    EXPECT_EQ(compare("/a", "/a"), 0);
    EXPECT_LT(compare("/a", "/a "), 0);
    EXPECT_LT(compare("/a (8 pages)", "/a.1.sp"), 0);
    EXPECT_LT(compare("/Z", "/a"), 0);
    EXPECT_LT(compare("/z", "/\xff"), 0);
}
} // namespace
