#include "reader/trace_builder.h"

#include <algorithm>
#include <stdexcept>

namespace qn::test
{

byte_string &byte_string::number(std::uint64_t value, std::size_t width)
{
    for (std::size_t i = 0; i < width; ++i) {
        const std::size_t shift = 8 * (order_ == endian::little ? i : width - 1 - i);
        bytes_.push_back(static_cast<std::byte>(value >> shift & 0xFF));
    }
    return *this;
}

byte_string &byte_string::u8(std::uint8_t value) { return number(value, 1); }
byte_string &byte_string::u16(std::uint16_t value) { return number(value, 2); }
byte_string &byte_string::u32(std::uint32_t value) { return number(value, 4); }
byte_string &byte_string::u64(std::uint64_t value) { return number(value, 8); }

byte_string &byte_string::chars(std::string_view text)
{
    for (const char c : text) {
        bytes_.push_back(static_cast<std::byte>(c));
    }
    return *this;
}

byte_string &byte_string::text(std::string_view text) { return chars(text).u8(0); }

byte_string &byte_string::zeros(std::size_t count)
{
    bytes_.resize(bytes_.size() + count);
    return *this;
}

trace_builder::trace_builder(std::size_t size, endian order) : order_(order), bytes_(size)
{
    put_u8(0, order == endian::little ? 0xC0 : 0x40);
    put_u8(1, 2);
    put_u16(2, 6);
    put_u32(8, 200);
    put_u32(12, 1);
    put_u32(20, static_cast<std::uint32_t>(size));
    put_u64(24, ticks_per_second);
    put_u64(32, epoch_ns);
    put_u32(44, 200);
    put_u32(48, 4711);
    put_text(52, "/opt/app/bin/app -v");
    put_text(100, "builder 1");
    put_text(132, "app");
    put_u64(180, 0xABCD);
}

void trace_builder::put(std::size_t offset, const byte_string &bytes)
{
    if (offset + bytes.size() > bytes_.size()) throw std::out_of_range("the file under construction is too small");
    std::copy(bytes.bytes().begin(), bytes.bytes().end(), bytes_.begin() + static_cast<std::ptrdiff_t>(offset));
}

void trace_builder::put_record_header(std::size_t length, std::uint16_t function, std::uint32_t record_seq)
{
    std::string four = component;
    four.resize(4);
    put(at, byte_string(order_)
                .u32(static_cast<std::uint32_t>(length))
                .u16(function)
                .u16(reserved)
                .u32(record_seq)
                .chars(four)
                .u32(thread)
                .u64(counter));
    counter += 1000;
}

std::size_t trace_builder::add(std::uint16_t function, const byte_string &body, std::size_t slack)
{
    const std::size_t offset = at;
    const std::size_t length = (28 + body.size() + 3) / 4 * 4 + slack;
    if (at + length > bytes_.size()) throw std::out_of_range("the file under construction is too small");
    seq += 2;
    put_record_header(length, function, seq);
    put(at + 28, body);
    at += length;
    return offset;
}

std::size_t trace_builder::add_strings(std::uint32_t id, const std::vector<std::string> &strings)
{
    byte_string text(order_);
    for (const auto &string : strings) {
        text.text(string);
    }
    byte_string body(order_);
    body.u32(id).u32(static_cast<std::uint32_t>(strings.size())).u32(static_cast<std::uint32_t>(text.size()));
    for (const std::byte byte : text.bytes()) {
        body.u8(std::to_integer<std::uint8_t>(byte));
    }
    return add(15, body);
}

std::size_t trace_builder::add_start(std::uint32_t pid, std::uint64_t ticks, std::uint64_t epoch,
                                     std::uint16_t function, std::string_view text)
{
    byte_string body(order_);
    body.u32(0xDEADBEEF).u32(pid).u64(ticks).u64(epoch);
    if (function == 19) body.text(text);
    const std::string writer = component;
    component = "____";
    const std::size_t offset = add(function, body);
    component = writer;
    return offset;
}

std::size_t trace_builder::add_free(std::size_t length, std::uint32_t free_seq)
{
    const std::size_t offset = at;
    put_record_header(length, 0, free_seq);
    at += length;
    return offset;
}

void trace_builder::close()
{
    set_oldest(at < bytes_.size() ? at : 200);
    if (at < bytes_.size()) add_free(bytes_.size() - at);
}

} // namespace qn::test
