// Loads from bytes that came out of a file: in the file's byte order, at any alignment, never outside the bytes.
//
// Decoding code asks holds() before it follows a length or an offset. A load that it forgot to ask for throws instead
// of reading what is not there: that is a mistake of the reader, not a property of the file.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <stdexcept>
#include <string_view>

namespace qn::reader
{

enum class byte_order { little, big };

class byte_view
{
public:
    byte_view() = default;
    byte_view(std::span<const std::byte> bytes, byte_order order) : bytes_(bytes), order_(order) {}

    std::size_t size() const { return bytes_.size(); }
    byte_order order() const { return order_; }
    std::span<const std::byte> bytes() const { return bytes_; }

    bool holds(std::uint64_t at, std::uint64_t count) const
    {
        return at <= bytes_.size() && count <= bytes_.size() - at;
    }

    std::span<const std::byte> part(std::uint64_t at, std::uint64_t count) const
    {
        if (!holds(at, count)) throw std::out_of_range("byte_view: load outside the bytes");
        return bytes_.subspan(at, count);
    }

    template <std::unsigned_integral T>
    T load(std::uint64_t at) const
    {
        const auto source = part(at, sizeof(T));
        std::uint64_t value = 0;
        for (std::size_t i = 0; i < sizeof(T); ++i) {
            const std::size_t shift = 8 * (order_ == byte_order::little ? i : sizeof(T) - 1 - i);
            value |= std::to_integer<std::uint64_t>(source[i]) << shift;
        }
        return static_cast<T>(value);
    }

    std::uint8_t u8(std::uint64_t at) const { return load<std::uint8_t>(at); }
    std::uint16_t u16(std::uint64_t at) const { return load<std::uint16_t>(at); }
    std::uint32_t u32(std::uint64_t at) const { return load<std::uint32_t>(at); }
    std::uint64_t u64(std::uint64_t at) const { return load<std::uint64_t>(at); }

    // The bytes as text, NULs included.
    std::string_view chars(std::uint64_t at, std::uint64_t count) const
    {
        const auto source = part(at, count);
        return {reinterpret_cast<const char *>(source.data()), source.size()};
    }

private:
    std::span<const std::byte> bytes_;
    byte_order order_ = byte_order::little;
};

// Text that should end with a NUL inside the bytes it was taken from.
struct bounded_text {
    std::string_view text;   // up to the NUL, or all there is
    bool terminated = false; // a NUL was found
};

inline bounded_text cut_at_nul(std::string_view chars)
{
    const auto end = chars.find('\0');
    if (end == std::string_view::npos) return {chars, false};
    return {chars.substr(0, end), true};
}

} // namespace qn::reader
