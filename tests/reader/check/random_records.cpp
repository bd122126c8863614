#include "reader/check/random_records.h"

#include <algorithm>
#include <bit>
#include <cstdio>
#include <tuple>

#include "recording/writers.h"

namespace qn::test
{
namespace
{

constexpr std::uint32_t most_values = 16;
constexpr std::uint32_t most_texts = 5;

// Calls with all values behind the other arguments; the writer takes as many as it is told.
template <typename Value, typename Call>
qn_int32_t with_values(const std::vector<std::uint64_t> &from, const Call &call)
{
    const auto v = [&from](std::size_t i) { return static_cast<Value>(from[i]); };
    return call(v(0), v(1), v(2), v(3), v(4), v(5), v(6), v(7), v(8), v(9), v(10), v(11), v(12), v(13), v(14), v(15));
}

template <typename Body, typename Test>
bool holds_for(const reader::record_body &body, const Test &test)
{
    const auto *found = std::get_if<Body>(&body);
    return found != nullptr && test(*found);
}

template <typename Body>
bool same_values(const reader::record_body &body, std::uint32_t id, const std::vector<std::uint64_t> &values,
                 std::uint32_t count)
{
    return holds_for<Body>(body, [&](const Body &found) {
        if (found.id != id || found.values.size() != count) return false;
        for (std::uint32_t i = 0; i < count; ++i)
            if (found.values[i] != static_cast<decltype(found.values[i])>(values[i])) return false;
        return true;
    });
}

bool is(const std::optional<std::string_view> &found, const std::string &text) { return found && *found == text; }

} // namespace

std::string random_records::text(std::uint32_t most)
{
    const std::uint32_t length = below(most) + 1;
    const std::uint32_t first = below(255);
    std::string characters(length, '\0');
    for (std::uint32_t i = 0; i < length; ++i) characters[i] = static_cast<char>((first + i * 7) % 255 + 1);
    return characters;
}

void random_records::next()
{
    call_ = static_cast<call>(below(8));
    file_ = below(1 << 16);
    component_.clear();
    for (std::uint32_t i = 0; i < 4; ++i) component_ += static_cast<char>('A' + below(26));
    id_ = static_cast<std::uint32_t>(random_());
    writer_ = below(static_cast<std::uint32_t>(all_writers().size()));
    if (call_ == call::any_writer && !all_writers()[writer_].takes_token) file_ = default_file;
    line_ = static_cast<std::uint32_t>(random_());
    const std::uint32_t most_bytes = below(100) == 0 ? 3000 : 24;
    texts_.clear();
    for (std::uint32_t i = 0; i < most_texts; ++i) texts_.push_back(text(i == 1 ? most_bytes : 24));
    values_.clear();
    for (std::uint32_t i = 0; i < most_values; ++i) values_.push_back(std::uint64_t{random_()} << 32 | random_());
    switch (call_) {
    case call::strings: count_ = below(most_texts) + 1; break;
    case call::data: count_ = below(most_texts + 1); break;
    case call::error: count_ = 3; break;
    default: count_ = below(most_values + 1); break;
    }
}

qn_int32_t random_records::write(tr_file_token_t token) const
{
    const char *component = component_.c_str();
    const auto size = [this](std::size_t i) { return static_cast<int>(texts_[i].size()); };
    const auto chars = [this](std::size_t i) { return texts_[i].c_str(); };
    switch (call_) {
    case call::id: return tr_ms_record_id_1(component, id_, token);
    case call::strings:
        return tr_ms_record_strings_1(component, id_, token, count_, chars(0), chars(1), chars(2), chars(3), chars(4));
    case call::formatted:
        return tr_ms_record_fmt_string_1(component, id_, token, "<%d|%s|%llx>", static_cast<int>(values_[0]), chars(0),
                                         static_cast<unsigned long long>(values_[1]));
    case call::data:
        return tr_ms_record_data_1(component, id_, token, count_, chars(0), size(0), chars(1), size(1), chars(2),
                                   size(2), chars(3), size(3), chars(4), size(4));
    case call::values_32:
        return with_values<qn_int32_t>(values_, [&](auto... values) {
            return tr_ms_record_values_32_1(component, id_, token, count_, values...);
        });
    case call::values_64:
        return with_values<qn_int64_t>(values_, [&](auto... values) {
            return tr_ms_record_values_64_1(component, id_, token, count_, values...);
        });
    case call::error: return write_error(token);
    case call::any_writer: return all_writers()[writer_].write(component, token);
    }
    return -1;
}

qn_int32_t random_records::write_error(tr_file_token_t token) const
{
    auto texts = texts_;
    cu_error_arg_t inserts[3]{};
    inserts[0].cu_arg_type = CU_ERROR_ARG_INT;
    inserts[0].cu_arg_value.cu_int = static_cast<int>(values_[0]);
    inserts[1].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    inserts[1].cu_arg_value.cu_char_str = texts[0].data();
    inserts[2].cu_arg_type = CU_ERROR_ARG_DOUBLE;
    inserts[2].cu_arg_value.cu_double = static_cast<double>(values_[1]);
    cu_error_t error{};
    error.cu_error_id = static_cast<int>(values_[2] % 1000 + 1);
    error.cu_msg_cat = texts[1].data();
    error.cu_msg_set = 1;
    error.cu_msg_num = static_cast<int>(values_[3] % 100);
    error.cu_msg_default = texts[2].data();
    error.cu_arg_cnt = count_;
    error.cu_args = inserts;
    cu_error_t *given = &error;
    return tr_ms_record_error_1(component_.c_str(), id_, token, texts[3].c_str(), line_, texts[4].c_str(), &given);
}

std::string random_records::difference(const reader::trace_record &found) const
{
    if (!found.problem.empty()) return found.problem;
    if (!found.time) return "it has no time";
    if (!std::equal(component_.begin(), component_.end(), found.raw.header.component.begin())) return "the component";
    const auto &body = found.body;
    bool same = false;
    switch (call_) {
    case call::id:
        same = holds_for<reader::identifier_body>(body, [this](const auto &id) { return id.id == id_; });
        break;
    case call::strings:
    case call::formatted: same = same_strings(body); break;
    case call::data: same = same_blocks(body); break;
    case call::values_32: same = same_values<reader::values_32_body>(body, id_, values_, count_); break;
    case call::values_64: same = same_values<reader::values_64_body>(body, id_, values_, count_); break;
    case call::error: same = same_error(body); break;
    case call::any_writer: same = same_bytes(found.raw); break;
    }
    return same ? "" : "the body";
}

bool random_records::same_strings(const reader::record_body &body) const
{
    std::vector<std::string> expected(texts_.begin(), texts_.begin() + (call_ == call::strings ? count_ : 1));
    if (call_ == call::formatted) {
        char hexadecimal[17];
        std::snprintf(hexadecimal, sizeof hexadecimal, "%llx", static_cast<unsigned long long>(values_[1]));
        expected[0] =
            "<" + std::to_string(static_cast<int>(values_[0])) + "|" + texts_[0] + "|" + std::string(hexadecimal) + ">";
    }
    return holds_for<reader::strings_body>(body, [&](const reader::strings_body &found) {
        return found.id == id_ &&
               std::equal(found.strings.begin(), found.strings.end(), expected.begin(), expected.end());
    });
}

bool random_records::same_blocks(const reader::record_body &body) const
{
    return holds_for<reader::data_blocks_body>(body, [this](const reader::data_blocks_body &found) {
        if (found.id != id_ || found.count != count_ || found.blocks.size() != count_) return false;
        for (std::uint32_t i = 0; i < count_; ++i) {
            const auto expected = std::as_bytes(std::span(texts_[i]));
            if (!std::equal(found.blocks[i].begin(), found.blocks[i].end(), expected.begin(), expected.end()))
                return false;
        }
        return true;
    });
}

bool random_records::same_bytes(const reader::raw_record &found) const
{
    const auto &writer = all_writers()[writer_];
    const auto bytes = found.bytes.bytes();
    return found.header.function == writer.function &&
           writer.body.match({reinterpret_cast<const char *>(bytes.data()), bytes.size()}, 28);
}

bool random_records::same_error(const reader::record_body &body) const
{
    return holds_for<reader::error_body>(body, [this](const reader::error_body &found) {
        using reader::argument_type;
        const bool same_place = found.id == id_ && found.line == line_ && is(found.function, texts_[3]) &&
                                is(found.file, texts_[4]) && !found.ffdc_id;
        const bool same_message = found.error_id == values_[2] % 1000 + 1 && is(found.catalogue, texts_[1]) &&
                                  found.message_set == 1 && found.message_number == values_[3] % 100 &&
                                  is(found.default_message, texts_[2]);
        if (!same_place || !same_message || found.arguments.size() != 3) return false;
        const auto &[number, string, real] = std::tie(found.arguments[0], found.arguments[1], found.arguments[2]);
        return number.type == argument_type::int_value &&
               static_cast<std::uint32_t>(number.bits) == static_cast<std::uint32_t>(values_[0]) &&
               string.type == argument_type::string && is(string.text, texts_[0]) &&
               real.type == argument_type::double_value &&
               std::bit_cast<double>(real.bits) == static_cast<double>(values_[1]);
    });
}

} // namespace qn::test
