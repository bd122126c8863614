// Whole numbers as a user writes them.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace qn::dump
{

bool is_hexadecimal(std::string_view digits);

// Decimal, or hexadecimal behind 0x. Nothing for anything else, and for what does not fit.
std::optional<std::uint64_t> parse_number(std::string_view digits);

} // namespace qn::dump
