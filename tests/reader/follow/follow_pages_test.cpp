// qntrace follow with the pages of a page set, which a program takes one after the other.
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <cstdint>

#include "reader/follow/follower.h"
#include "reader/follow/live_writer.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

struct FollowPages : testing::Test {
    scratch_folder folder;
    std::string trace = folder.path("app.trc");
    std::string spool = folder.path("spool");
};

// Ten pages' worth, so that pages are written again.
TEST_F(FollowPages, ShowsAllRecordsAcrossThePages)
{
    live_writer writer(trace, 0, spool);
    auto running = follower::of({"--until-exit", trace});
    for (std::uint64_t written = 1000; written <= 60'000; written += 1000) {
        writer.write(1000);
        running.wait_for_value(written - 1);
    }
    writer.end();
    const auto ended = running.ended();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(running.values(), counted(0, 60'000));
}

TEST_F(FollowPages, BeginsWithTheOldestOfThemOnDemand)
{
    live_writer writer(trace, 0, spool);
    writer.write(20'000);
    auto running = follower::of({"--from-start", trace});
    writer.write(1000);
    running.wait_for_value(20'999);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(0, 21'000));
}

TEST_F(FollowPages, BeginsBehindTheNewestRecordOfAll)
{
    live_writer writer(trace, 0, spool);
    writer.write(20'000);
    auto running = follower::of({trace});
    writer.write(7000);
    running.wait_for_value(26'999);
    EXPECT_EQ(running.values(), counted(20'000, 7000));
}

TEST_F(FollowPages, GoesOnWithTheNextRunOfTheProgram)
{
    auto running = [&] {
        live_writer writer(trace, 0, spool);
        writer.write(7000);
        auto started = follower::of({"--from-start", trace});
        started.wait_for_value(6999);
        return started;
    }();
    live_writer writer(trace, 7000, spool);
    writer.write(7000);
    running.wait_for_value(13'999);
    EXPECT_EQ(running.values(), counted(0, 14'000));
}

TEST_F(FollowPages, TellsThatPagesWereOverwrittenBeforeTheyWereRead)
{
    live_writer writer(trace, 0, spool);
    auto running = follower::of({trace});
    writer.write(10);
    running.wait_for_value(9);
    running.send(SIGSTOP);
    running.wait_until_stopped();
    writer.write(100'000);
    running.send(SIGCONT);
    running.wait_for_value(100'009);
    const auto ended = running.interrupted();
    EXPECT_EQ(ended.status, 1);
    EXPECT_NE(ended.err.find("overwritten before it was read"), std::string::npos) << ended.err;
    const auto values = running.values();
    EXPECT_TRUE(std::is_sorted(values.begin(), values.end()));
    EXPECT_EQ(std::adjacent_find(values.begin(), values.end()), values.end());
    EXPECT_GE(values.size(), 30'000u); // what seven pages hold at least was still there
}

TEST_F(FollowPages, ShowsTheNoteOfAPageThatWasNotCopied)
{
    trace_builder page;
    page.put_u32(48, 0);       // no process
    page.put_u8(192, 1);       // is being written
    page.seq = UINT32_MAX - 1; // so that the note's is 0
    page.add(2, page.body().text("SPOOL: /tmp/app.trc.1.sp not spooled 1 consecutive time"));
    page.add_id(7);
    page.close();
    folder.file("app.trc.1.sp", page.bytes());
    const auto shown = run_qntrace({"follow", "--from-start", "--until-exit", trace});
    EXPECT_EQ(shown.status, 0) << shown.err;
    EXPECT_NE(shown.out.find("not spooled 1 consecutive time"), std::string::npos) << shown.out;
    EXPECT_NE(shown.out.find("id=7"), std::string::npos) << shown.out;
}

} // namespace
} // namespace qn::test
