#include "tools/qntrace/select/where_parser.h"

#include <algorithm>
#include <stdexcept>
#include <string>
#include <utility>

#include <fmt/format.h>

#include "tools/qntrace/select/time.h"
#include "tools/qntrace/select/where_error.h"
#include "tools/qntrace/select/where_lexer.h"

namespace qn::dump
{
namespace
{

using kind = where_token::kind;

constexpr std::string_view comparing_operators = "== != < <= > >= =~ !~ or in";

bool is_literal(const where_token &token) { return token.what == kind::number || token.what == kind::string; }

bool is_in(const where_token &token) { return token.what == kind::name && token.spelling == "in"; }

bool compares(const where_token &token)
{
    return (token.what >= kind::equal && token.what <= kind::not_match) || is_in(token);
}

bool is_inverted(kind operation) { return operation == kind::not_equal || operation == kind::not_match; }

where_relation relation_of(kind operation)
{
    switch (operation) {
    case kind::less: return where_relation::less;
    case kind::less_equal: return where_relation::less_equal;
    case kind::greater: return where_relation::greater;
    case kind::greater_equal: return where_relation::greater_equal;
    case kind::match:
    case kind::not_match: return where_relation::match;
    default: return where_relation::equal;
    }
}

// As it reads from the other side.
where_relation turned_round(where_relation relation)
{
    switch (relation) {
    case where_relation::less: return where_relation::greater;
    case where_relation::less_equal: return where_relation::greater_equal;
    case where_relation::greater: return where_relation::less;
    case where_relation::greater_equal: return where_relation::less_equal;
    default: return relation;
    }
}

class parser
{
public:
    parser(std::string_view text, const timespec &now) : text_(text), now_(now), lexer_(text) {}

    where_program parse()
    {
        either();
        if (at(kind::close)) fail("this ) closes nothing");
        if (!at(kind::end)) fail("expected && or ||");
        return std::move(program_);
    }

private:
    const where_token &current() const { return lexer_.current(); }
    bool at(kind what) const { return current().what == what; }

    where_token take()
    {
        where_token taken = current();
        lexer_.advance();
        return taken;
    }

    [[noreturn]] void fail(std::string_view message) const { fail(current(), message); }
    [[noreturn]] void fail(const where_token &at, std::string_view message) const
    {
        throw where_error(text_, at.offset, message);
    }

    void either()
    {
        chain(kind::either, where_step::action::jump_if_true, [this] { both(); });
    }

    void both()
    {
        chain(kind::both, where_step::action::jump_if_false, [this] { unary(); });
    }

    // Parts with an operator between them, where each part decides whether the rest matters.
    template <typename Part>
    void chain(kind joint, where_step::action jump, const Part &part)
    {
        std::vector<std::size_t> jumps;
        part();
        while (at(joint)) {
            lexer_.advance();
            jumps.push_back(program_.steps.size());
            program_.steps.push_back({jump, 0});
            part();
        }
        for (const auto step : jumps) {
            program_.steps[step].index = program_.steps.size();
        }
    }

    void unary()
    {
        if (!at(kind::invert) && !at(kind::open)) {
            comparison();
            return;
        }
        if (nesting_ == where_deepest_nesting) {
            fail(fmt::format("parentheses and ! are nested more than {} deep", where_deepest_nesting));
        }
        ++nesting_;
        const auto prefix = take();
        if (prefix.what == kind::invert) {
            if (is_literal(current()) || at(kind::name)) fail("what ! inverts stands in parentheses");
            unary();
            program_.steps.push_back({where_step::action::invert, 0});
        } else {
            either();
            if (!at(kind::close)) {
                fail(fmt::format("expected &&, || or the ) for the ( at column {}",
                                 where_error(text_, prefix.offset, "").column()));
            }
            lexer_.advance();
        }
        --nesting_;
    }

    void comparison()
    {
        auto left = operand();
        const auto operation = current();
        if (!compares(operation)) fail(fmt::format("expected one of {}", comparing_operators));
        lexer_.advance();
        if (is_in(operation)) {
            add(field_of(left), operation, where_relation::equal, list());
        } else {
            auto right = operand();
            if (is_literal(left) && is_literal(right)) fail(left, "expected a field on one side of the comparison");
            if (!is_literal(left) && !is_literal(right)) fail(right, "expected a number or a string");
            const auto relation = relation_of(operation.what);
            if (is_literal(right)) {
                add(field_of(left), operation, relation, {std::move(right)});
            } else {
                if (relation == where_relation::match) fail(left, "expected the field before the operator");
                add(field_of(right), operation, turned_round(relation), {std::move(left)});
            }
        }
        if (compares(current())) fail("comparisons are not chained; join them with &&");
    }

    where_token operand()
    {
        if (!is_literal(current()) && !at(kind::name)) fail("expected a field, a number or a string");
        if (at(kind::name)) field_of(current());
        return take();
    }

    where_field field_of(const where_token &token) const
    {
        if (is_literal(token)) fail(token, "expected a field before in");
        const auto field = where_field_of(token.spelling);
        if (!field) fail(token, fmt::format("no field has this name; there are {}", where_field_list()));
        return *field;
    }

    std::vector<where_token> list()
    {
        if (!at(kind::open)) fail("expected ( and a list of numbers or strings");
        std::vector<where_token> literals;
        do {
            lexer_.advance();
            if (!is_literal(current())) fail("expected a number or a string");
            literals.push_back(take());
        } while (at(kind::comma));
        if (!at(kind::close)) fail("expected , or ) in the list");
        lexer_.advance();
        return literals;
    }

    void add(where_field field, const where_token &operation, where_relation relation,
             const std::vector<where_token> &literals)
    {
        where_comparison made;
        made.field = field;
        made.relation = relation;
        if (where_type_of(field) == where_type::text) {
            made.operand = text_operand(field, operation, relation, literals);
        } else {
            made.operand = number_operand(field, operation, relation, literals);
        }
        program_.steps.push_back({where_step::action::compare, program_.comparisons.size()});
        program_.comparisons.push_back(std::move(made));
        if (is_inverted(operation.what)) program_.steps.push_back({where_step::action::invert, 0});
    }

    std::vector<where_number> number_operand(where_field field, const where_token &operation, where_relation relation,
                                             const std::vector<where_token> &literals) const
    {
        const bool is_time = where_type_of(field) == where_type::time;
        if (relation == where_relation::match) {
            fail(operation, fmt::format("{} is a {}; {} is for text", where_field_name(field),
                                        is_time ? "time" : "number", operation.spelling));
        }
        std::vector<where_number> numbers;
        for (const auto &literal : literals) {
            if (is_time) {
                numbers.push_back({time_of(literal), false});
            } else if (literal.what == kind::number) {
                numbers.push_back(literal.number);
            } else {
                fail(literal, fmt::format("expected a number without quotes for {}", where_field_name(field)));
            }
        }
        return numbers;
    }

    where_integer time_of(const where_token &literal) const
    {
        if (literal.what != kind::string) fail(literal, "expected a string in double quotes for time");
        try {
            return where_nanoseconds(parse_time(literal.text, now_));
        } catch (const std::invalid_argument &error) {
            fail(literal, error.what());
        }
    }

    decltype(where_comparison::operand) text_operand(where_field field, const where_token &operation,
                                                     where_relation relation,
                                                     const std::vector<where_token> &literals) const
    {
        if (relation != where_relation::equal && relation != where_relation::match) {
            fail(operation, fmt::format("{} has no order; expected one of == != =~ !~ or in", where_field_name(field)));
        }
        std::vector<std::string> texts;
        for (const auto &literal : literals) {
            if (literal.what != kind::string) {
                fail(literal, fmt::format("expected a string in double quotes for {}", where_field_name(field)));
            }
            if (relation == where_relation::match) return pattern_of(literal);
            texts.push_back(text_of(field, literal));
        }
        return texts;
    }

    pattern pattern_of(const where_token &literal) const
    {
        try {
            return pattern(literal.text);
        } catch (const std::invalid_argument &error) {
            fail(literal, error.what());
        }
    }

    std::string text_of(where_field field, const where_token &literal) const
    {
        if (field == where_field::comp) return std::string(without_trailing_blanks(literal.text));
        const auto &kinds = kind_names();
        if (field == where_field::kind && std::find(kinds.begin(), kinds.end(), literal.text) == kinds.end()) {
            fail(literal, fmt::format("no kind has this name; there are {}", kind_list()));
        }
        return literal.text;
    }

    std::string_view text_;
    timespec now_;
    where_lexer lexer_;
    where_program program_;
    std::size_t nesting_ = 0;
};

} // namespace

where_program parse_where(std::string_view text, const timespec &now) { return parser(text, now).parse(); }

} // namespace qn::dump
