// Which source the default anchor's list is read from, and when.
#include <cstdlib>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

using patterns = std::vector<std::string>;

patterns patterns_read()
{
    patterns list;
    for (const trace_spool_spec_t *spec = anchors.pFirstSpoolSpec; spec != nullptr; spec = spec->pNext)
        list.emplace_back(spec->pattern);
    return list;
}

class SpoolSource : public testing::Test
{
protected:
    static void with_a_file(const std::function<void()> &body)
    {
        expect_in_private_var([&] {
            write_conf(section("traces", {"pat = from_file"}));
            body();
        });
    }
};

TEST_F(SpoolSource, IsTheEnvironmentWhenItIsSet)
{
    with_a_file([] {
        setenv("QN_TR_SPOOL", "a:ON:8:/dev/null,b:OFF:8:/dev/null", 1);
        read_spool_cfg();
        EXPECT_EQ(patterns_read(), (patterns{"a", "b"}));
        ASSERT_NE(anchors.pLastSpoolSpec, nullptr);
        EXPECT_STREQ(anchors.pLastSpoolSpec->pattern, "b");
    });
}

TEST_F(SpoolSource, IsTheEnvironmentAlsoWhenItIsFaulty)
{
    with_a_file([] {
        setenv("QN_TR_SPOOL", "without any colon", 1);
        read_spool_cfg();
        EXPECT_EQ(patterns_read(), patterns{});
    });
}

TEST_F(SpoolSource, KeepsWhatStandsBeforeTheFault)
{
    setenv("QN_TR_SPOOL", "a:ON:8:/dev/null,b:MAYBE:8:/dev/null", 1);
    read_spool_cfg();
    EXPECT_EQ(patterns_read(), patterns{"a"});
}

TEST_F(SpoolSource, IsTheFileWhenTheEnvironmentIsNotSet)
{
    with_a_file([] {
        read_spool_cfg();
        EXPECT_EQ(patterns_read(), patterns{"from_file"});
        EXPECT_EQ(anchors.pLastSpoolSpec, anchors.pFirstSpoolSpec);
    });
}

TEST_F(SpoolSource, IsTheFileWhenTheEnvironmentIsEmpty)
{
    with_a_file([] {
        setenv("QN_TR_SPOOL", "", 1);
        read_spool_cfg();
        EXPECT_EQ(patterns_read(), patterns{"from_file"});
    });
}

TEST_F(SpoolSource, MayBeMissing)
{
    expect_in_private_var([] {
        read_spool_cfg();
        EXPECT_EQ(patterns_read(), patterns{});
    });
}

TEST_F(SpoolSource, IsReadByTheFirstCallThatInitialises)
{
    with_a_file([] {
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        EXPECT_EQ(patterns_read(), patterns{"from_file"});
    });
}

TEST_F(SpoolSource, IsReadOnce)
{
    with_a_file([] {
        ASSERT_EQ(tr_get_spool_dir_1("/tmp/a"), nullptr);
        write_conf(section("traces", {"pat = changed"}));
        char name[4096];
        ASSERT_EQ(tr_get_filename_1(name), 0);
        ASSERT_EQ(tr_get_spool_dir_1("/tmp/a"), nullptr);
        EXPECT_EQ(patterns_read(), patterns{"from_file"});
    });
}
} // namespace
