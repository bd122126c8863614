// Allowing and forbidding traces of several pages.
#include <cstdlib>
#include <filesystem>

#include <gtest/gtest.h>

#include "files/support_files.h"
#include "support/private_var.h"

namespace
{
using namespace qn::test;

// The body is run with an empty /var: the machine's marker file is nobody's business.
void expect_in_private_var(const std::function<void()> &body)
{
    EXPECT_TRUE(in_private_var([&] {
        body();
        return !testing::Test::HasFailure();
    }));
}

void make_marker()
{
    std::filesystem::create_directories("/var/qn/cfg");
    write_file("/var/qn/cfg/disable_multipage_trace_logic", "");
}

TEST(Multipage, IsOffUnlessItIsSwitchedOn)
{
    char name[4096];
    EXPECT_EQ(tr_get_filename_1(name), 0);
    EXPECT_EQ(anchors.bMultipageEnabled, 0);
}

TEST(Multipage, IsSwitchedOnAndOff)
{
    expect_in_private_var([] {
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 1);
        EXPECT_EQ(tr_set_multipage_1(0), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 0);
    });
}

TEST(Multipage, IsInitialisedByTheCall)
{
    expect_in_private_var([] {
        setenv("QN_TR_FILENAME", "/x", 1);
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_STREQ(anchors.fileName, "/x");
        EXPECT_EQ(anchors.bInitialized, 1);
    });
}

TEST(Multipage, IsForbiddenByTheMarkerFile)
{
    expect_in_private_var([] {
        make_marker();
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 0);
    });
}

TEST(Multipage, IsSwitchedOffByTheMarkerFileThatCameLater)
{
    expect_in_private_var([] {
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        make_marker();
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 0);
        std::filesystem::remove("/var/qn/cfg/disable_multipage_trace_logic");
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 1);
    });
}

class ForbiddingValue : public testing::TestWithParam<const char *>
{
};

TEST_P(ForbiddingValue, ForbidsByItsPresence)
{
    expect_in_private_var([] {
        setenv("QN_TR_DISABLE_DEFAULT_MULTIPAGE", GetParam(), 1);
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 0);
        unsetenv("QN_TR_DISABLE_DEFAULT_MULTIPAGE");
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 1);
    });
}

INSTANTIATE_TEST_SUITE_P(Values, ForbiddingValue, testing::Values("", "0", "1", "no"));

TEST(Multipage, IsNotChangedOnceTracingIsStopped)
{
    expect_in_private_var([] {
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        global_stop_trace();
        EXPECT_EQ(tr_set_multipage_1(0), 0);
        EXPECT_EQ(anchors.bMultipageEnabled, 1);
    });
}

TEST(Multipage, IsNotInitialisedOnceTracingIsStopped)
{
    global_stop_trace();
    EXPECT_EQ(tr_set_multipage_1(1), 0);
    EXPECT_EQ(anchors.bInitialized, 0);
}

TEST(Multipage, IsSwitchedWithoutALookAtTheErrorRecord)
{
    expect_in_private_var([] {
        leave_marker();
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_TRUE(marker_is_there());
    });
}

TEST(Multipage, IsSwitchedAlsoWithoutTheLock)
{
    expect_in_private_var([] {
        {
            const exhausted_mutex global(anchors.anchorMutex);
            EXPECT_EQ(tr_set_multipage_1(1), 0);
        }
        EXPECT_EQ(anchors.bMultipageEnabled, 1);
        EXPECT_TRUE(is_free(anchors.anchorMutex)) << "what was not taken is not released";
    });
}

TEST(Multipage, TellsTheValueThatItWasCalledWith)
{
    expect_in_private_var([] {
        setenv("QN_TR_DISABLE_DEFAULT_MULTIPAGE", "", 1);
        debug_on();
        EXPECT_EQ(tr_set_multipage_1(1), 0);
        EXPECT_TRUE(system_log_has("tr_set_multipage has been called with value : 1\n"));
    });
}
} // namespace
