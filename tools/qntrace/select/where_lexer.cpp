#include "tools/qntrace/select/where_lexer.h"

#include <algorithm>
#include <limits>

#include <fmt/format.h>

#include "tools/qntrace/select/number.h"
#include "tools/qntrace/select/where_error.h"

namespace qn::dump
{
namespace
{

bool is_digit(char c) { return c >= '0' && c <= '9'; }
bool is_name_start(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; }
bool is_name_part(char c) { return is_name_start(c) || is_digit(c); }

} // namespace

void where_lexer::advance()
{
    at_ = std::min(expression_.find_first_not_of(" \t\r\n", at_), expression_.size());
    current_ = {};
    current_.offset = at_;
    if (at_ == expression_.size()) return;
    const char c = expression_[at_];
    const char next = at_ + 1 < expression_.size() ? expression_[at_ + 1] : '\0';
    if (is_name_start(c)) {
        read_name();
    } else if (is_digit(c) || (c == '-' && is_digit(next))) {
        read_number();
    } else if (c == '"') {
        read_string();
    } else {
        read_operator();
    }
}

void where_lexer::finish(where_token::kind what, std::size_t length)
{
    current_.what = what;
    current_.spelling = expression_.substr(at_, length);
    at_ += length;
}

void where_lexer::read_name()
{
    const auto rest = expression_.substr(at_);
    const auto end = std::find_if_not(rest.begin(), rest.end(), is_name_part);
    finish(where_token::kind::name, static_cast<std::size_t>(end - rest.begin()));
}

void where_lexer::read_number()
{
    const bool negative = expression_[at_] == '-';
    const auto behind_sign = expression_.substr(at_ + (negative ? 1 : 0));
    const auto end = std::find_if_not(behind_sign.begin(), behind_sign.end(), is_name_part);
    const auto digits = behind_sign.substr(0, static_cast<std::size_t>(end - behind_sign.begin()));
    const auto magnitude = parse_number(digits);
    constexpr auto most_below_0 = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()) + 1;
    if (!magnitude || (negative && *magnitude > most_below_0)) {
        throw where_error(expression_, at_, "expected a number of at most 64 bits, decimal or hexadecimal behind 0x");
    }
    current_.number.value = negative ? -where_integer{*magnitude} : where_integer{*magnitude};
    current_.number.hexadecimal = !negative && is_hexadecimal(digits);
    finish(where_token::kind::number, digits.size() + (negative ? 1 : 0));
}

void where_lexer::read_string()
{
    for (std::size_t i = at_ + 1; i < expression_.size(); ++i) {
        const char c = expression_[i];
        if (c == '"') {
            finish(where_token::kind::string, i + 1 - at_);
            return;
        }
        if (c == '\\') {
            const char escaped = i + 1 < expression_.size() ? expression_[i + 1] : '\0';
            if (escaped != '"' && escaped != '\\') {
                throw where_error(expression_, i, "in a string, write \\\\ for a backslash and \\\" for a quote");
            }
            ++i;
        }
        current_.text += expression_[i];
    }
    throw where_error(expression_, at_, "this string has no closing quote");
}

void where_lexer::read_operator()
{
    using kind = where_token::kind;
    // The longer ones first.
    static constexpr struct {
        std::string_view spelling;
        kind what;
    } operators[] = {
        {"==", kind::equal}, {"!=", kind::not_equal}, {"<=", kind::less_equal}, {">=", kind::greater_equal},
        {"=~", kind::match}, {"!~", kind::not_match}, {"&&", kind::both},       {"||", kind::either},
        {"<", kind::less},   {">", kind::greater},    {"!", kind::invert},      {"(", kind::open},
        {")", kind::close},  {",", kind::comma},
    };
    const auto rest = expression_.substr(at_);
    for (const auto &candidate : operators) {
        if (rest.starts_with(candidate.spelling)) {
            finish(candidate.what, candidate.spelling.size());
            return;
        }
    }
    std::string_view message = "no field, number, string in double quotes or operator begins with this";
    if (rest.front() == '=') message = "expected == or =~";
    if (rest.front() == '&') message = "expected &&";
    if (rest.front() == '|') message = "expected ||";
    if (rest.front() == '\'') message = "expected a string in double quotes";
    throw where_error(expression_, at_, message);
}

} // namespace qn::dump
