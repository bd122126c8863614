#include "tools/qntrace/select/number.h"

#include <charconv>

namespace qn::dump
{

bool is_hexadecimal(std::string_view digits) { return digits.starts_with("0x") || digits.starts_with("0X"); }

std::optional<std::uint64_t> parse_number(std::string_view digits)
{
    const int base = is_hexadecimal(digits) ? 16 : 10;
    if (base == 16) digits.remove_prefix(2);
    std::uint64_t value = 0;
    const auto *end = digits.data() + digits.size();
    const auto [stopped, error] = std::from_chars(digits.data(), end, value, base);
    if (error != std::errc() || stopped != end) return std::nullopt;
    return value;
}

} // namespace qn::dump
