// Which regular expressions are compiled, and which are refused before they can do harm.
#include <regex.h>

#include <ctime>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/pattern_text.h"
#include "trace/files/compiled_pattern.h"

namespace
{
using qn::test::nested;
using qn::test::repeated;
using qn::tr::compiled_pattern;
using qn::tr::is_affordable;

double seconds_of_processor()
{
    timespec now{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) / 1e9;
}

TEST(PatternCost, LetsThroughWhatPeopleWrite)
{
    for (const char *pattern : {".*",
                                "Errors",
                                "^(AB|CD|EF)$",
                                "(^|/)app\\.trc$",
                                ".*/client.trc",
                                "/database/log/.*trc$",
                                "^[[:upper:]]+$",
                                "[^]a-z]{2,}",
                                "[[.a.][=b=]]",
                                "(foo|bar)?.*(x|y)*z+",
                                "([a-z]*\\.)*",
                                "(.*)*",
                                "((a*)*)*",
                                "(a|aa)*(a|aa)*b",
                                "(((a+)+)+)+",
                                "(^|,)+",
                                "\\<word\\>",
                                "a{255}",
                                "a{32767}",
                                "(a{255}){255}",
                                "a|",
                                "()",
                                "a{,5}",
                                "a{x",
                                ")"}) {
        EXPECT_TRUE(is_affordable(pattern)) << pattern;
    }
    EXPECT_TRUE(is_affordable(std::string(100000, 'a')));
    EXPECT_TRUE(is_affordable(nested("a", "", 100)));
    EXPECT_TRUE(is_affordable("^(" + repeated("COMP|", 1000) + "LAST)$"));
    EXPECT_TRUE(is_affordable(repeated("^/var/log/.*\\.trc$|", 300) + "\\bmain\\b"));
}

TEST(PatternCost, RefusesWhatTakesTheMemoryTheTimeOrTheStack)
{
    const std::vector<std::string> patterns = {
        "(a{32767}){32767}",  "((a{255}){255}){255}",     "a{0,32767}",
        "(a?){32767}",        nested("a", "+", 20),       nested("a", "", 101),
        repeated("(", 99000), repeated("()", 45000),      repeated("a*", 45000),
        repeated("|", 90000), "a" + repeated("*", 60000), repeated("(^|a)+", 200),
        repeated("^", 60000), "(^|$|\\b|\\B|a)*",         nested("^|a", "+", 6),
        "\\B()*{0,30}[ab]"};
    for (const std::string &pattern : patterns) EXPECT_FALSE(is_affordable(pattern)) << pattern.substr(0, 60);
}

TEST(PatternCost, RefusesBackReferences)
{
    EXPECT_FALSE(is_affordable("(a*)\\1b"));
    EXPECT_TRUE(is_affordable("(a*)\\\\1b")) << "a backslash and a digit";
    EXPECT_TRUE(is_affordable("[\\1]")) << "a class of both";
}

TEST(PatternCost, IsThatOfACompilationThatIsNotTried)
{
    EXPECT_FALSE(compiled_pattern(nested("a", "", 50000).c_str()));
    EXPECT_TRUE(compiled_pattern("a{255}"));
    EXPECT_FALSE(compiled_pattern("a{2,1}"));
}

// What hostile people put together out of all that is special to regcomp().
TEST(PatternCost, OfWhatIsLetThroughIsSmall)
{
    const std::vector<std::string> tokens = {"a",    "b",     "(",     ")",      "(",     ")*",   ")+",  "|",
                                             "*",    "+",     "?",     "^",      "$",     "\\b",  "\\B", "[ab]",
                                             "{3}",  "{2,4}", "{0,9}", "{0,30}", "{200}", "(a|",  "(^|", "(b*|",
                                             "[^]]", ".",     "x",     ")",      "\\<",   "{50}", "y",   "z"};
    std::mt19937 random(20261121);
    double longest = 0;
    std::string of;
    for (int i = 0; i < 5000; ++i) {
        std::string pattern;
        const auto length = 1 + random() % 40;
        for (unsigned j = 0; j < length; ++j) pattern += tokens[random() % tokens.size()];
        if (!is_affordable(pattern)) continue;
        const double before = seconds_of_processor();
        const compiled_pattern compiled(pattern.c_str());
        if (compiled) (void)compiled.matches("abababababababababababababababab");
        if (seconds_of_processor() - before <= longest) continue;
        longest = seconds_of_processor() - before;
        of = pattern;
    }
    EXPECT_LT(longest, 20) << of; // of one pattern that is not bounded, nobody has seen the end
}
} // namespace
