// The text that the system log shows of a failure. No state, no lock; the catalogue is the caller's.
#include <algorithm>
#include <cstring>
#include <exception>
#include <optional>
#include <string>

#include <qn_ffdc.h>

#include "platform/common/files.h"
#include "platform/ffdc/text.h"

namespace qn::ffdc
{
namespace
{
const char *description(const fc_err_tbl_t &entry, nl_catd catalogue)
{
    if (catalogue == reinterpret_cast<nl_catd>(-1)) return entry.fc_desc_default;
    const char *text = catgets(catalogue, entry.fc_desc_msg_set, entry.fc_desc_msg_num, nullptr);
    return text != nullptr ? text : entry.fc_desc_default;
}

template <typename value_type>
std::string decimal(bytes field)
{
    value_type value;
    std::memcpy(&value, field.data(), sizeof value);
    return std::to_string(value);
}

// Nothing for an integer of a size that no integer has.
std::optional<std::string> signed_text(bytes field)
{
    switch (field.size()) {
    case 1: return decimal<signed char>(field);
    case 2: return decimal<int16_t>(field);
    case 4: return decimal<qn_int32_t>(field);
    case 8: return decimal<qn_int64_t>(field);
    default: return std::nullopt;
    }
}

std::optional<std::string> unsigned_text(bytes field)
{
    switch (field.size()) {
    case 1: return decimal<qn_uint8_t>(field);
    case 2: return decimal<qn_uint16_t>(field);
    case 4: return decimal<qn_uint32_t>(field);
    case 8: return decimal<qn_uint64_t>(field);
    default: return std::nullopt;
    }
}

std::string field_text(fc_detail_type_t type, bytes field)
{
    std::optional<std::string> number;
    if (type == FC_DETAIL_INT) number = signed_text(field);
    if (type == FC_DETAIL_UNSIGNED) number = unsigned_text(field);
    if (number) return *number;
    if (type == FC_DETAIL_TEXT) {
        const auto end = std::find(field.begin(), field.end(), '\0');
        return one_line(std::string(field.begin(), end));
    }
    std::string digits = "0x";
    append_hex(digits, field);
    return digits;
}

void append_word(std::string &out, const std::string &word)
{
    if (word.empty()) return;
    if (!out.empty()) out += ' ';
    out += word;
}

void append_fields(std::string &out, std::span<const fc_detail_field_t> fields, bytes detail)
{
    for (const fc_detail_field_t &field : fields) {
        if (field.fc_field_offset > detail.size() || field.fc_field_length > detail.size() - field.fc_field_offset)
            continue;
        const bytes data = detail.subspan(field.fc_field_offset, field.fc_field_length);
        append_word(out, one_line_or_nothing(field.fc_field_name) + "=" + field_text(field.fc_field_type, data));
    }
}

// `space` bytes of the text are of use.
std::string failure_text(const fc_err_tbl_t &entry, bytes detail, nl_catd catalogue, size_t space)
{
    std::string text = one_line_or_nothing(description(entry, catalogue));
    if (entry.fc_label != nullptr) append_word(text, "[" + one_line(entry.fc_label) + "]");
    if (entry.fc_detail_field_count > 0 && entry.fc_detail_fields != nullptr) {
        append_fields(text, {entry.fc_detail_fields, entry.fc_detail_field_count}, detail);
    } else if (!detail.empty()) {
        append_word(text, field_text(FC_DETAIL_HEX, detail.first(std::min(detail.size(), space))));
    }
    return text;
}
} // namespace
} // namespace qn::ffdc

int fc_mk_syslog_msg_1(const fc_err_tbl_t *entry, const void *detail_data, int detail_data_len, char *buffer,
                       int buffer_size, nl_catd catalogue)
{
    if (buffer == nullptr || buffer_size <= 0) return -1;
    const auto space = static_cast<size_t>(buffer_size) - 1;
    const auto detail = qn::ffdc::detail_bytes(detail_data, detail_data_len);
    const qn::platform::no_cancel whole;
    size_t length = 0;
    try {
        const fc_err_tbl_t none{};
        const auto text = qn::ffdc::failure_text(entry != nullptr ? *entry : none, detail, catalogue, space);
        length = std::min(text.size(), space);
        std::copy_n(text.begin(), length, buffer);
    } catch (const std::exception &) {
    }
    buffer[length] = '\0';
    return static_cast<int>(length);
}
