// What the bytes of a record should be. Padding may be anything, and is compared with nothing.
#pragma once

#include <cstdint>
#include <ostream>
#include <string>
#include <string_view>

#include "support/trace_image.h"

namespace qn::test
{
class expected_bytes
{
public:
    expected_bytes &u32(uint32_t value) { return number(value); }
    expected_bytes &u64(uint64_t value) { return number(value); }
    expected_bytes &raw(std::string_view bytes)
    {
        bytes_ += bytes;
        known_.append(bytes.size(), 'k');
        return *this;
    }
    // With its NUL.
    expected_bytes &string(std::string_view text) { return raw(text).raw(std::string_view("", 1)); }
    expected_bytes &anything(size_t count)
    {
        bytes_.append(count, '?');
        known_.append(count, ' ');
        return *this;
    }
    expected_bytes &append(const expected_bytes &more)
    {
        bytes_ += more.bytes_;
        known_ += more.known_;
        return *this;
    }
    expected_bytes &pad_to_4() { return anything((4 - bytes_.size() % 4) % 4); }

    size_t size() const { return bytes_.size(); }

    // Whether `found`, from offset `at` on, is that; `found` may be longer.
    bool match(std::string_view found, size_t at = 0) const
    {
        if (found.size() < at + bytes_.size()) return false;
        for (size_t i = 0; i < bytes_.size(); ++i)
            if (known_[i] == 'k' && found[at + i] != bytes_[i]) return false;
        return true;
    }

    // As hexadecimal digits, "??" for what may be anything.
    std::string shown() const;

private:
    template <class Number>
    expected_bytes &number(Number value)
    {
        return raw({reinterpret_cast<const char *>(&value), sizeof value});
    }

    std::string bytes_;
    std::string known_;
};

inline std::ostream &operator<<(std::ostream &out, const expected_bytes &bytes) { return out << bytes.shown(); }

std::string hexadecimal(std::string_view bytes);

// Fails the test unless the record has that kind, component and body, and the length that goes with the body.
void expect_record(const record_image &record, uint16_t function, std::string_view component,
                   const expected_bytes &body);
} // namespace qn::test
