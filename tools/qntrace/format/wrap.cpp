#include "tools/qntrace/format/wrap.h"

#include <algorithm>

namespace qn::dump
{
namespace
{

// Characters, not bytes: those that continue one in UTF-8 do not count.
std::size_t width_of(std::string_view text)
{
    const auto begins_one = [](char c) { return (static_cast<unsigned char>(c) & 0xC0) != 0x80; };
    return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), begins_one));
}

} // namespace

void append_wrapped(std::string &out, std::string_view text, std::size_t indent, std::size_t columns)
{
    if (columns == 0) {
        out.append(text) += '\n';
        return;
    }
    std::size_t column = indent;
    while (!text.empty()) {
        // A word with the blanks before it; the blanks go where the line is broken.
        const auto word = std::min(text.find_first_not_of(' '), text.size());
        const auto end = std::min(text.find(' ', word), text.size());
        const auto width = width_of(text.substr(0, end));
        const bool breaks = column > indent && column + width > columns;
        if (breaks) {
            out += '\n';
            out.append(indent, ' ');
            column = indent;
        }
        const auto from = breaks ? word : 0;
        out += text.substr(from, end - from);
        column += width - from;
        text.remove_prefix(end);
    }
    out += '\n';
}

} // namespace qn::dump
