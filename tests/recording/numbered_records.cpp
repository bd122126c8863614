#include "recording/numbered_records.h"

#include <gtest/gtest.h>

#include "recording/expected_bytes.h"

namespace
{
using namespace qn::test;

// Bytes and texts that follow from author and number. 1 to 60 of them.
std::string text_of(const record_author &author, uint32_t number)
{
    std::string text(1 + (number * 7 + author.thread) % 60, '\0');
    for (size_t i = 0; i < text.size(); ++i) text[i] = static_cast<char>('A' + (number + author.run + i) % 58);
    return text;
}

uint64_t value_of(const record_author &author, uint32_t number)
{
    return (uint64_t{number} << 32 | author.run << 8 | author.thread) * 0x9E3779B97F4A7C15;
}

std::string component_of(const record_author &author)
{
    return {static_cast<char>('a' + author.run / 26), static_cast<char>('a' + author.run % 26), '-',
            static_cast<char>('0' + author.thread)};
}

struct expectation {
    uint16_t function;
    expected_bytes body;
};

expectation expected_of(const record_author &author, uint32_t number)
{
    const std::string text = text_of(author, number);
    const auto size = static_cast<uint32_t>(text.size());
    const uint64_t value = value_of(author, number);
    const auto low = static_cast<uint32_t>(value);
    expected_bytes body;
    body.u32(number); // the id, or the trace id
    switch (number % 7) {
    case 0: return {1, body};
    case 1: return {15, body.u32(2).u32(size + 5).string(text).string("end").pad_to_4()};
    case 2: return {15, body.u32(1).u32(size + 3).string(text + "=" + std::to_string(low % 10)).pad_to_4()};
    case 3: return {3, body.u32(2).u32(size).raw(text).pad_to_4().u32(4).raw("last")};
    case 4: return {12, body.u32(3).u32(low).u32(~low).u32(number)};
    case 5: return {13, body.u32(2).u64(value).u64(~value)};
    default:
        body.u32(number + 1).u32(50).u32(72).u32(0).u32(0).u32(1).u32(2).u32(0).u32(73 + size).u32(0);
        return {14, body.string(text).string("No.").pad_to_4()};
    }
}
} // namespace

namespace qn::test
{
qn_int32_t write_numbered(const record_author &author, uint32_t number, tr_file_token_t token)
{
    const std::string component = component_of(author);
    const char *id = component.c_str();
    const std::string text = text_of(author, number);
    const uint64_t value = value_of(author, number);
    const auto low = static_cast<uint32_t>(value);
    switch (number % 7) {
    case 0: return tr_ms_record_id_1(id, number, token);
    case 1: return tr_ms_record_strings_1(id, number, token, 2, text.c_str(), "end");
    case 2: return tr_ms_record_fmt_string_1(id, number, token, "%s=%u", text.c_str(), low % 10);
    case 3: return tr_ms_record_data_1(id, number, token, 2, text.data(), static_cast<int>(text.size()), "last", 4);
    case 4: return tr_ms_record_values_32_1(id, number, token, 3, low, ~low, number);
    case 5: return tr_ms_record_values_64_1(id, number, token, 2, value, ~value);
    default: break;
    }
    char message[] = "No.";
    cu_error_t error{};
    error.cu_error_id = static_cast<int>(number + 1);
    error.cu_msg_set = 1;
    error.cu_msg_num = 2;
    error.cu_msg_default = message;
    cu_error_t *given = &error;
    return tr_ms_record_error_1(id, number, token, text.c_str(), 50, nullptr, &given);
}

std::optional<record_author> author_of(const record_image &record)
{
    const std::string component = record.component();
    if (component[2] != '-') return std::nullopt;
    return record_author{static_cast<uint32_t>(component[0] - 'a') * 26 + static_cast<uint32_t>(component[1] - 'a'),
                         static_cast<uint32_t>(component[3] - '0')};
}

std::map<record_author, std::vector<uint32_t>> numbers_in(const std::vector<record_image> &ring)
{
    std::map<record_author, std::vector<uint32_t>> numbers;
    for (const record_image &record : ring) {
        const auto author = record.is_data() ? author_of(record) : std::nullopt;
        if (!author) continue;
        const uint32_t number = record.u32(28);
        const expectation expected = expected_of(*author, number);
        EXPECT_EQ(record.function(), expected.function) << "at " << record.offset;
        EXPECT_TRUE(expected.body.match(record.bytes, 28)) << "at " << record.offset << "\nexpected " << expected.body
                                                           << "\n   found " << hexadecimal(record.bytes.substr(28));
        numbers[*author].push_back(number);
    }
    return numbers;
}
} // namespace qn::test
