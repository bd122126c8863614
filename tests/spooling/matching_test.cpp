// Which specification governs a trace file: the pages' names, the order of the list, the directory that it gets.
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class Matching : public testing::Test
{
protected:
    Matching() { be_on_a_known_node(); }
    trace_spool_spec_t *match(const std::string &file) { return match_spool_file_name(file.c_str(), list.first); }

    scratch folder;
    specifications list;
};

struct page_name {
    const char *file;
    const char *matched_as;
};

void PrintTo(const page_name &name, std::ostream *out) { *out << name.file; }

class MatchedName : public Matching, public testing::WithParamInterface<page_name>
{
};

TEST_P(MatchedName, IsTheTracesOwn)
{
    trace_spool_spec_t *spec = list.add("^" + literal_pattern(GetParam().matched_as) + "$");
    EXPECT_EQ(match(GetParam().file), spec);
}

INSTANTIATE_TEST_SUITE_P(
    Values, MatchedName,
    testing::Values(page_name{"/x/a.trc", "/x/a.trc"}, page_name{"/x/a.trc.1.sp", "/x/a.trc"},
                    page_name{"/x/a.trc.12.sp", "/x/a.trc"}, page_name{"/x/a.trc.4294967296.sp", "/x/a.trc"},
                    page_name{"/x/a.1.2.sp", "/x/a.1"}, page_name{"/x/.3.sp", "/x/"}, page_name{".3.sp", ""},
                    page_name{"/x/a.trc.sp", "/x/a.trc.sp"}, page_name{"/x/a.trc..sp", "/x/a.trc..sp"},
                    page_name{"/x/a.trc.x.sp", "/x/a.trc.x.sp"}, page_name{"/x/a.trc12.sp", "/x/a.trc12.sp"},
                    page_name{"/x/a.trc.1x2.sp", "/x/a.trc.1x2.sp"}, page_name{"/x/a.trc.12.sp.", "/x/a.trc.12.sp."},
                    page_name{"/x/a.trc.12.sp.sp", "/x/a.trc.12.sp.sp"}, page_name{"/x/12.sp", "/x/12.sp"},
                    page_name{"12.sp", "12.sp"}, page_name{".sp", ".sp"}, page_name{"", ""}, page_name{"sp", "sp"}));

TEST_F(Matching, GivesThePagesOfATraceWhatTheTraceGets)
{
    trace_spool_spec_t *spec = list.add("a\\.trc$");
    EXPECT_EQ(match("/x/a.trc"), spec);
    EXPECT_EQ(match("/x/a.trc.12.sp"), spec);
    EXPECT_EQ(match("/x/a.trc.sp"), nullptr);
}

TEST_F(Matching, LeavesTheNameAsItWas)
{
    char file[] = "/x/a.trc.12.sp";
    list.add("a");
    match_spool_file_name(file, list.first);
    EXPECT_STREQ(file, "/x/a.trc.12.sp");
}

TEST_F(Matching, FindsNothingInAnEmptyList) { EXPECT_EQ(match("/x/a"), nullptr); }

TEST_F(Matching, TakesTheFirstInListOrder)
{
    list.add("nothing like it");
    trace_spool_spec_t *first = list.add("a");
    list.add("^/x/a$");
    EXPECT_EQ(match("/x/a"), first);
}

TEST_F(Matching, PassesOverOneWithASinglePage)
{
    list.add("a", "/dev/null", 1);
    list.add("a", "/dev/null", 0);
    trace_spool_spec_t *third = list.add("a", "/dev/null", 2);
    EXPECT_EQ(match("/x/a"), third);
}

TEST_F(Matching, FindsNothingWhenEachHasASinglePage)
{
    list.add("a", "/dev/null", 1);
    list.add("a", "/dev/null", 0);
    EXPECT_EQ(match("/x/a"), nullptr);
}

TEST_F(Matching, TakesOneThatIsOff)
{
    trace_spool_spec_t *spec = list.add("a", "/dev/null", 8, 0);
    EXPECT_EQ(match("/x/a"), spec);
    EXPECT_EQ(spec->onoff, 0);
}

TEST_F(Matching, TakesPatternsAsExtendedAndWithoutRegardToCase)
{
    trace_spool_spec_t *spec = list.add("/(APP|sys)+\\.TRC$");
    EXPECT_EQ(match("/x/app.trc"), spec);
    EXPECT_EQ(match("/x/SysApp.Trc"), spec);
    EXPECT_EQ(match("/x/a.trc"), nullptr);
}

TEST_F(Matching, TakesPatternsLineByLine)
{
    trace_spool_spec_t *spec = list.add("^b$");
    EXPECT_EQ(match("a\nb\nc"), spec);
}

TEST_F(Matching, NeedsOnlyAPartOfTheName)
{
    trace_spool_spec_t *spec = list.add("log");
    EXPECT_EQ(match("/x/log/a"), spec);
}

TEST_F(Matching, PassesOverAnInvalidPattern)
{
    debug_on();
    list.add("a(");
    trace_spool_spec_t *second = list.add("a");
    EXPECT_EQ(match("/x/a"), second);
    EXPECT_TRUE(system_log_has(LOG_ERR, "Invalid pattern: 'a('\n"));
}

TEST_F(Matching, IsSilentAboutAnInvalidPatternBelowLevelEight)
{
    global_debug_level = 7;
    list.add("a(");
    EXPECT_EQ(match("/x/a"), nullptr);
    EXPECT_TRUE(system_log().empty());
}

TEST_F(Matching, TellsWhatItTries)
{
    list.add("b");
    list.add("a", "/dev/null", 1);
    list.add("a");
    list.add("never tried");
    debug_on();
    match("/x/a.3.sp");
    const auto tried = debug_lines();
    const std::vector<std::string> expected{
        "match_spool_file_name: checking '/x/a' on 'b'\n", "match_spool_file_name: checking '/x/a' on 'a'\n",
        "Matched: '/x/a' on 'a'\n", "match_spool_file_name: checking '/x/a' on 'a'\n", "Matched: '/x/a' on 'a'\n"};
    ASSERT_GE(tried.size(), expected.size());
    EXPECT_EQ(std::vector<std::string>(tried.begin(), tried.begin() + 5), expected);
    for (const log_line &line : system_log()) EXPECT_NE(line.text.find("never"), 0U) << line.text;
    EXPECT_TRUE(system_log_has(LOG_WARNING, expected[2]));
}

TEST_F(Matching, MakesTheSpoolDirectory)
{
    trace_spool_spec_t *spec = list.add("a", folder / "x");
    ASSERT_EQ(match("/x/a"), spec);
    EXPECT_EQ(spec->dir, spec->dest);
    EXPECT_EQ(spec->dest, folder / "x/" + node_path);
    EXPECT_TRUE(std::filesystem::is_directory(spec->dir));
}

TEST_F(Matching, MakesTheSpoolDirectoryOnce)
{
    trace_spool_spec_t *spec = list.add("a", folder / "x");
    ASSERT_EQ(match("/x/a"), spec);
    std::filesystem::remove_all(folder / "x");
    EXPECT_EQ(match("/x/a.2.sp"), spec);
    EXPECT_EQ(spec->dest, folder / "x/" + node_path);
    EXPECT_FALSE(exists(folder / "x"));
}

TEST_F(Matching, MakesNoDirectoryForOneThatIsPassedOver)
{
    list.add("a", folder / "single", 1);
    list.add("b", folder / "other");
    EXPECT_EQ(match("/x/a"), nullptr);
    EXPECT_TRUE(entries_of(folder.folder()).empty());
}

TEST_F(Matching, SharesTheDirectoryOfAnEarlierOneWithThatDestination)
{
    trace_spool_spec_t *first = list.add("one");
    trace_spool_spec_t *second = list.add("two");
    ASSERT_EQ(match("/x/one"), first);
    ASSERT_EQ(match("/x/two"), second);
    EXPECT_EQ(first->dir, first->dest);
    EXPECT_EQ(second->dir, first->dest);
}

TEST_F(Matching, SharesTheDirectoryOfALaterOneToo)
{
    trace_spool_spec_t *first = list.add("one", folder / "x");
    trace_spool_spec_t *second = list.add("two", folder / "x");
    char elsewhere[] = "/elsewhere";
    second->dir = elsewhere;
    ASSERT_EQ(match("/x/one"), first);
    EXPECT_EQ(first->dir, elsewhere);
    EXPECT_EQ(first->dest, folder / "x");
    EXPECT_FALSE(exists(folder / "x"));
}

TEST_F(Matching, SharesNoDirectoryOfAnotherDestination)
{
    trace_spool_spec_t *first = list.add("one", folder / "X");
    char elsewhere[] = "/elsewhere";
    list.add("two", folder / "x")->dir = elsewhere;
    ASSERT_EQ(match("/x/one"), first);
    EXPECT_EQ(first->dir, first->dest);
}

// The destination of the first has become its whole directory by then, so the second makes its own: the same one.
TEST_F(Matching, LeadsEqualDestinationsToTheSameDirectory)
{
    trace_spool_spec_t *first = list.add("one", folder / "x");
    trace_spool_spec_t *second = list.add("two", folder / "x");
    ASSERT_EQ(match("/x/one"), first);
    ASSERT_EQ(match("/x/two"), second);
    EXPECT_EQ(second->dir, second->dest);
    EXPECT_STREQ(second->dir, first->dir);
}

TEST_F(Matching, SwitchesOffWhatHasNoDirectory)
{
    write_file(folder / "x", "in the way");
    trace_spool_spec_t *spec = list.add("a", folder / "x");
    debug_on();
    EXPECT_EQ(match("/x/a"), nullptr);
    EXPECT_EQ(spec->onoff, 0);
    EXPECT_EQ(spec->dir, nullptr);
    EXPECT_TRUE(
        system_log_has(LOG_ERR, "Could not create or access spooling directory: '" + std::string(spec->dest) + "'\n"));
}

TEST_F(Matching, TakesNoLaterOneForOneThatHasNoDirectory)
{
    write_file(folder / "x", "in the way");
    list.add("a", folder / "x");
    trace_spool_spec_t *second = list.add("a");
    EXPECT_EQ(match("/x/a"), nullptr);
    EXPECT_EQ(second->dir, nullptr);
    EXPECT_EQ(second->onoff, 1);
}
} // namespace
