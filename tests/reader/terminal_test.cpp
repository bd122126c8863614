// What the command does on a terminal: the pager, and the line that tells how far a merge has come.
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <fstream>
#include <string>

#include <sys/stat.h>

#include "reader/program.h"
#include "reader/terminal.h"
#include "reader/trace_builder.h"

namespace qn::test
{
namespace
{

const std::string prefixing = "sed s/^/paged:/";

class Pager : public testing::Test
{
protected:
    Pager()
    {
        trace_builder file(trace_bytes);
        while (file.at + 64 < trace_bytes) file.add_id(1);
        file.close();
        trace = folder.file("app.trc", file.bytes());
    }

    std::string dump_with(const std::vector<std::string> &environment) const
    {
        return run_on_terminal({"dump", trace}, environment).screen;
    }

    static constexpr std::size_t trace_bytes = 400'000; // more than pipes and terminals hold
    scratch_folder folder;
    std::string trace;
};

bool is_paged(const std::string &screen) { return screen.find("paged:") != std::string::npos; }

TEST_F(Pager, ShowsTheWholeDumpOnATerminal)
{
    const auto seen = run_on_terminal({"dump", "--color", "never", trace}, {"QNTRACE_PAGER=" + prefixing});
    const auto plain = run_qntrace({"dump", trace});
    std::string expected = "paged:";
    for (const char c : plain.out) expected += c == '\n' ? std::string("\npaged:") : std::string(1, c);
    expected.resize(expected.size() - std::string("paged:").size());
    EXPECT_EQ(seen.screen, expected);
    EXPECT_EQ(seen.status, 0);
}

TEST_F(Pager, ShowsAMergeToo)
{
    EXPECT_TRUE(is_paged(run_on_terminal({"merge", trace}, {"PAGER=" + prefixing}).screen));
}

TEST_F(Pager, ShowsMessagesAmongTheData)
{
    const auto seen = run_on_terminal({"dump", folder.path("missing.trc")}, {"PAGER=" + prefixing});
    EXPECT_EQ(seen.screen.rfind("paged:qntrace: ", 0), 0u) << seen.screen;
}

TEST_F(Pager, LeavesTheExitStatus)
{
    EXPECT_EQ(run_on_terminal({"dump", folder.path("missing.trc")}, {"PAGER=" + prefixing}).status, 3);
}

TEST_F(Pager, IsTheOneForThisCommandFirst)
{
    EXPECT_TRUE(is_paged(dump_with({"QNTRACE_PAGER=" + prefixing, "PAGER=false"})));
}

TEST_F(Pager, IsLeftOutWhenItsNameIsEmpty)
{
    const auto screen = dump_with({"QNTRACE_PAGER=", "PAGER=" + prefixing});
    EXPECT_FALSE(is_paged(screen));
    EXPECT_NE(screen.find("id=1"), std::string::npos);
}

TEST_F(Pager, IsLeftOutWhenItIsCat) { EXPECT_NE(dump_with({"PAGER=cat"}).find("id=1"), std::string::npos); }

TEST_F(Pager, IsLessWithColoursAndWithoutClearingWhenNothingIsSaid)
{
    const auto less = folder.path("less");
    std::ofstream(less) << "#!/bin/sh\nsed \"s/^/paged:$LESS:/\"\n";
    chmod(less.c_str(), 0755);
    const auto screen = dump_with({"PATH=" + folder.path("") + ":/usr/bin:/bin"});
    EXPECT_EQ(screen.rfind("paged:FRX:", 0), 0u) << screen.substr(0, 80);
}

TEST_F(Pager, IsNoneWhereThereIsNoLess)
{
    const auto screen = dump_with({"PATH=" + folder.path("")});
    EXPECT_NE(screen.find("id=1"), std::string::npos);
}

TEST_F(Pager, KeepsTheColoursOfTheTerminal)
{
    EXPECT_NE(dump_with({"PAGER=" + prefixing}).find("\x1b["), std::string::npos);
}

TEST_F(Pager, IsNotForJson)
{
    EXPECT_FALSE(is_paged(run_on_terminal({"dump", "--json", trace}, {"PAGER=" + prefixing}).screen));
}

TEST_F(Pager, IsLeftOutWhenNotWanted)
{
    EXPECT_FALSE(is_paged(run_on_terminal({"dump", "--no-pager", trace}, {"PAGER=" + prefixing}).screen));
}

TEST_F(Pager, IsNotForAPipe)
{
    const auto run = run_qntrace({"dump", trace}, {.environment = {"LC_ALL=C", "TZ=UTC", "PAGER=" + prefixing}});
    EXPECT_FALSE(is_paged(run.out));
}

TEST_F(Pager, EndsTheReadingQuietlyWhenItIsLeft)
{
    const auto seen = run_on_terminal({"dump", trace}, {"PAGER=head -n 1"});
    EXPECT_EQ(seen.signal, SIGPIPE);
    EXPECT_EQ(std::count(seen.screen.begin(), seen.screen.end(), '\n'), 1) << seen.screen;
}

TEST_F(Pager, TellsOfACommandThatCannotBeRun)
{
    EXPECT_NE(dump_with({"PAGER=/nonexistent/pager"}).find("/nonexistent/pager"), std::string::npos);
}

using MergeProgress = Pager;

TEST_F(MergeProgress, IsToldOnATerminalBesideTheData)
{
    const auto seen = run_beside_terminal({"merge", trace}, 400); // it comes twice as often
    EXPECT_NE(seen.screen.find("%  "), std::string::npos) << seen.screen;
    EXPECT_TRUE(seen.screen.ends_with("\r\x1b[K")) << seen.screen; // and is wiped out at the end
    EXPECT_EQ(seen.status, 0);
}

TEST_F(MergeProgress, StaysAwayFromATerminalThatShowsTheData)
{
    EXPECT_EQ(run_on_terminal({"merge", "--no-pager", trace}).screen.find('%'), std::string::npos);
}

} // namespace
} // namespace qn::test
