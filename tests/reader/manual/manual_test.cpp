// Every page describes the options that its command has and no others, and every example of it is run.
#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include "reader/manual/manual_page.h"
#include "reader/manual/manual_samples.h"

namespace qn::test
{
namespace
{

class Manual : public testing::TestWithParam<manual_page>
{
protected:
    // Of the command of the page; for qntrace itself those of all commands, which its page tells together.
    std::set<std::string> options_by_help() const
    {
        const auto command = GetParam().command();
        const auto help = run_qntrace(command.empty() ? std::vector<std::string>{"--help"}
                                                      : std::vector<std::string>{command, "--help"});
        EXPECT_EQ(help.status, 0) << help.err;
        return long_options(help.out);
    }
};

const manual_page &page_of_all_commands()
{
    static const auto pages = manual_pages();
    return *std::find_if(pages.begin(), pages.end(), [](const auto &page) { return page.command().empty(); });
}

std::vector<std::string> subcommands()
{
    const auto help = run_qntrace({"--help"}).out;
    const auto begin = help.find("Subcommands:\n");
    const std::string list = begin == std::string::npos ? "" : help.substr(begin);
    static const std::regex line("\n  ([a-z]+) ");
    return {std::sregex_token_iterator(list.begin(), list.end(), line, 1), std::sregex_token_iterator()};
}

std::set<std::string> those_not_in(const std::set<std::string> &options, const std::set<std::string> &known)
{
    std::set<std::string> missing;
    std::set_difference(options.begin(), options.end(), known.begin(), known.end(),
                        std::inserter(missing, missing.end()));
    return missing;
}

using strings = std::set<std::string>;

TEST_P(Manual, DescribesEveryOptionOfTheCommand)
{
    auto described = GetParam().options();
    described.merge(page_of_all_commands().options_in({"OPTIONS", "SELECTION"}));
    EXPECT_EQ(those_not_in(options_by_help(), described), strings());
}

TEST_P(Manual, DescribesNoOptionThatTheCommandDoesNotHave)
{
    if (GetParam().command().empty()) return;
    EXPECT_EQ(those_not_in(GetParam().options_in({"OPTIONS"}), options_by_help()), strings());
}

TEST_P(Manual, HasExamplesThatRunAsShown)
{
    const auto examples = GetParam().examples();
    EXPECT_FALSE(examples.empty());
    for (const auto &[command, shown] : examples) {
        const manual_samples samples; // an example may write files
        const auto printed = samples.run(command);
        if (shown.empty()) {
            EXPECT_LE(printed.status, 1) << command << "\n" << printed.out;
        } else {
            EXPECT_TRUE(is_shown(shown, printed.out)) << command << "\n" << printed.out << "\nshown:\n" << shown;
        }
    }
}

TEST_P(Manual, IsFormattedWithoutAWarning)
{
    const auto formatted = run_program("/bin/sh", {"-c", "groff -ww -t -man -Tutf8 -z \"$0\"", GetParam().path},
                                       {.environment = {"PATH=/usr/bin:/bin"}});
    EXPECT_EQ(formatted.status, 0);
    EXPECT_EQ(formatted.err, "");
}

INSTANTIATE_TEST_SUITE_P(Page, Manual, testing::ValuesIn(manual_pages()), [](const auto &page) {
    const auto command = page.param.command();
    return command.empty() ? std::string("qntrace") : command;
});

TEST(ManualPages, ThereIsOneForEverySubcommand)
{
    const auto commands = subcommands();
    EXPECT_GE(commands.size(), 6u);
    const auto pages = manual_pages();
    for (const auto &command : commands) {
        EXPECT_TRUE(std::any_of(pages.begin(), pages.end(), [&](const auto &page) {
            return page.command() == command;
        })) << command;
        EXPECT_NE(page_of_all_commands().text.find("\n.B " + command + "\n"), std::string::npos) << command;
    }
}

TEST(ManualPages, TheSelectionsOfTheExamplesSelectSomeOfTheRecords)
{
    const manual_samples samples;
    const auto lines = [&](const std::string &command) {
        const auto printed = samples.run(command + " 2>/dev/null").out;
        return std::count(printed.begin(), printed.end(), '\n');
    };
    const auto all = lines("qntrace dump app.trc");
    const auto none = lines("qntrace dump --id 4000000000 app.trc");
    unsigned selections = 0;
    for (const auto &[command, shown] : page_of_all_commands().examples()) {
        if (!shown.empty() || !command.starts_with("qntrace dump --")) continue;
        ++selections;
        EXPECT_GT(lines(command), none) << command;
        EXPECT_LT(lines(command), all) << command;
    }
    EXPECT_GE(selections, 6u);
}

} // namespace
} // namespace qn::test
