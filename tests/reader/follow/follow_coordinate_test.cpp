// qntrace follow --coordinate: writers wait for it, and go on without it.
#include <gtest/gtest.h>

#include <csignal>

#include "reader/follow/follower.h"
#include "reader/follow/live_writer.h"
#include "support/trace_image.h"

namespace qn::test
{
namespace
{

constexpr std::uint32_t none_held = 1;
constexpr std::uint64_t several_rounds = 30'000;

struct FollowCoordinate : testing::Test {
    std::uint32_t held() const { return trace_image::of_file(file).seq_lock(); }

    scratch_folder folder;
    std::string file = folder.path("app.trc");
};

TEST_F(FollowCoordinate, LosesNothingOfAFastWriter)
{
    live_writer writer(file);
    auto running = follower::of({"--coordinate", "--until-exit", "--interval", "5ms", file});
    writer.write(50'000);
    writer.end();
    const auto ended = running.ended();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_EQ(running.values(), counted(0, 50'000));
}

TEST_F(FollowCoordinate, HoldsTheNextRecordAndLetsItGoAtItsEnd)
{
    live_writer writer(file);
    auto running = follower::of({"--coordinate", file});
    writer.write(10);
    running.wait_for_value(9);
    const auto last = trace_image::of_file(file).records().back().sequence();
    while (held() != last + 2) sched_yield();
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(held(), none_held);
}

TEST_F(FollowCoordinate, CostsTheWriterOneWaitWhenItIsStopped)
{
    live_writer writer(file);
    auto running = follower::of({"--coordinate", file});
    running.send(SIGSTOP);
    running.wait_until_stopped();
    EXPECT_NE(held(), none_held);
    writer.write(several_rounds);
    EXPECT_EQ(held(), none_held); // the writer has taken it back, and has not waited again
    running.send(SIGCONT);
    running.wait_for_value(several_rounds - 1);
    EXPECT_EQ(running.interrupted().status, 1); // and what was overwritten is told
}

TEST_F(FollowCoordinate, CostsTheWriterOneWaitWhenItIsKilled)
{
    live_writer writer(file);
    auto running = follower::of({"--coordinate", file});
    running.send(SIGKILL);
    EXPECT_EQ(running.ended().signal, SIGKILL);
    EXPECT_NE(held(), none_held);
    writer.write(several_rounds);
    EXPECT_EQ(held(), none_held);
    EXPECT_EQ(trace_image::of_file(file).records().back().u64(36), several_rounds - 1);
}

TEST_F(FollowCoordinate, IsGrantedToOneProcessAtATime)
{
    live_writer writer(file);
    auto running = follower::of({"--coordinate", file});
    const auto refused = run_qntrace({"follow", "--coordinate", file});
    EXPECT_EQ(refused.status, 3);
    EXPECT_NE(refused.err.find("another qntrace follows with --coordinate"), std::string::npos) << refused.err;
    writer.write(1);
    running.wait_for_value(0);
}

TEST_F(FollowCoordinate, IsNotDoneUnlessItIsAskedFor)
{
    live_writer writer(file);
    auto running = follower::of({file});
    writer.write(10);
    running.wait_for_value(9);
    EXPECT_EQ(held(), none_held);
}

} // namespace
} // namespace qn::test
