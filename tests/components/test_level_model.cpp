// 20000 random level specifications, half of them faulty, through tr_set_trace_levels_1 and through a model that knows
// nothing of the library: the same codes at the same offsets, the same levels, and the same again for a component that
// registers afterwards.
#include <random>

#include <gtest/gtest.h>

#include "components/components_seen.h"
#include "components/outcome.h"
#include "components/twin.h"

namespace
{
using namespace qn::test;

class random_specifications
{
public:
    std::string next()
    {
        std::string text = element();
        while (below(3) == 0) text += "," + element();
        if (below(12) == 0) text += ",";
        if (below(2) == 0) damage(text);
        return text;
    }

private:
    size_t below(size_t bound) { return std::uniform_int_distribution<size_t>(0, bound - 1)(engine_); }
    std::string one_of(const std::vector<std::string> &choices) { return choices[below(choices.size())]; }
    std::string blanks() { return std::string(below(4) == 0 ? below(3) : 0, ' '); }

    std::string element()
    {
        std::string text = blanks() + one_of(components_) + ":" + blanks() + one_of(categories_) + blanks();
        if (below(4) != 0) text += "=" + blanks() + one_of(levels_) + blanks();
        return text;
    }
    void damage(std::string &text)
    {
        for (size_t times = 1 + below(2); times > 0 && !text.empty(); --times) {
            const size_t place = below(text.size());
            switch (below(3)) {
            case 0: text.erase(place, 1 + below(3)); break;
            case 1: text.insert(place, one_of(damages_)); break;
            default: text.replace(place, 1, one_of(damages_)); break;
            }
        }
    }

    std::mt19937_64 engine_{20240229}; // the same strings in every run
    const std::vector<std::string> components_ = {
        "*",      "A",     "ab",     "^AB$", "AB01", "CD",  "^.$", "[[:alpha:]]+", "[[:upper:]]{2}",
        "[^A-C]", "A|C",   "(A)(B)", "z",    "[:]",  "{",   "[",   "a]",           "A=",
        ".*",     "B0?1$", "()",     "A{2}", "]",    "D\\b"};
    const std::vector<std::string> categories_ = {
        "*", "Errors", "err",  "^Flow$", "flow|info", "[[:digit:]]", " Info", "My Info", "x",     "^",
        "$", ".o",     "(r)+", "[a-f]:", "a{2}",      "(",           "[",     "\\",      "^One$", "Two"};
    const std::vector<std::string> levels_ = {"0",
                                              "1",
                                              "3",
                                              "7",
                                              "100",
                                              "255",
                                              "256",
                                              "300",
                                              "0x10",
                                              "0X1F",
                                              "017",
                                              "08",
                                              "-1",
                                              "-2",
                                              "+5",
                                              "4294967295",
                                              "4294967296",
                                              "99999999999999999999",
                                              "18446744073709551615",
                                              "0x",
                                              "0xfg",
                                              "",
                                              "4 5",
                                              "z",
                                              "\t6",
                                              "1.5"};
    const std::vector<std::string> damages_ = {",", ":", "=", " ", "[", "]", "{", "}", "(", ")", "*", "x", "5", "\t"};
};

const std::vector<model_category> first_table = {
    {1, "Errors", 1, 1}, {0, "Flow", 3, 0}, {2, "My Info", 200, 7}, {3, "x", 255, 255}};
const std::vector<model_category> second_table = {{0, "errors", 0, 9}, {0, "one\ntwo", 5, 2}, {2, "aa:5", 17, 0}};

TEST(LevelModel, AgreesOnTwentyThousandSpecifications)
{
    twin ab("AB", first_table);
    twin ab01("AB01", second_table);
    twin cd("cd", second_table);
    twin one("D", first_table);
    const std::vector<twin *> twins = {&ab, &ab01, &cd, &one};
    for (twin *each : twins) {
        ASSERT_EQ(each->real.register_now(), 0);
        ASSERT_EQ(each->real.levels, each->model.levels);
    }

    random_specifications specifications;
    std::vector<level_element> taken;
    std::vector<int> times_seen(20, 0);
    for (int i = 0; i < 20000; ++i) {
        const std::string text = specifications.next();
        const level_verdict expected = judge_levels(text);
        ++times_seen[static_cast<size_t>(expected.code)];
        ASSERT_EQ(after(tr_set_trace_levels_1(text.c_str())),
                  expected.code == 0 ? success() : syntax_error(expected.code, expected.offset))
            << '"' << text << '"';
        for (const level_element &element : expected.elements) {
            taken.push_back(element);
            for (twin *each : twins) each->model.apply(element);
        }
        for (const twin *each : twins) ASSERT_EQ(each->real.levels, each->model.levels) << '"' << text << '"';
    }
    for (const int code : {0, 10, 11, 12, 13, 15, 16})
        EXPECT_GT(times_seen[static_cast<size_t>(code)], 100) << "the strings should meet code " << code;

    ASSERT_EQ(count_of(anchors.pFirstTraceSpec), taken.size());
    twin late("ABCD", first_table);
    ASSERT_EQ(late.real.register_now(), 0);
    for (const level_element &element : taken) late.model.apply(element);
    EXPECT_EQ(late.real.levels, late.model.levels);
}
} // namespace
