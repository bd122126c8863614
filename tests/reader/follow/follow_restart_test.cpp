// qntrace follow across runs of the program: on the same file, on one that takes its place, on one that was emptied.
#include <gtest/gtest.h>

#include <filesystem>

#include "reader/follow/follower.h"
#include "reader/follow/live_writer.h"

namespace qn::test
{
namespace
{

struct FollowRestart : testing::Test {
    // A follower that has seen ten records of a program that has ended then.
    follower behind_first_run() const
    {
        live_writer writer(file);
        auto running = follower::of({file});
        writer.write(10);
        running.wait_for_value(9);
        return running;
    }

    scratch_folder folder;
    std::string file = folder.path("app.trc");
};

TEST_F(FollowRestart, GoesOnInTheSameFile)
{
    auto running = behind_first_run();
    live_writer(file, 10).write(10);
    running.wait_for_value(19);
    const auto ended = running.interrupted();
    EXPECT_EQ(ended.status, 0);
    EXPECT_EQ(ended.err, "");
    EXPECT_EQ(running.values(), counted(0, 20));
    EXPECT_NE(ended.out.find("\"kind\":\"start\""), std::string::npos);
}

TEST_F(FollowRestart, GoesOnInTheFileThatTakesThePlaceOfOneThatWasRenamed)
{
    auto running = behind_first_run();
    std::filesystem::rename(file, file + ".save");
    live_writer(file, 10).write(10);
    running.wait_for_value(19);
    const auto ended = running.interrupted();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_NE(ended.err.find(file + ": was replaced by a new file\n"), std::string::npos) << ended.err;
    EXPECT_EQ(running.values(), counted(0, 20));
}

TEST_F(FollowRestart, ShowsWhatIsWrittenBehindARenaming)
{
    live_writer writer(file);
    auto running = follower::of({file});
    std::filesystem::rename(file, file + ".save");
    running.wait_for_err("was removed; waiting for a new one");
    writer.write(5);
    running.wait_for_value(4);
    live_writer(file, 5).write(5);
    running.wait_for_value(9);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(0, 10));
}

TEST_F(FollowRestart, WaitsForAFileThatWasRemoved)
{
    auto running = behind_first_run();
    std::filesystem::remove(file);
    running.wait_for_err("was removed; waiting for a new one");
    live_writer(file, 10).write(10);
    running.wait_for_value(19);
    EXPECT_EQ(running.interrupted().status, 0);
    EXPECT_EQ(running.values(), counted(0, 20));
}

TEST_F(FollowRestart, GoesOnInAFileThatWasEmptied)
{
    auto running = behind_first_run();
    std::filesystem::resize_file(file, 0);
    live_writer(file, 10).write(10);
    running.wait_for_value(19);
    const auto ended = running.interrupted();
    EXPECT_EQ(ended.status, 0) << ended.err;
    EXPECT_NE(ended.err.find(file + ": was started anew\n"), std::string::npos) << ended.err;
    EXPECT_EQ(running.values(), counted(0, 20));
}

TEST_F(FollowRestart, TellsThatTheFileWasCut)
{
    auto running = behind_first_run();
    std::filesystem::resize_file(file, 4096);
    running.wait_for_err(file + ": was cut to 4096 bytes\n");
    EXPECT_EQ(running.interrupted().status, 1);
}

} // namespace
} // namespace qn::test
