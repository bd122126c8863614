#include "tools/qntrace/select/where_error.h"

#include <algorithm>
#include <string>

#include <fmt/format.h>

namespace qn::dump
{
namespace
{

// A character of several bytes counts once.
std::size_t column_of(std::string_view expression, std::size_t offset)
{
    const auto before = expression.substr(0, offset);
    return 1 + static_cast<std::size_t>(std::count_if(before.begin(), before.end(), [](char c) {
               return (static_cast<unsigned char>(c) & 0xC0) != 0x80;
           }));
}

// On one line, every character at its column.
std::string in_one_line(std::string_view expression)
{
    std::string line(expression);
    std::replace_if(
        line.begin(), line.end(), [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7F'; }, ' ');
    return line;
}

} // namespace

where_error::where_error(std::string_view expression, std::size_t offset, std::string_view message)
    : std::invalid_argument(fmt::format("column {}: {}\n    {}\n    {:>{}}", column_of(expression, offset), message,
                                        in_one_line(expression), '^', column_of(expression, offset))),
      column_(column_of(expression, offset))
{
}

} // namespace qn::dump
