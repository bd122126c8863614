// What is wrong with a filter expression, and where.
#pragma once

#include <cstddef>
#include <stdexcept>
#include <string_view>

namespace qn::dump
{

// what() names the column, and shows the expression with a mark under it.
class where_error : public std::invalid_argument
{
public:
    // `offset` counts the bytes before what is wrong.
    where_error(std::string_view expression, std::size_t offset, std::string_view message);

    std::size_t column() const { return column_; } // counted in characters, from 1

private:
    std::size_t column_;
};

} // namespace qn::dump
