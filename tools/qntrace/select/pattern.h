// A POSIX extended regular expression, to be found anywhere in a text.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include <regex.h>

namespace qn::dump
{

class pattern
{
public:
    // Bounds the depth to which the C library recurses into an expression.
    static constexpr std::size_t longest_expression = 1000;

    // Throws std::invalid_argument for what is no regular expression, or too long.
    explicit pattern(const std::string &expression);

    bool found_in(std::string_view text) const;

private:
    struct release {
        void operator()(regex_t *compiled) const;
    };
    std::unique_ptr<regex_t, release> compiled_;
};

} // namespace qn::dump
