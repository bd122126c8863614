#include "reader/errors/error_records.h"

namespace qn::test
{

void add_error(trace_builder &file, const error_record &error)
{
    constexpr std::uint32_t arguments = 2;
    byte_string texts;
    const auto place_of = [&](const std::optional<std::string> &text) {
        if (!text) return std::uint32_t{0};
        const auto place = static_cast<std::uint32_t>(72 + arguments * 16 + texts.size());
        texts.text(*text);
        return place;
    };
    byte_string body;
    body.u32(31).u32(error.error_id).u32(error.line);
    body.u32(place_of(error.function)).u32(place_of(error.file)).u32(place_of(error.ffdc_id));
    body.u32(error.set).u32(error.number);
    body.u32(place_of(error.catalogue)).u32(place_of(error.default_message));
    body.u32(arguments);
    body.u32(0).u32(0).u64(static_cast<std::uint32_t>(error.code));
    body.u32(5).u32(0).u64(place_of(error.name));
    for (const std::byte byte : texts.bytes()) body.u8(std::to_integer<std::uint8_t>(byte));
    file.add(14, body);
}

} // namespace qn::test
