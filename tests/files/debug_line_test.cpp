// The debug lines of a start and a stop: their texts, their order, their priority, and the level that asks for them.
#include <regex>

#include <sys/syslog.h>

#include <gtest/gtest.h>

#include "files/support_calls.h"
#include "files/support_files.h"

namespace
{
using namespace qn::test;

using lines = std::vector<std::string>;

class DebugLines : public testing::Test
{
protected:
    void SetUp() override
    {
        calls().proc_args = [](pid_t, char *buffer, size_t) {
            std::strcpy(buffer, "/opt/bin/daemon");
            return 0;
        };
        anchor = anchor_for(name);
        debug_on();
    }

    // The lines so far but the one that tells the time.
    static lines without_time()
    {
        lines texts = debug_lines();
        std::erase_if(texts, [](const std::string &text) { return text.rfind(" +++ ", 0) == 0; });
        return texts;
    }

    scratch folder;
    std::string name = folder / "f";
    trace_anchor_t *anchor = nullptr;
};

TEST_F(DebugLines, TellTheWholeStartOfANewFile)
{
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(without_time(), (lines{"\ttrace: uSize(65536) != statData.st_size(0) for " + name + "\n",
                                     "\ttrace: reInit for " + name + " due to size\n", "baseName: daemon\n",
                                     "\ttrace: reInit block for " + name + "\n", "baseProgName in header: daemon\n",
                                     "<<start_trace exit for " + name + "\n\n"}));
    stop(anchor);
}

TEST_F(DebugLines, TellThatAFileIsReused)
{
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    clear_system_log();
    ASSERT_EQ(start(anchor), 0);
    EXPECT_EQ(without_time(), (lines{"baseName: daemon\n", "\ttrace: Re-using existing file.\n",
                                     "baseProgName in header: daemon\n", "<<start_trace exit for " + name + "\n\n"}));
    stop(anchor);
}

TEST_F(DebugLines, TellTheStop)
{
    ASSERT_EQ(start(anchor), 0);
    clear_system_log();
    stop(anchor);
    EXPECT_EQ(debug_lines(), (lines{"*** stop_trace for " + name, "**@ stop_trace_page enter for " + name + "\n",
                                    "**@ stop_trace_page - msync(MS_SYNC) for " + name + "\n",
                                    "spool_dequeue_element (" + name + ")\n", "spool_dequeue_element before: EMPTY\n",
                                    "spool_dequeue_element after: EMPTY\n"}));
}

TEST_F(DebugLines, TellTheTimeOfTheStart)
{
    ASSERT_EQ(start(anchor), 0);
    const std::regex expected(R"( \+\+\+ (.*) \(65536\) started at \d{4}-\d\d-\d\d \d\d:\d\d:\d\d\.\d{1,6}\n)");
    int found = 0;
    for (const std::string &text : debug_lines()) {
        std::smatch match;
        if (!std::regex_match(text, match, expected)) continue;
        ++found;
        EXPECT_EQ(match[1], name);
    }
    EXPECT_EQ(found, 1);
    EXPECT_EQ(trace_image::of_file(name).records().size(), 1U) << "nothing is written to the file for it";
    stop(anchor);
}

TEST_F(DebugLines, HavePriorityWarning)
{
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    ASSERT_FALSE(system_log().empty());
    for (const log_line &line : system_log()) EXPECT_EQ(line.priority, LOG_WARNING) << line.text;
}

TEST_F(DebugLines, AreNotWrittenBelowLevelEight)
{
    global_debug_level = 7;
    ASSERT_EQ(start(anchor), 0);
    stop(anchor);
    EXPECT_TRUE(system_log().empty());
}

TEST_F(DebugLines, NameTheWholeBaseOfWhichAHeaderHoldsTheBeginning)
{
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, ("/opt/bin/" + std::string(60, 'b')).c_str());
        return 0;
    };
    ASSERT_EQ(start(anchor), 0);
    EXPECT_TRUE(system_log_has("baseName: " + std::string(60, 'b') + "\n"));
    EXPECT_TRUE(system_log_has("baseProgName in header: " + std::string(47, 'b') + "\n"));
    stop(anchor);
}

TEST_F(DebugLines, NameTheBaseOnlyOfATextWithASlash)
{
    calls().proc_args = [](pid_t, char *buffer, size_t) {
        std::strcpy(buffer, "daemon");
        return 0;
    };
    ASSERT_EQ(start(anchor), 0);
    EXPECT_FALSE(system_log_has("baseName: daemon\n"));
    EXPECT_TRUE(system_log_has("baseProgName in header: daemon\n"));
    stop(anchor);
}
} // namespace
