// Small pieces of text. Pure functions, no state.
#include "platform/ffdc/text.h"

namespace qn::ffdc
{
bytes detail_bytes(const void *data, int length)
{
    if (data == nullptr || length <= 0) return {};
    return {static_cast<const unsigned char *>(data), static_cast<size_t>(length)};
}

void append_hex(std::string &out, bytes data)
{
    constexpr std::string_view digits = "0123456789abcdef";
    for (const unsigned char byte : data) {
        out += digits[byte >> 4];
        out += digits[byte & 15];
    }
}

std::string one_line(std::string_view text)
{
    std::string line(text);
    for (char &character : line) {
        const auto code = static_cast<unsigned char>(character);
        if (code < ' ' || code == 0x7f) character = ' ';
    }
    line.erase(line.find_last_not_of(' ') + 1);
    return line;
}

std::string one_line_or_nothing(const char *text) { return text != nullptr ? one_line(text) : std::string(); }
} // namespace qn::ffdc
