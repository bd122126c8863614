// Regular expressions that grow with a number, for tests of what patterns cost.
#pragma once

#include <string>

namespace qn::test
{
inline std::string repeated(const std::string &text, int times)
{
    std::string all;
    for (int i = 0; i < times; ++i) all += text;
    return all;
}

// "(((a+)+)+)": each "+" holds its operand twice.
inline std::string nested(const std::string &operand, const std::string &repetition, int depth)
{
    return repeated("(", depth) + operand + repeated(repetition + ")", depth) + repetition;
}
} // namespace qn::test
