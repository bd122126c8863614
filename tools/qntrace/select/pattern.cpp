#include "tools/qntrace/select/pattern.h"

#include <array>
#include <stdexcept>

#include <fmt/format.h>

namespace qn::dump
{

void pattern::release::operator()(regex_t *compiled) const
{
    regfree(compiled);
    delete compiled;
}

pattern::pattern(const std::string &expression)
{
    if (expression.size() > longest_expression) {
        throw std::invalid_argument(fmt::format("a regular expression of {} bytes is too long: {} are taken",
                                                expression.size(), longest_expression));
    }
    auto compiled = std::make_unique<regex_t>();
    const int error = regcomp(compiled.get(), expression.c_str(), REG_EXTENDED | REG_NOSUB);
    if (error != 0) {
        std::array<char, 128> reason = {};
        regerror(error, compiled.get(), reason.data(), reason.size());
        throw std::invalid_argument(fmt::format("this is no regular expression: {}", reason.data()));
    }
    compiled_.reset(compiled.release());
}

bool pattern::found_in(std::string_view text) const
{
    regmatch_t range = {};
    range.rm_eo = static_cast<regoff_t>(text.size());
    return regexec(compiled_.get(), text.data(), 0, &range, REG_STARTEND) == 0;
}

} // namespace qn::dump
