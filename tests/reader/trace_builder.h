// Builds trace files byte by byte, for the reader's tests.
//
// It shares nothing with the recorder and the reader: every offset and code is the number that the format gives, so
// that a field that moves, or that reader and recorder misread alike, is noticed here.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace qn::test
{

enum class endian { little, big };

// Bytes put behind each other.
class byte_string
{
public:
    explicit byte_string(endian order = endian::little) : order_(order) {}

    byte_string &u8(std::uint8_t value);
    byte_string &u16(std::uint16_t value);
    byte_string &u32(std::uint32_t value);
    byte_string &u64(std::uint64_t value);
    byte_string &chars(std::string_view text); // without a NUL
    byte_string &text(std::string_view text);  // with one
    byte_string &zeros(std::size_t count);

    const std::vector<std::byte> &bytes() const { return bytes_; }
    std::size_t size() const { return bytes_.size(); }

private:
    byte_string &number(std::uint64_t value, std::size_t width);

    endian order_;
    std::vector<std::byte> bytes_;
};

// A file of `size` bytes with the header of a fresh one; its counter ticks once a nanosecond and stood at 0 at
// 2026-11-21T05:12:00Z.
class trace_builder
{
public:
    static constexpr std::uint64_t ticks_per_second = 1'000'000'000;
    static constexpr std::uint64_t epoch_ns = 1'795'237'920'000'000'000;

    explicit trace_builder(std::size_t size = 4096, endian order = endian::little);

    void put_u8(std::size_t at, std::uint8_t value) { bytes_.at(at) = std::byte{value}; }
    void put_u16(std::size_t at, std::uint16_t value) { put(at, byte_string(order_).u16(value)); }
    void put_u32(std::size_t at, std::uint32_t value) { put(at, byte_string(order_).u32(value)); }
    void put_u64(std::size_t at, std::uint64_t value) { put(at, byte_string(order_).u64(value)); }
    void put_text(std::size_t at, std::string_view text) { put(at, byte_string(order_).text(text)); }
    void put(std::size_t at, const byte_string &bytes);

    // What the next records carry.
    std::string component = "TEST";
    std::uint32_t thread = 0x7f01;
    std::uint16_t reserved = 0;
    std::uint64_t counter = 1'123'456'789; // grows by 1000 with each record
    std::uint32_t seq = 0;                 // grows by 2 before each record

    // Where the next record goes.
    std::size_t at = 200;

    // Adds a record and returns its offset. Its length is that of the body, rounded up, and `slack` bytes.
    std::size_t add(std::uint16_t function, const byte_string &body, std::size_t slack = 0);
    std::size_t add_id(std::uint32_t id) { return add(1, byte_string(order_).u32(id)); }
    std::size_t add_strings(std::uint32_t id, const std::vector<std::string> &strings);
    std::size_t add_start(std::uint32_t pid, std::uint64_t ticks, std::uint64_t epoch, std::uint16_t function = 16,
                          std::string_view text = {});
    // A free record of `length` bytes that carries `seq` as given.
    std::size_t add_free(std::size_t length, std::uint32_t seq = 4095);
    // Fills the ring up with a filler, and makes it the oldest record.
    void close();
    void set_oldest(std::size_t offset) { put_u32(44, static_cast<std::uint32_t>(offset)); }

    byte_string body() const { return byte_string(order_); }
    std::span<const std::byte> bytes() const { return bytes_; }
    std::vector<std::byte> copy() const { return bytes_; }

private:
    void put_record_header(std::size_t length, std::uint16_t function, std::uint32_t seq);

    endian order_;
    std::vector<std::byte> bytes_;
};

} // namespace qn::test
