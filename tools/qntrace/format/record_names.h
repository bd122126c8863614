// What the formats call record kinds, argument types and page states.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tools/qntrace/reader/decode.h"

namespace qn::dump
{

inline constexpr std::uint32_t id_of_no_id = 0xFFFFFFFF; // what the writers without an id store

std::string_view kind_name(const reader::record_body &body);
std::string_view argument_type_name(reader::argument_type type);
// Nothing for a value that is no state.
std::string_view page_state_name(std::uint8_t state);
// The value of an argument that is no string; for one of an unknown type its 64 bits in hexadecimal.
std::string argument_value(const reader::error_argument &argument);
// The zone offset, stored as minutes west of Greenwich; nonsense is left as the number it is.
std::string zone_text(std::int32_t minutes_west);
// The component identifier, without the bytes behind a NUL: a shorter one is stored with its terminator.
std::string_view component_name(const reader::record_header &header);

} // namespace qn::dump
