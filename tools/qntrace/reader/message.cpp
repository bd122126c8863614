#include "tools/qntrace/reader/message.h"

#include <algorithm>
#include <bit>
#include <charconv>
#include <optional>

#include <fmt/format.h>

namespace qn::reader
{
namespace
{

// No message pads further; a width out of a damaged file must not cost memory.
constexpr int longest_padding = 1024;

// %[position$][flags][width][.precision][length]conversion
struct conversion {
    std::optional<std::size_t> position; // counted from 0
    bool left = false, plus = false, space = false, alternate = false, zero = false;
    int width = 0;
    std::optional<int> precision;
    unsigned bits = 32; // of an integer
    char type = 0;
    std::size_t length = 0; // characters that it takes in the message
};

class arguments_in_turn
{
public:
    explicit arguments_in_turn(const std::vector<error_argument> &arguments) : arguments_(arguments) {}

    const error_argument *at(std::size_t position) const
    {
        return position < arguments_.size() ? &arguments_[position] : nullptr;
    }
    const error_argument *next() { return at(next_++); }

private:
    const std::vector<error_argument> &arguments_;
    std::size_t next_ = 0;
};

bool is_integer(const error_argument &argument)
{
    return argument.type == argument_type::int_value || argument.type == argument_type::long_value ||
           argument.type == argument_type::long_long_value;
}

// Reads a number of at most nine digits, clipped to the longest padding; nothing when there is none.
std::optional<int> read_number(std::string_view text, std::size_t &at)
{
    int value = 0;
    const std::size_t begin = at;
    while (at < text.size() && at - begin < 9 && text[at] >= '0' && text[at] <= '9') {
        value = value * 10 + (text[at++] - '0');
    }
    if (at == begin) return std::nullopt;
    return value;
}

// A width or precision: digits, or * for the next argument.
std::optional<int> read_size(std::string_view text, std::size_t &at, arguments_in_turn &arguments)
{
    if (at < text.size() && text[at] == '*') {
        ++at;
        const auto *argument = arguments.next();
        if (argument == nullptr || !is_integer(*argument)) return std::nullopt;
        return std::clamp(static_cast<std::int32_t>(argument->bits), -longest_padding, longest_padding);
    }
    const auto number = read_number(text, at);
    return number ? std::optional(std::min(*number, longest_padding)) : std::nullopt;
}

void read_flags(std::string_view text, std::size_t &at, conversion &result)
{
    for (; at < text.size(); ++at) {
        switch (text[at]) {
        case '-': result.left = true; break;
        case '+': result.plus = true; break;
        case ' ': result.space = true; break;
        case '#': result.alternate = true; break;
        case '0': result.zero = true; break;
        case '\'': break;
        default: return;
        }
    }
}

void read_length(std::string_view text, std::size_t &at, conversion &result)
{
    const auto skip = [&](std::string_view modifier, unsigned bits) {
        if (text.substr(at, modifier.size()) != modifier) return false;
        at += modifier.size();
        result.bits = bits;
        return true;
    };
    (void)(skip("hh", 8) || skip("h", 16) || skip("ll", 64) || skip("l", 64) || skip("j", 64) || skip("z", 64) ||
           skip("t", 64) || skip("q", 64) || skip("L", 64));
}

// `text` begins with the per cent sign.
std::optional<conversion> read_conversion(std::string_view text, arguments_in_turn &arguments)
{
    conversion result;
    std::size_t at = 1;
    const std::size_t after_percent = at;
    const auto position = read_number(text, at);
    if (position && *position > 0 && at < text.size() && text[at] == '$') {
        result.position = static_cast<std::size_t>(*position - 1);
        ++at;
    } else {
        at = after_percent;
    }
    read_flags(text, at, result);
    result.width = read_size(text, at, arguments).value_or(0);
    if (result.width < 0) {
        result.left = true;
        result.width = -result.width;
    }
    if (at < text.size() && text[at] == '.') {
        ++at;
        const int precision = read_size(text, at, arguments).value_or(0);
        if (precision >= 0) result.precision = precision;
    }
    read_length(text, at, result);
    if (at >= text.size()) return std::nullopt;
    result.type = text[at];
    result.length = at + 1;
    return result;
}

std::string pad(std::string text, const conversion &how)
{
    const std::size_t width = static_cast<std::size_t>(how.width);
    if (text.size() >= width) return text;
    return how.left ? text + std::string(width - text.size(), ' ') : std::string(width - text.size(), ' ') + text;
}

std::string digits_of(std::uint64_t value, const conversion &how)
{
    switch (how.type) {
    case 'x': return fmt::format("{:x}", value);
    case 'X': return fmt::format("{:X}", value);
    case 'o': return fmt::format("{:o}", value);
    default: return fmt::format("{}", value);
    }
}

std::string integer_text(std::uint64_t bits, const conversion &how)
{
    const unsigned unused = 64 - how.bits;
    std::string sign;
    std::uint64_t magnitude = bits << unused >> unused;
    if (how.type == 'd' || how.type == 'i') {
        const std::int64_t value = static_cast<std::int64_t>(bits << unused) >> unused;
        if (value < 0) {
            magnitude = 0 - static_cast<std::uint64_t>(value);
            sign = "-";
        } else if (how.plus || how.space) {
            sign = how.plus ? "+" : " ";
        }
    } else if (how.alternate && magnitude != 0 && how.type != 'u') {
        sign = how.type == 'x' ? "0x" : how.type == 'X' ? "0X" : "0";
    }
    std::string digits = digits_of(magnitude, how);
    std::size_t least_digits = static_cast<std::size_t>(how.precision.value_or(1));
    if (how.zero && !how.left && !how.precision && static_cast<std::size_t>(how.width) > sign.size()) {
        least_digits = static_cast<std::size_t>(how.width) - sign.size();
    }
    if (magnitude == 0 && least_digits == 0) digits.clear();
    if (digits.size() < least_digits) digits.insert(0, least_digits - digits.size(), '0');
    return pad(sign + digits, how);
}

std::string double_text(double value, const conversion &how)
{
    std::string spec = "{:";
    if (how.left) spec += '<';
    if (how.plus || how.space) spec += how.plus ? '+' : ' ';
    if (how.alternate) spec += '#';
    if (how.zero && !how.left) spec += '0';
    if (how.width > 0) spec += fmt::format("{}", how.width);
    // Without a precision the printf family gives six digits, and to %a as many as the value needs.
    if (how.precision || (how.type != 'a' && how.type != 'A')) spec += fmt::format(".{}", how.precision.value_or(6));
    spec += how.type;
    spec += '}';
    return fmt::format(fmt::runtime(spec), value);
}

// The argument as the conversion wants it; nothing when the two do not go together.
std::optional<std::string> convert(const error_argument &argument, const conversion &how)
{
    switch (how.type) {
    case 'd':
    case 'i':
    case 'u':
    case 'x':
    case 'X':
    case 'o':
        if (!is_integer(argument)) return std::nullopt;
        return integer_text(argument.bits, how);
    case 'c':
        if (!is_integer(argument)) return std::nullopt;
        return pad(std::string(1, static_cast<char>(argument.bits)), how);
    case 'e':
    case 'E':
    case 'f':
    case 'F':
    case 'g':
    case 'G':
    case 'a':
    case 'A':
        if (argument.type != argument_type::double_value) return std::nullopt;
        return double_text(std::bit_cast<double>(argument.bits), how);
    case 's': {
        if (argument.type != argument_type::string) return std::nullopt;
        auto text = argument.text.value_or("(null)");
        if (how.precision) text = text.substr(0, static_cast<std::size_t>(*how.precision));
        return pad(std::string(text), how);
    }
    case 'p':
        if (argument.type != argument_type::pointer) return std::nullopt;
        return pad(fmt::format("{:#x}", argument.bits), how);
    default: return std::nullopt;
    }
}

struct filled_message {
    std::string text;
    bool whole = true; // no conversion was left as it stands
};

filled_message fill(std::string_view message, const std::vector<error_argument> &arguments)
{
    filled_message result;
    arguments_in_turn in_turn(arguments);
    while (!message.empty()) {
        const auto percent = std::min(message.find('%'), message.size());
        result.text.append(message.substr(0, percent));
        message.remove_prefix(percent);
        if (message.empty()) break;
        const auto how = read_conversion(message, in_turn);
        if (!how) {
            result.text.append(message);
            result.whole = false;
            break;
        }
        const auto as_it_stands = message.substr(0, how->length);
        message.remove_prefix(how->length);
        if (how->type == '%') {
            result.text += '%';
            continue;
        }
        const auto *argument = how->position ? in_turn.at(*how->position) : in_turn.next();
        const auto text = argument == nullptr ? std::nullopt : convert(*argument, *how);
        result.text.append(text ? *text : as_it_stands);
        result.whole = result.whole && text.has_value();
    }
    return result;
}

} // namespace

std::string fill_in(std::string_view message, const std::vector<error_argument> &arguments)
{
    return fill(message, arguments).text;
}

std::optional<std::string> fill_in_whole(std::string_view message, const std::vector<error_argument> &arguments)
{
    filled_message filled = fill(message, arguments);
    return filled.whole ? std::optional(std::move(filled.text)) : std::nullopt;
}

} // namespace qn::reader
