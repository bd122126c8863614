#include "tools/qntrace/format/json.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/reader/message.h"

namespace qn::dump
{
namespace
{

using json = nlohmann::ordered_json;

std::string digits(std::uint64_t value) { return fmt::format("{}", value); }

std::string hexadecimal(std::span<const std::byte> bytes)
{
    constexpr std::string_view hex_digits = "0123456789abcdef";
    std::string result;
    result.reserve(2 * bytes.size());
    for (const std::byte byte : bytes) {
        const auto value = std::to_integer<unsigned>(byte);
        result += hex_digits[value >> 4];
        result += hex_digits[value & 15];
    }
    return result;
}

json time_base_object(const cu_timeinfo_t &info)
{
    return {{"ticks_per_second", digits(info.timeinfo1)},
            {"epoch_ns", fmt::format("{}", static_cast<std::int64_t>(info.timeinfo2))}};
}

// Adds a body's members to its record.
class body_members
{
public:
    body_members(json &object, text_encoder &encode, const reader::trace_record &record, bool raw)
        : object_(object), encode_(encode), record_(record), raw_(raw)
    {
    }

    void operator()(const reader::free_body &) {}
    void operator()(const reader::unfinished_body &) {}
    void operator()(const reader::identifier_body &body) { object_["id"] = body.id; }
    void operator()(const reader::page_note_body &body) { object_["text"] = encode_.text(body.text); }

    void operator()(const reader::data_blocks_body &body)
    {
        object_["id"] = body.id;
        object_["count"] = static_cast<std::int32_t>(body.count);
        json blocks = json::array();
        for (const auto bytes : body.blocks) {
            blocks.push_back(hexadecimal(bytes));
        }
        object_["blocks"] = std::move(blocks);
    }

    void operator()(const reader::values_32_body &body)
    {
        object_["id"] = body.id;
        json values = json::array();
        for (std::size_t i = 0; i < body.values.size(); ++i) {
            values.push_back(body.values[i]);
        }
        object_["values"] = std::move(values);
    }

    void operator()(const reader::values_64_body &body)
    {
        object_["id"] = body.id;
        json values = json::array();
        for (std::size_t i = 0; i < body.values.size(); ++i) {
            values.push_back(digits(body.values[i]));
        }
        object_["values"] = std::move(values);
    }

    void operator()(const reader::strings_body &body)
    {
        object_["id"] = body.id;
        json strings = json::array();
        for (const auto text : body.strings) {
            strings.push_back(encode_.text(text));
        }
        object_["strings"] = std::move(strings);
    }

    void operator()(const reader::error_body &body)
    {
        object_["id"] = body.id;
        object_["error_id"] = body.error_id;
        object_["line"] = body.line;
        object_["function"] = encode_.text_or_null(body.function);
        object_["file"] = encode_.text_or_null(body.file);
        object_["ffdc_id"] = encode_.text_or_null(body.ffdc_id);
        object_["catalogue"] = encode_.text_or_null(body.catalogue);
        object_["message_set"] = body.message_set;
        object_["message_number"] = body.message_number;
        object_["default_message"] = encode_.text_or_null(body.default_message);
        object_["message"] = nullptr;
        if (body.default_message) {
            object_["message"] = encode_.text(reader::fill_in(*body.default_message, body.arguments));
        }
        json arguments = json::array();
        for (const auto &argument : body.arguments) {
            arguments.push_back(argument_object(argument));
        }
        object_["arguments"] = std::move(arguments);
    }

    void operator()(const reader::start_body &body)
    {
        object_["pid"] = body.pid;
        object_["time_base"] = time_base_object(body.time_info);
    }

    void operator()(const reader::restart_body &body)
    {
        (*this)(body.start);
        object_["text"] = encode_.text(body.text);
    }

    void operator()(const reader::calibration_body &body) { object_["time_base"] = time_base_object(body.time_info); }

    void operator()(const reader::unknown_body &body)
    {
        object_["code"] = record_.raw.header.function;
        if (raw_) object_["bytes"] = hexadecimal(body.bytes);
    }

private:
    json argument_object(const reader::error_argument &argument)
    {
        json object = {{"type", argument_type_name(argument.type)}};
        if (argument.type == reader::argument_type::string) {
            object["value"] = encode_.text_or_null(argument.text);
        } else {
            object["value"] = argument_value(argument);
        }
        if (argument_type_name(argument.type) == "unknown") {
            object["type_code"] = static_cast<std::uint32_t>(argument.type);
        }
        return object;
    }

    json &object_;
    text_encoder &encode_;
    const reader::trace_record &record_;
    bool raw_;
};

template <typename T>
json number_or_null(const std::optional<T> &value)
{
    return value ? json(*value) : json(nullptr);
}

} // namespace

void json_dump::header(std::string &out, std::string_view path, const reader::file_header &header)
{
    append_object(out, [&](text_encoder &encode) {
        json object = {{"type", "header"}};
        object["file"] = encode.text(path);
        object["version"] = header.version;
        object["byte_order"] = header.order == reader::byte_order::little ? "little" : "big";
        object["platform"] = header.platform;
        object["build"] = encode.text_or_null(header.build_name);
        object["pid"] = header.pid;
        object["program"] = encode.text_or_null(header.program);
        object["base_program"] = encode.text_or_null(header.base_program);
        object["node_number"] = header.node_number;
        object["node_id"] = header.node_id ? json(fmt::format("{:016x}", *header.node_id)) : json(nullptr);
        object["file_size"] = header.file_size;
        object["time_base"] = time_base_object(header.time_info);
        object["tz_offset_minutes"] = number_or_null(header.tz_offset_minutes);
        object["page_state"] = number_or_null(header.page_state);
        object["page_reuse_time"] = number_or_null(header.page_reuse_time);
        if (options_.raw) {
            object["properties"] = header.properties;
            object["flags"] = header.flags;
            object["ring_offset"] = header.ring_offset;
            object["oldest_record_offset"] = header.oldest_record_offset;
            object["seq_lock"] = header.seq_lock;
            object["tail_request"] = header.tail_request;
            object["machine_id"] = header.machine_id;
        }
        return object;
    });
}

void json_dump::record(std::string &out, const reader::trace_record &record, const text_members &origin)
{
    const auto &header = record.raw.header;
    const auto time = record.time ? timestamps_.text(*record.time) : std::nullopt;
    append_object(out, [&](text_encoder &encode) {
        json object = {{"type", "record"}};
        for (const auto &[name, value] : origin) object[name] = encode.text(value);
        object["time"] = number_or_null(time);
        object["time_ns"] = record.time ? json(nanoseconds_text(*record.time)) : json(nullptr);
        object["seq"] = header.seq;
        object["thread"] = header.thread;
        object["comp"] = encode.text(component_name(header));
        object["kind"] = kind_name(record.body);
        std::visit(body_members(object, encode, record, options_.raw), record.body);
        if (options_.raw) {
            object["offset"] = record.raw.offset;
            object["length"] = header.length;
            object["code"] = header.function;
            object["reserved"] = header.reserved;
            object["comp_bytes"] = hexadecimal(std::as_bytes(std::span(header.component)));
        }
        if (options_.raw || !time) object["counter"] = digits(header.counter);
        if (!record.problem.empty()) object["problem"] = record.problem;
        return object;
    });
}

void json_dump::body(std::string &out, const reader::trace_record &record)
{
    append_object(out, [&](text_encoder &encode) {
        json object = json::object();
        std::visit(body_members(object, encode, record, options_.raw), record.body);
        return object;
    });
}

} // namespace qn::dump
