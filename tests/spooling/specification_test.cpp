// A specification that is appended to a list: its fields, its links, what it is cut to.
#include <climits>
#include <cstring>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class Specification : public testing::Test
{
protected:
    qn_int32_t add(const std::string &dest, const std::string &pattern, qn_int32_t interval = 30)
    {
        return addSpoolCfgElement(dest.c_str(), pattern.c_str(), 12, 1, interval, &list.first, &list.last, 0, 262144);
    }

    specifications list;
};

TEST_F(Specification, HoldsWhatItIsMadeOf)
{
    ASSERT_EQ(add("/var/spool/x", ".*\\.trc"), 0);
    ASSERT_NE(list.first, nullptr);
    EXPECT_STREQ(list.first->dest, "/var/spool/x");
    EXPECT_STREQ(list.first->pattern, ".*\\.trc");
    EXPECT_EQ(list.first->pages, 12U);
    EXPECT_EQ(list.first->onoff, 1);
    EXPECT_EQ(list.first->pg_size, 262144U);
    EXPECT_EQ(list.first->sync_interval, 30U);
    EXPECT_EQ(list.first->dir, nullptr);
    EXPECT_EQ(list.first->isDefaultSpec, 0);
}

TEST_F(Specification, TakesPagesSwitchAndPageSizeAsTheyAre)
{
    ASSERT_EQ(addSpoolCfgElement("/d", "p", UINT_MAX, 0, 1, &list.first, &list.last, 0, 4096), 0);
    EXPECT_EQ(list.first->pages, UINT_MAX);
    EXPECT_EQ(list.first->onoff, 0);
    EXPECT_EQ(list.first->pg_size, 4096U);
}

struct interval {
    qn_int32_t asked;
    qn_uint32_t seconds;
};

void PrintTo(const interval &given, std::ostream *out) { *out << given.asked; }

class SyncInterval : public Specification, public testing::WithParamInterface<interval>
{
};

TEST_P(SyncInterval, IsHourlyWhenZeroAndAMinuteWhenNegative)
{
    ASSERT_EQ(add("/d", "p", GetParam().asked), 0);
    EXPECT_EQ(list.first->sync_interval, GetParam().seconds);
}

INSTANTIATE_TEST_SUITE_P(Values, SyncInterval,
                         testing::Values(interval{0, 3600}, interval{1, 1}, interval{60, 60}, interval{7200, 7200},
                                         interval{INT_MAX, INT_MAX}, interval{-1, 60}, interval{-5, 60},
                                         interval{INT_MIN, 60}));

TEST_F(Specification, TakesADestinationThatFillsItsField)
{
    const std::string dest = "/" + std::string(4094, 'd');
    ASSERT_EQ(add(dest, "p"), 0);
    EXPECT_EQ(list.first->dest, dest);
}

TEST_F(Specification, CutsALongerDestination)
{
    const std::string dest = "/" + std::string(4095, 'd');
    ASSERT_EQ(add(dest, "p"), 0);
    EXPECT_EQ(list.first->dest, dest.substr(0, 4095));
    EXPECT_STREQ(list.first->pattern, "p");
}

TEST_F(Specification, TakesAPatternThatFillsItsField)
{
    const std::string pattern(1023, 'p');
    ASSERT_EQ(add("/d", pattern), 0);
    EXPECT_EQ(list.first->pattern, pattern);
}

TEST_F(Specification, CutsALongerPattern)
{
    const std::string pattern(1024, 'p');
    ASSERT_EQ(add("/d", pattern), 0);
    EXPECT_EQ(list.first->pattern, pattern.substr(0, 1023));
    EXPECT_EQ(list.first->pages, 12U);
}

TEST_F(Specification, IsTheWholeListWhenItIsTheFirst)
{
    ASSERT_EQ(add("/d", "p"), 0);
    EXPECT_EQ(list.first, list.last);
    EXPECT_EQ(list.first->pNext, nullptr);
    EXPECT_EQ(list.first->pPrev, nullptr);
}

TEST_F(Specification, IsAppendedAtTheTail)
{
    for (const char *pattern : {"one", "two", "three"}) ASSERT_EQ(add("/d", pattern), 0);
    EXPECT_EQ(list.patterns(), (std::vector<std::string>{"one", "two", "three"}));
    EXPECT_EQ(list.patterns_backwards(), (std::vector<std::string>{"three", "two", "one"}));
    EXPECT_EQ(list.first->pPrev, nullptr);
    EXPECT_EQ(list.last->pNext, nullptr);
}

TEST_F(Specification, NeedsMemory)
{
    ASSERT_EQ(add("/d", "one"), 0);
    calls().calloc = [](size_t, size_t) -> void * { return nullptr; };
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(add("/d", "two"), 39);
    calls() = {};
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(last_error().text, "2625-013 Memory allocation failed.\n");
    EXPECT_EQ(list.patterns(), std::vector<std::string>{"one"});
    EXPECT_EQ(list.last, list.first);
}

TEST_F(Specification, RecordsNoErrorWhenItIsAppended)
{
    leave_marker();
    ASSERT_EQ(add("/d", "p"), 0);
    EXPECT_TRUE(marker_is_there());
}

TEST_F(Specification, TellsItsFields)
{
    debug_on();
    ASSERT_EQ(add("/d", "p"), 0);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "Spooling spec 'p:1:12:/d', sync_interval=30'\n"));
}

TEST_F(Specification, TellsTheIntervalThatItGot)
{
    debug_on();
    ASSERT_EQ(add("/d", "p", 0), 0);
    EXPECT_TRUE(system_log_has(LOG_WARNING, "Spooling spec 'p:1:12:/d', sync_interval=3600'\n"));
}

TEST_F(Specification, IsSilentBelowLevelEight)
{
    global_debug_level = 7;
    ASSERT_EQ(add("/d", "p"), 0);
    EXPECT_TRUE(system_log().empty());
}

TEST(SpecificationList, MayBeFreedWhenItIsEmpty) { free_spool_spec_linked_list(nullptr); }

TEST(SpecificationList, FreesWhatFollowsTheNodeGiven)
{
    specifications list;
    for (const char *pattern : {"one", "two", "three"}) list.add(pattern);
    trace_spool_spec_t *rest = list.first->pNext;
    list.first->pNext = nullptr;
    list.last = list.first;
    free_spool_spec_linked_list(rest);
    EXPECT_EQ(list.patterns(), std::vector<std::string>{"one"});
}

TEST(DefaultSpecification, IsUsedByNothing)
{
    setenv("QN_TR_SPOOL", "p:ON:8:/dev/null", 1);
    char name[4096];
    ASSERT_EQ(tr_get_filename_1(name), 0);
    const trace_spool_spec_t zero{};
    EXPECT_EQ(std::memcmp(&dfltSpoolSpec, &zero, sizeof zero), 0);
}
} // namespace
