// The examples of filter expressions in the manual page, run as they stand there, on the golden trace.
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <string_view>
#include <vector>

#include "reader/program.h"

namespace qn::test
{
namespace
{

void replace_all(std::string &text, std::string_view part, std::string_view by)
{
    for (auto at = text.find(part); at != std::string::npos; at = text.find(part, at + by.size())) {
        text.replace(at, part.size(), by);
    }
}

struct example {
    std::string command;
    std::string shown; // what the page says that it prints
};

// The part of the manual page that is about expressions, as plain text.
std::string expressions_section()
{
    auto page = contents_of(QNTRACE_MANUAL);
    const auto begin = page.find("\n.SH EXPRESSIONS\n");
    page = page.substr(begin, page.find("\n.SH ", begin + 1) - begin);
    replace_all(page, "\\(dq", "\"");
    replace_all(page, "\\-", "-");
    replace_all(page, "\\e", "\\");
    return page;
}

std::vector<example> examples()
{
    const auto section = expressions_section();
    const std::string_view prompt = ".RB \"$ \" \"";
    std::vector<example> result;
    for (auto at = section.find(prompt); at != std::string::npos; at = section.find(prompt, at)) {
        at += prompt.size();
        const auto end = section.find("\"\n", at);
        const auto next = std::min(section.find(".RB", end), section.find(".EE", end));
        result.push_back({section.substr(at, end - at), section.substr(end + 2, next - end - 2)});
    }
    return result;
}

outcome run(std::string command)
{
    replace_all(command, "qntrace dump", QNTRACE_PROGRAM " dump --json");
    replace_all(command, "app.trc", GOLDEN_FOLDER "/golden.trc");
    return run_program("/bin/sh", {"-c", command});
}

auto records_in(const outcome &shown) { return std::count(shown.out.begin(), shown.out.end(), '\n') - 1; }

TEST(SelectManual, ShowsTheMessageOfAMistake)
{
    unsigned mistakes = 0;
    for (const auto &[command, shown] : examples()) {
        if (shown.empty()) continue;
        ++mistakes;
        const auto printed = run(command);
        EXPECT_EQ(printed.status, 2);
        EXPECT_EQ(printed.err.substr(0, shown.size()), shown);
    }
    EXPECT_EQ(mistakes, 1u);
}

TEST(SelectManual, HasExamplesThatSelectSomeRecords)
{
    const auto all = records_in(run("qntrace dump app.trc"));
    unsigned selections = 0;
    for (const auto &[command, shown] : examples()) {
        if (!shown.empty()) continue;
        ++selections;
        const auto printed = run(command);
        EXPECT_EQ(printed.status, 1) << command << printed.err; // the golden trace ends with an unfinished record
        EXPECT_GT(records_in(printed), 0) << command;
        EXPECT_LT(records_in(printed), all) << command;
    }
    EXPECT_EQ(selections, 6u);
}

} // namespace
} // namespace qn::test
