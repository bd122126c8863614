// A filter expression as a row of tokens, one at a time.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "tools/qntrace/select/where_comparison.h"

namespace qn::dump
{

struct where_token {
    enum class kind {
        end,
        name,
        number,
        string,
        equal,
        not_equal,
        less,
        less_equal,
        greater,
        greater_equal,
        match,
        not_match,
        both,   // &&
        either, // ||
        invert, // !
        open,
        close,
        comma,
    };

    kind what = kind::end;
    std::size_t offset = 0;    // in the expression
    std::string_view spelling; // as it stands there
    where_number number;       // what a number is worth
    std::string text;          // of a string, without its quotes and escapes
};

class where_lexer
{
public:
    // Throws where_error, as advance() does. The expression must outlive it.
    explicit where_lexer(std::string_view expression) : expression_(expression) { advance(); }

    const where_token &current() const { return current_; }
    void advance();

private:
    void read_name();
    void read_number();
    void read_string();
    void read_operator();
    void finish(where_token::kind what, std::size_t length);

    std::string_view expression_;
    std::size_t at_ = 0; // behind the current token
    where_token current_;
};

} // namespace qn::dump
