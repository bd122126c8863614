#include "tools/qntrace/format/escape.h"

#include <algorithm>
#include <array>
#include <cstring>

#include <langinfo.h>

#include <fmt/format.h>

namespace qn::dump
{
namespace
{

struct range {
    char32_t first, last;
};

// Controls, invisible and direction-turning characters, private use, and what is no character at all.
constexpr std::array<range, 14> not_printable = {{
    {0x7F, 0xA0},
    {0xAD, 0xAD},
    {0x61C, 0x61C},
    {0x180E, 0x180E},
    {0x200B, 0x200F},
    {0x2028, 0x202E},
    {0x2060, 0x206F},
    {0xD800, 0xF8FF},
    {0xFDD0, 0xFDEF},
    {0xFE00, 0xFE0F},
    {0xFEFF, 0xFEFF},
    {0xFFF0, 0xFFFB},
    {0xFFFE, 0xFFFF},
    {0xE0000, 0x10FFFF},
}};

bool is_continuation(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

// The character that the well-formed sequence `text` stands for.
char32_t code_point(std::string_view text)
{
    const auto lead = static_cast<unsigned char>(text.front());
    if (text.size() == 1) return lead;
    char32_t value = lead & (0xFFU >> (text.size() + 1));
    for (const char c : text.substr(1)) {
        value = value << 6 | (static_cast<unsigned char>(c) & 0x3FU);
    }
    return value;
}

bool is_printable(char32_t c)
{
    const bool excluded = std::any_of(not_printable.begin(), not_printable.end(),
                                      [c](const range &r) { return c >= r.first && c <= r.last; });
    return c >= 0x20 && !excluded;
}

void append_byte(std::string &out, char byte)
{
    switch (byte) {
    case '\n': out += "\\n"; break;
    case '\r': out += "\\r"; break;
    case '\t': out += "\\t"; break;
    default: fmt::format_to(std::back_inserter(out), "\\x{:02x}", static_cast<unsigned char>(byte));
    }
}

void append(std::string &out, std::string_view text, charset printable, bool in_quotes)
{
    while (!text.empty()) {
        const char c = text.front();
        const std::size_t length = printable == charset::utf_8 ? utf_8_length(text) : (c >= 0 ? 1 : 0);
        if (c == '\\' || (c == '"' && in_quotes)) {
            out += '\\';
            out += c;
        } else if (length > 0 && is_printable(code_point(text.substr(0, length)))) {
            out.append(text.substr(0, length));
        } else {
            for (const char byte : text.substr(0, std::max<std::size_t>(length, 1))) {
                append_byte(out, byte);
            }
        }
        text.remove_prefix(std::max<std::size_t>(length, 1));
    }
}

} // namespace

charset locale_charset() { return std::strcmp(nl_langinfo(CODESET), "UTF-8") == 0 ? charset::utf_8 : charset::ascii; }

std::size_t utf_8_length(std::string_view text)
{
    if (text.empty()) return 0;
    const auto lead = static_cast<unsigned char>(text.front());
    if (lead < 0x80) return 1;
    if (lead < 0xC2 || lead > 0xF4) return 0;
    const std::size_t length = lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : 4;
    if (text.size() < length) return 0;
    if (!std::all_of(text.begin() + 1, text.begin() + static_cast<std::ptrdiff_t>(length), is_continuation)) return 0;
    // Overlong forms, surrogates and what lies behind the last character.
    const char32_t value = code_point(text.substr(0, length));
    constexpr std::array<char32_t, 5> least = {0, 0, 0x80, 0x800, 0x10000};
    if (value < least[length] || value > 0x10FFFF || (value >= 0xD800 && value <= 0xDFFF)) return 0;
    return length;
}

bool is_utf_8(std::string_view text)
{
    while (!text.empty()) {
        const std::size_t length = utf_8_length(text);
        if (length == 0) return false;
        text.remove_prefix(length);
    }
    return true;
}

void append_escaped(std::string &out, std::string_view text, charset printable) { append(out, text, printable, false); }

void append_quoted(std::string &out, std::string_view text, charset printable)
{
    out += '"';
    append(out, text, printable, true);
    out += '"';
}

} // namespace qn::dump
