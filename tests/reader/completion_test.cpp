// The completions that bash offers for a command line.
#include <gtest/gtest.h>

#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "reader/program.h"

namespace qn::test
{
namespace
{

using words = std::set<std::string>;

// What is offered for the last of the words, which are as bash breaks them.
words completions(const std::vector<std::string> &line)
{
    static const std::string script = "eval \"$(\"$0\" completion bash)\" || exit 9\n"
                                      "COMP_WORDS=(qntrace \"$@\") COMP_CWORD=$#\n"
                                      "_qntrace; printf '%s\\n' \"${COMPREPLY[@]}\"";
    std::vector<std::string> arguments = {"-c", script, QNTRACE_PROGRAM};
    arguments.insert(arguments.end(), line.begin(), line.end());
    const auto run = run_program("/bin/bash", arguments);
    EXPECT_EQ(run.status, 0) << run.err;
    EXPECT_EQ(run.err, "");
    words offered;
    std::istringstream lines(run.out);
    for (std::string word; std::getline(lines, word);)
        if (!word.empty()) offered.insert(word);
    return offered;
}

TEST(Completion, OffersTheCommandsThatBeginSo) { EXPECT_EQ(completions({"du"}), words({"dump"})); }

TEST(Completion, OffersAllCommandsBeforeOneIsThere)
{
    const auto offered = completions({""});
    EXPECT_TRUE(offered.contains("dump"));
    EXPECT_TRUE(offered.contains("config"));
    EXPECT_TRUE(offered.contains("--version"));
    EXPECT_FALSE(offered.contains("--raw"));
}

TEST(Completion, OffersTheOptionsOfTheCommand)
{
    EXPECT_EQ(completions({"dump", "--ra"}), words({"--raw"}));
    EXPECT_EQ(completions({"info", "--ra"}), words());
    EXPECT_EQ(completions({"dump", "app.trc", "--w"}), words({"--where"}));
}

TEST(Completion, OffersTheWordsThatAnOptionTakes)
{
    EXPECT_EQ(completions({"dump", "--color", ""}), words({"always", "auto", "never"}));
    EXPECT_EQ(completions({"dump", "--color", "au"}), words({"auto"}));
}

TEST(Completion, OffersThemBehindAnEqualsSignToo)
{
    EXPECT_EQ(completions({"dump", "--color", "="}), words({"always", "auto", "never"}));
    EXPECT_EQ(completions({"dump", "--color", "=", "n"}), words({"never"}));
}

TEST(Completion, OffersTheWordsThatAnArgumentMayBe) { EXPECT_EQ(completions({"completion", ""}), words({"bash"})); }

TEST(Completion, LeavesOtherWordsToTheNamesOfFiles)
{
    EXPECT_EQ(completions({"dump", ""}), words());
    EXPECT_EQ(completions({"merge", "a"}), words());
    EXPECT_EQ(completions({"merge", "--comp", "--"}).count("--comp"), 1u);
}

TEST(Completion, TakesNoOptionForACommand) { EXPECT_TRUE(completions({"--help", ""}).contains("dump")); }

TEST(Completion, RefusesAShellThatItDoesNotKnow)
{
    const auto run = run_qntrace({"completion", "fish"});
    EXPECT_EQ(run.status, 2);
    EXPECT_EQ(run.out, "");
    EXPECT_NE(run.err.find("fish"), std::string::npos);
}

} // namespace
} // namespace qn::test
