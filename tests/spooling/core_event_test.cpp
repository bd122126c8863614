// Announcing why the next start is a restart.
#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

TEST(CoreEvent, IsKeptAsCopies)
{
    char file[] = "/tmp/a.trc";
    char message[] = "signal 11";
    EXPECT_EQ(tr_core_event_1(file, message), 0);
    file[0] = message[0] = 'X';
    EXPECT_STREQ(gCoreTrcFile, "/tmp/a.trc");
    EXPECT_STREQ(gCoreMessage, "signal 11");
}

// The earlier ones stay where they are: a start may be reading them.
TEST(CoreEvent, ReplacesTheOneBeforeWithoutTouchingIt)
{
    EXPECT_EQ(tr_core_event_1("/tmp/a.trc", "first"), 0);
    const char *first_file = gCoreTrcFile;
    const char *first_message = gCoreMessage;
    EXPECT_EQ(tr_core_event_1("/tmp/b.trc", "second"), 0);
    EXPECT_STREQ(gCoreTrcFile, "/tmp/b.trc");
    EXPECT_STREQ(gCoreMessage, "second");
    EXPECT_STREQ(first_file, "/tmp/a.trc");
    EXPECT_STREQ(first_message, "first");
}

TEST(CoreEvent, MakesTheNextStartOfThatFileARestart)
{
    const scratch folder;
    EXPECT_EQ(tr_core_event_1((folder / "a").c_str(), "signal 11"), 0);
    trace_anchor_t *crashed = anchor_for(folder / "a");
    trace_anchor_t *other = anchor_for(folder / "b");
    ASSERT_EQ(start(crashed), 0);
    ASSERT_EQ(start(other), 0);

    const auto restarts = trace_image::of_file(folder / "a").records_of(19);
    ASSERT_EQ(restarts.size(), 1U);
    EXPECT_EQ(restarts[0].text(52), "signal 11");
    EXPECT_TRUE(trace_image::of_file(folder / "a").records_of(16).empty());
    EXPECT_EQ(trace_image::of_file(folder / "b").records_of(16).size(), 1U);
    stop(crashed);
    stop(other);
}

// The kinds of the records with which the file is started.
std::vector<uint16_t> kinds_after_start(const std::string &file)
{
    trace_anchor_t *anchor = anchor_for(file);
    EXPECT_EQ(start(anchor), 0);
    std::vector<uint16_t> kinds;
    for (const record_image &record : trace_image::of_file(file).records()) kinds.push_back(record.function());
    stop(anchor);
    return kinds;
}

TEST(CoreEvent, IsTakenBackByOneWithoutAMessage)
{
    const scratch folder;
    EXPECT_EQ(tr_core_event_1((folder / "a").c_str(), "signal 11"), 0);
    EXPECT_EQ(tr_core_event_1((folder / "a").c_str(), nullptr), 0);
    EXPECT_EQ(kinds_after_start(folder / "a"), std::vector<uint16_t>{16});
}

TEST(CoreEvent, IsNotKeptWithoutMemory)
{
    const scratch folder;
    calls().malloc = [](size_t) -> void * { return nullptr; };
    EXPECT_EQ(tr_core_event_1((folder / "a").c_str(), "signal 11"), 0);
    calls() = {};
    EXPECT_EQ(kinds_after_start(folder / "a"), std::vector<uint16_t>{16});
}
} // namespace
