// Which specification a trace is bound to, and what that does to the one it had.
#include <cstring>
#include <filesystem>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

class Binding : public testing::Test
{
protected:
    Binding()
    {
        be_on_a_known_node();
        anchor = anchor_for(folder / "a.trc");
    }
    ~Binding() override { anchor->spool = nullptr; }

    trace_spool_spec_t *process()
    {
        const qn::tr::global_lock global;
        const qn::tr::anchor_set_lock set(anchor);
        return process_spool_spec(anchor, list.first);
    }
    trace_spool_spec_t *process_again()
    {
        anchor->bSpoolProcessed = 0;
        return process();
    }

    scratch folder;
    specifications list;
    no_spool_thread thread;
    trace_anchor_t *anchor = nullptr;
};

TEST_F(Binding, IsToTheMatchingSpecification)
{
    list.add("b.trc");
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x");
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, spec);
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
    EXPECT_EQ(spec->dir, folder / "x/" + node_path);
}

TEST_F(Binding, StartsTheSpoolThreadOnce)
{
    list.add("a.trc");
    process();
    EXPECT_EQ(thread.attempts(), 1);
    process_again();
    EXPECT_EQ(thread.attempts(), 1);
}

TEST_F(Binding, IsNotLookedForTwice)
{
    anchor->bSpoolProcessed = 1;
    list.add("a.trc");
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(thread.attempts(), 0);
}

TEST_F(Binding, SwitchesAPatternThatIsOffOnWithoutCopies)
{
    trace_spool_spec_t *spec = list.add("a.trc", "/somewhere", 8, 0);
    char made[] = "/made/before";
    spec->dir = made;
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, spec);
    EXPECT_EQ(spec->onoff, 1);
    EXPECT_STREQ(spec->dest, "/dev/null");
    EXPECT_EQ(thread.attempts(), 1);
}

TEST_F(Binding, KeepsTheDestinationOfAPatternThatIsOn)
{
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x");
    process();
    EXPECT_EQ(spec->dest, folder / "x/" + node_path);
}

TEST_F(Binding, MovesToTheSpecificationThatMatchesNow)
{
    trace_spool_spec_t *first = list.add("a.trc");
    process();
    ASSERT_EQ(anchor->spool, first);
    std::strcpy(first->pattern, "b.trc");
    trace_spool_spec_t *second = list.add("a.trc");
    EXPECT_EQ(process_again(), nullptr) << "nothing is to be kept";
    EXPECT_EQ(anchor->spool, second);
    EXPECT_STREQ(first->dest, "/dev/null");
}

TEST_F(Binding, GivesBackASpecificationThatNoLongerMatches)
{
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x", 9);
    process();
    std::strcpy(spec->pattern, "b.trc");
    EXPECT_EQ(process_again(), spec);
    EXPECT_EQ(anchor->spool, spec) << "the trace keeps its pages";
    EXPECT_EQ(spec->pages, 9U);
    EXPECT_EQ(spec->onoff, 1);
    EXPECT_STREQ(spec->dest, "/dev/null");
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
}

TEST_F(Binding, TellsThatASpecificationNoLongerMatches)
{
    trace_spool_spec_t *spec = list.add("a.trc");
    process();
    std::strcpy(spec->pattern, "b.trc");
    list.add("c.trc");
    debug_on();
    process_again();
    EXPECT_TRUE(system_log_has(LOG_WARNING, "NOT matched: '" + folder / "a.trc" + "' on 'b.trc'\n"));
}

TEST_F(Binding, MayLoseAllSpecifications)
{
    specifications other;
    anchor->spool = other.add("a.trc");
    debug_on();
    EXPECT_EQ(process(), other.first);
    EXPECT_STREQ(other.first->dest, "/dev/null");
}

TEST_F(Binding, IsToNothingWithoutAMatch)
{
    list.add("b.trc");
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
    EXPECT_EQ(thread.attempts(), 0);
}

TEST_F(Binding, TellsThatThereIsNoMatch)
{
    list.add("b.trc");
    list.add("c.trc");
    debug_on();
    process();
    EXPECT_TRUE(system_log_has(LOG_WARNING, "NOT matched: '" + folder / "a.trc" + "' on 'b.trc'\n"));
}

TEST_F(Binding, IsToNothingWithoutSpecifications)
{
    debug_on();
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(anchor->bSpoolProcessed, 1);
}

TEST_F(Binding, IsToNothingWhenTheDirectoryCannotBeMade)
{
    write_file(folder / "x", "in the way");
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x");
    EXPECT_EQ(process(), nullptr);
    EXPECT_EQ(anchor->spool, nullptr);
    EXPECT_EQ(spec->onoff, 0);
}

// The spec that cannot be used is looked for again: the directory may have been repaired.
TEST_F(Binding, IsMadeOnceTheDirectoryCanBeMade)
{
    write_file(folder / "x", "in the way");
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x/y");
    process();
    ASSERT_EQ(anchor->spool, nullptr);
    std::filesystem::remove(folder / "x");
    EXPECT_EQ(process_again(), nullptr);
    EXPECT_EQ(anchor->spool, spec);
}

TEST_F(Binding, BringsAPageSetAboutWhenTheTraceStarts)
{
    trace_spool_spec_t *spec = list.add("a.trc", "/dev/null", 3);
    spec->pg_size = 65536;
    install(list);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->spool, spec);
    EXPECT_STREQ(anchor->fileName, (folder / "a.trc.1.sp").c_str());
    EXPECT_TRUE(exists(folder / "a.trc.3.sp"));
    EXPECT_FALSE(exists(folder / "a.trc.4.sp"));
    stop(anchor);
}

TEST_F(Binding, BringsAPageSetAboutForAPatternThatIsOff)
{
    trace_spool_spec_t *spec = list.add("a.trc", folder / "x", 3, 0);
    spec->pg_size = 65536;
    install(list);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_TRUE(exists(folder / "a.trc.3.sp"));
    EXPECT_STREQ(spec->dest, "/dev/null");
    stop(anchor);
}

TEST_F(Binding, LeavesATraceWithoutAMatchASingleFile)
{
    list.add("b.trc");
    install(list);
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(anchor->nextPage, nullptr);
    EXPECT_TRUE(exists(folder / "a.trc"));
    stop(anchor);
}
} // namespace
