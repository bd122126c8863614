#include "recording/expected_bytes.h"

#include <gtest/gtest.h>

namespace qn::test
{
std::string hexadecimal(std::string_view bytes)
{
    static constexpr char digits[] = "0123456789abcdef";
    std::string text;
    for (const char byte : bytes) {
        const auto value = static_cast<unsigned char>(byte);
        text += digits[value / 16];
        text += digits[value % 16];
    }
    return text;
}

std::string expected_bytes::shown() const
{
    std::string text = hexadecimal(bytes_);
    for (size_t i = 0; i < known_.size(); ++i)
        if (known_[i] != 'k') text.replace(2 * i, 2, "??");
    return text;
}

void expect_record(const record_image &record, uint16_t function, std::string_view component,
                   const expected_bytes &body)
{
    EXPECT_EQ(record.function(), function);
    EXPECT_EQ(record.component(), component);
    EXPECT_EQ(record.length(), 28 + body.size());
    EXPECT_TRUE(body.match(record.bytes, 28))
        << "expected " << body.shown() << "\n   found " << hexadecimal(record.bytes.substr(28));
}
} // namespace qn::test
