// Specifications from the trace sections of the configuration file.
#include <ostream>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

using lines = std::vector<std::string>;

struct outcome {
    qn_int32_t status = -1;
    specifications list;
};

// What spool_conf_file makes of a file, within a /var of its own.
void expect_from(const std::string &text, const std::function<void(outcome &)> &check)
{
    expect_in_private_var([&] {
        write_conf(text);
        outcome read;
        read.status = spool_conf_file(&read.list.first, &read.list.last);
        check(read);
    });
}

TEST(FileSource, TakesEachTraceSectionInOrder)
{
    const std::string text =
        section("first", {"pat = /x/.*", "dest = /var/spool/a", "spooling = ON", "pages = 10", "size = 262144"}) +
        section("second", {"pat = /y/.*", "dest = /var/spool/b", "spooling = OFF"});
    expect_from(text, [](outcome &read) {
        EXPECT_EQ(read.status, 0);
        EXPECT_EQ(read.list.patterns(), (lines{"/x/.*", "/y/.*"}));
        ASSERT_EQ(read.list.all().size(), 2U);
        EXPECT_STREQ(read.list.first->dest, "/var/spool/a");
        EXPECT_EQ(read.list.first->onoff, 1);
        EXPECT_EQ(read.list.first->pages, 10U);
        EXPECT_EQ(read.list.first->pg_size, 262144U);
        EXPECT_STREQ(read.list.last->dest, "/var/spool/b");
        EXPECT_EQ(read.list.last->onoff, 0);
        EXPECT_EQ(read.list.last->pages, 8U);
        EXPECT_EQ(read.list.last->pg_size, 262144U);
    });
}

TEST(FileSource, TakesNothingFromOtherSections)
{
    const std::string text = section("default", {"tracesize = 5242880", "spooling = ON", "dest = /var/spool/x"}) +
                             section("traces", {"pat = a"}) +
                             section("spoolarea_main", {"spool_dir = /d", "cleanup = ON"});
    expect_from(text, [](outcome &read) {
        EXPECT_EQ(read.status, 0);
        EXPECT_EQ(read.list.patterns(), lines{"a"});
    });
}

// Its destination and its switch are nobody's.
TEST(FileSource, TakesOnlyTheTraceSizeFromTheDefaultSection)
{
    const std::string text = section("default", {"tracesize = 5242880", "spooling = ON", "dest = /var/spool/x"}) +
                             section("traces", {"pat = a"});
    expect_from(text, [](outcome &read) {
        ASSERT_EQ(read.list.all().size(), 1U);
        EXPECT_EQ(read.list.first->pages, 20U);
        EXPECT_EQ(read.list.first->onoff, 0);
        EXPECT_STREQ(read.list.first->dest, "/dev/null");
    });
}

TEST(FileSource, TakesNothingFromAFaultySection)
{
    const std::string text =
        section("faulty", {"pages = 3", "size = 10 MB", "pat = lost"}) + section("sound", {"pat = a", "dest = /d"});
    expect_from(text, [](outcome &read) {
        EXPECT_EQ(read.status, 0);
        EXPECT_EQ(read.list.patterns(), lines{"a"});
    });
}

TEST(FileSource, IsEmptyWithAnEmptyFile)
{
    expect_from("", [](outcome &read) {
        EXPECT_EQ(read.status, 0);
        EXPECT_EQ(read.list.first, nullptr);
        EXPECT_EQ(read.list.last, nullptr);
    });
}

TEST(FileSource, IsEmptyWithoutAFile)
{
    expect_in_private_var([] {
        specifications list;
        EXPECT_EQ(spool_conf_file(&list.first, &list.last), 48);
        EXPECT_EQ(list.first, nullptr);
    });
}

TEST(FileSource, AppendsToWhatIsThere)
{
    expect_in_private_var([] {
        write_conf(section("traces", {"pat = a"}));
        specifications list;
        list.add("before");
        EXPECT_EQ(spool_conf_file(&list.first, &list.last), 0);
        EXPECT_EQ(list.patterns(), (lines{"before", "a"}));
    });
}

struct shape {
    lines given;
    qn_uint32_t pages;
};

void PrintTo(const shape &shape, std::ostream *out)
{
    for (const std::string &line : shape.given) *out << line << "; ";
}

class SectionShape : public testing::TestWithParam<shape>
{
};

TEST_P(SectionShape, HasAtLeastEightPagesOfOneSize)
{
    lines given = GetParam().given;
    given.insert(given.begin(), "pat = a");
    expect_from(section("traces", given), [](outcome &read) {
        ASSERT_EQ(read.list.all().size(), 1U);
        EXPECT_EQ(read.list.first->pages, GetParam().pages);
        EXPECT_EQ(read.list.first->pg_size, 262144U);
    });
}

INSTANTIATE_TEST_SUITE_P(Values, SectionShape,
                         testing::Values(shape{{}, 8}, shape{{"pages = 2", "size = 1000"}, 8},
                                         shape{{"pages = 40", "size = 262144"}, 40},
                                         shape{{"pages = 2", "size = 1048576"}, 12}, // of three pages
                                         shape{{"pages = 1024", "size = 1"}, 16},    // of 4096 bytes
                                         shape{{"pages = 10", "size = 300000"}, 11}, // what fits into 3000000
                                         shape{{"pages = x", "size = 1048576"}, 12},
                                         shape{{"pages = 40", "size = 262144", "tracesize = 1"}, 8},
                                         shape{{"pages = 40", "size = 262144", "tracesize = 2097151"}, 8},
                                         shape{{"tracesize = 2097152"}, 8}, shape{{"tracesize = 2359295"}, 8},
                                         shape{{"tracesize = 2359296"}, 9}, shape{{"tracesize = 5242880"}, 20}));

struct switch_text {
    const char *given;
    qn_int32_t onoff;
};

void PrintTo(const switch_text &text, std::ostream *out) { *out << text.given; }

class SectionSwitch : public testing::TestWithParam<switch_text>
{
};

TEST_P(SectionSwitch, IsOnOnlyWhenItSaysOn)
{
    expect_from(section("traces", {"pat = a", std::string("spooling = ") + GetParam().given}), [](outcome &read) {
        ASSERT_EQ(read.list.all().size(), 1U);
        EXPECT_EQ(read.list.first->onoff, GetParam().onoff);
    });
}

INSTANTIATE_TEST_SUITE_P(Values, SectionSwitch,
                         testing::Values(switch_text{"ON", 1}, switch_text{"on", 1}, switch_text{"oN", 1},
                                         switch_text{"OFF", 0}, switch_text{"YES", 0}, switch_text{"ONE", 0},
                                         switch_text{"O", 0}, switch_text{"1", 0}));

// The interval key is one that the reader knows and the interpreter does not look at.
TEST(FileSource, SyncsHourlyWhateverTheSectionSays)
{
    expect_from(section("traces", {"pat = a", "sync_interval = 60"}), [](outcome &read) {
        ASSERT_EQ(read.list.all().size(), 1U);
        EXPECT_EQ(read.list.first->sync_interval, 3600U);
    });
}

// The reader accepts the key in any case, the interpreter looks for it in lower case.
TEST(FileSource, HasAnEmptyPatternForAKeyInCapitals)
{
    expect_from(section("traces", {"PAT = a", "dest = /d"}), [](outcome &read) {
        ASSERT_EQ(read.list.all().size(), 1U);
        EXPECT_STREQ(read.list.first->pattern, "");
    });
}

TEST(FileSource, HasATwinForAClusterName)
{
    be_in_cluster("c1", "id1");
    expect_from(section("traces", {"pat = /var/qn/c1/.*", "spooling = ON"}), [](outcome &read) {
        EXPECT_EQ(read.status, 0);
        EXPECT_EQ(read.list.patterns(), (lines{"/var/qn/c1/.*", "/var/qn/id1/.*"}));
    });
}

TEST(FileSource, KeepsWhatWasReadBeforeMemoryRanOut)
{
    int made = 0;
    calls().calloc = [&](size_t count, size_t size) -> void * {
        if (count * size == sizeof(trace_spool_spec_t) && ++made == 2) return nullptr;
        return __real_calloc(count, size);
    };
    expect_from(section("a", {"pat = a"}) + section("b", {"pat = b"}) + section("c", {"pat = c"}), [](outcome &read) {
        EXPECT_EQ(read.status, 47);
        EXPECT_EQ(read.list.patterns(), lines{"a"});
        EXPECT_EQ(last_error().code, 14);
    });
}

TEST(FileSource, GivesNothingWhenASectionWasLeftOutForWantOfMemory)
{
    int made = 0;
    calls().calloc = [&](size_t count, size_t size) -> void * {
        if (count * size == sizeof(trace_config_element_t) && ++made == 2) return nullptr;
        return __real_calloc(count, size);
    };
    expect_from(section("a", {"pat = a"}) + section("b", {"pat = b"}) + section("c", {"pat = c"}), [](outcome &read) {
        EXPECT_EQ(read.status, 14);
        EXPECT_EQ(read.list.patterns(), lines{});
        EXPECT_EQ(last_error().code, 14);
    });
}

TEST(FileSource, TellsItsStatus)
{
    debug_on();
    expect_from(section("traces", {"pat = a"}),
                [](outcome &) { EXPECT_TRUE(system_log_has(LOG_WARNING, "Leaving spool_conf_file: 0 n")); });
}

TEST(FileSource, TellsTheStatusOfAMissingFile)
{
    debug_on();
    expect_in_private_var([] {
        specifications list;
        spool_conf_file(&list.first, &list.last);
        EXPECT_TRUE(system_log_has(LOG_WARNING, "Leaving spool_conf_file: 48 n"));
    });
}

TEST(FileSource, IsSilentBelowLevelEight)
{
    global_debug_level = 7;
    expect_from(section("traces", {"pat = a"}), [](outcome &) { EXPECT_TRUE(system_log().empty()); });
}
} // namespace
