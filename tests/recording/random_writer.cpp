#include "recording/random_writer.h"

#include <algorithm>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include <qn_tr.h>

namespace
{
constexpr uint32_t most_values = 600;

// Writes up to most_values values that count up from `first`.
template <class Value, class Call, size_t... i>
qn_int32_t with_values(Call call, Value first, std::index_sequence<i...>)
{
    return call(static_cast<Value>(first + Value{i})...);
}
} // namespace

namespace qn::test
{
random_record random_writer::write()
{
    switch (below(8)) {
    case 0: return write_strings();
    case 1: return write_formatted();
    case 2: return write_data();
    case 3: return write_values_32();
    case 4: return write_values_64();
    case 5: return write_error();
    default: return write_id();
    }
}

uint32_t random_writer::length()
{
    if (below(400) == 0) return below(longest_ + longest_ / 8) + 1;
    return below(20) == 0 ? below(std::min(longest_, 4000U)) + 1 : below(60) + 1;
}

std::string random_writer::text(uint32_t length)
{
    const uint32_t first = below(255);
    std::string characters(length, '\0');
    for (uint32_t i = 0; i < length; ++i) characters[i] = static_cast<char>((first + i * 7) % 255 + 1);
    return characters;
}

random_record random_writer::write_id()
{
    const auto id = static_cast<uint32_t>(random_());
    EXPECT_EQ(tr_record_id_1("IDS1", id), 0);
    return {1, "IDS1", expected_bytes().u32(id)};
}

random_record random_writer::write_strings()
{
    const uint32_t count = below(4) + 1;
    std::string strings[4];
    for (std::string &string : strings) string = text(length());
    EXPECT_EQ(tr_record_strings_1("STRS", 9, count, strings[0].c_str(), strings[1].c_str(), strings[2].c_str(),
                                  strings[3].c_str()),
              0);

    uint32_t kept = 0;
    uint32_t total = 0;
    expected_bytes texts;
    while (kept < count && total + strings[kept].size() + 1 <= longest_) {
        total += static_cast<uint32_t>(strings[kept].size() + 1);
        texts.string(strings[kept++]);
    }
    return {15, "STRS", expected_bytes().u32(9).u32(kept).u32(total).append(texts).pad_to_4()};
}

random_record random_writer::write_formatted()
{
    const std::string inserted = text(below(30) == 0 ? below(2000) : below(80));
    const auto number = static_cast<int>(random_());
    EXPECT_EQ(tr_record_fmt_string_1("TEXT", 3, "<%d|%s>", number, inserted.c_str()), 0);

    std::string whole = "<" + std::to_string(number) + "|" + inserted + ">";
    whole.resize(std::min<size_t>(whole.size(), 1023));
    const auto size = static_cast<uint32_t>(whole.size() + 1);
    return {15, "TEXT", expected_bytes().u32(3).u32(1).u32(size).string(whole).pad_to_4()};
}

random_record random_writer::write_data()
{
    const uint32_t count = below(4);
    std::string blocks[3];
    for (std::string &block : blocks) block = text(length() - 1);
    const auto size = [&](int i) { return static_cast<int>(blocks[i].size()); };
    EXPECT_EQ(tr_record_data_1("DATA", 8, count, blocks[0].data(), size(0), blocks[1].data(), size(1), blocks[2].data(),
                               size(2)),
              0);

    uint32_t kept = 0;
    uint32_t total = 36;
    expected_bytes kept_blocks;
    for (; kept < count; ++kept) {
        const auto bytes = static_cast<uint32_t>(blocks[kept].size());
        const uint32_t padded = 4 + (bytes + 3) / 4 * 4;
        if (total + padded > longest_) break;
        total += padded;
        kept_blocks.u32(bytes).raw(blocks[kept]).pad_to_4();
    }
    return {3, "DATA", expected_bytes().u32(8).u32(kept).append(kept_blocks)};
}

random_record random_writer::write_values_32()
{
    const uint32_t count = below(20) == 0 ? below(most_values + 1) : below(9);
    const auto first = static_cast<uint32_t>(random_());
    EXPECT_EQ(with_values([=](auto... values) { return tr_record_values_32_1("VL32", 5, count, values...); }, first,
                          std::make_index_sequence<most_values>()),
              0);

    const uint32_t kept = std::min(count, (longest_ - 36) / 4);
    expected_bytes body;
    body.u32(5).u32(kept);
    for (uint32_t i = 0; i < kept; ++i) body.u32(first + i);
    return {12, "VL32", body};
}

random_record random_writer::write_values_64()
{
    const uint32_t count = below(20) == 0 ? below(most_values + 1) : below(9);
    const uint64_t first = random_();
    EXPECT_EQ(with_values([=](auto... values) { return tr_record_values_64_1("VL64", 6, count, values...); }, first,
                          std::make_index_sequence<most_values>()),
              0);

    const uint32_t kept = std::min(count, (longest_ - 36) / 8);
    expected_bytes body;
    body.u32(6).u32(kept);
    for (uint32_t i = 0; i < kept; ++i) body.u64(first + i);
    // A record that was cut may be half a value longer than its values.
    if (kept < count) body.anything(longest_ - 36 - 8 * kept);
    return {13, "VL64", body};
}

random_record random_writer::write_error()
{
    std::string texts[5]; // function, file, first-failure identifier, catalogue, default text
    bool there[5];
    for (int i = 0; i < 5; ++i) {
        texts[i] = text(length());
        there[i] = below(3) != 0;
    }
    const uint32_t count = below(4);
    cu_error_arg_t arguments[3]{};
    std::string inserts[3];
    for (uint32_t i = 0; i < count; ++i) {
        inserts[i] = text(length());
        const bool is_string = below(2) == 0;
        arguments[i].cu_arg_type = is_string ? CU_ERROR_ARG_CHAR_STR : CU_ERROR_ARG_LONG_LONG;
        if (is_string)
            arguments[i].cu_arg_value.cu_char_str = inserts[i].data();
        else
            arguments[i].cu_arg_value.cu_long_long = static_cast<long long>(random_());
    }
    const auto text_or_null = [&](int i) { return there[i] ? texts[i].data() : nullptr; };
    cu_error_t error{};
    error.cu_error_id = static_cast<int>(below(1000) + 1);
    error.cu_ffdc_id = text_or_null(2);
    error.cu_msg_cat = text_or_null(3);
    error.cu_msg_set = 1;
    error.cu_msg_num = 2;
    error.cu_msg_default = text_or_null(4);
    error.cu_arg_cnt = count;
    error.cu_args = arguments;
    cu_error_t *given = &error;
    EXPECT_EQ(tr_record_error_1("ERRS", 4, text_or_null(0), 77, text_or_null(1), &given), 0);

    uint32_t place = 72 + 16 * count;
    uint32_t offsets[5] = {};
    expected_bytes strings;
    for (int i = 0; i < 5; ++i) {
        if (!there[i]) continue;
        offsets[i] = place;
        place += static_cast<uint32_t>(texts[i].size() + 1);
        strings.string(texts[i]);
    }
    expected_bytes table;
    for (uint32_t i = 0; i < count; ++i) {
        table.u32(static_cast<uint32_t>(arguments[i].cu_arg_type)).anything(4);
        if (arguments[i].cu_arg_type == CU_ERROR_ARG_LONG_LONG) {
            table.u64(static_cast<uint64_t>(arguments[i].cu_arg_value.cu_long_long));
            continue;
        }
        table.u64(place);
        place += static_cast<uint32_t>(inserts[i].size() + 1);
        strings.string(inserts[i]);
    }
    expected_bytes body;
    body.u32(4).u32(static_cast<uint32_t>(error.cu_error_id)).u32(77);
    body.u32(offsets[0]).u32(offsets[1]).u32(offsets[2]).u32(1).u32(2).u32(offsets[3]).u32(offsets[4]).u32(count);
    return {14, "ERRS", body.append(table).append(strings).pad_to_4()};
}
} // namespace qn::test
