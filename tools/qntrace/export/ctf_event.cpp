#include "tools/qntrace/export/ctf_event.h"

#include <array>

#include <fmt/format.h>

#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/reader/message.h"

namespace qn::dump
{
namespace
{

using qn::tr::format::kind;

constexpr std::uint8_t unknown_class = 0; // no kind that has data is 0
constexpr std::uint8_t damaged_class = 64;

struct event_class {
    std::uint8_t id;
    reader::record_body example; // for its name
    const char *fields;
};

const std::array<event_class, 11> &event_classes()
{
    constexpr auto id_of_kind = [](kind which) { return static_cast<std::uint8_t>(which); };
    static const std::array<event_class, 11> classes = {{
        {unknown_class, reader::unknown_body{}, "uint16_t code; uint32_t length; xint8_t bytes[length];"},
        {id_of_kind(kind::identifier), reader::identifier_body{}, "uint32_t id;"},
        {id_of_kind(kind::page_note), reader::page_note_body{}, "string text;"},
        {id_of_kind(kind::data_blocks), reader::data_blocks_body{},
         "uint32_t id; int32_t count; uint32_t n_blocks; uint32_t lengths[n_blocks]; uint32_t n_bytes;\n"
         "        xint8_t bytes[n_bytes];"},
        {id_of_kind(kind::values_32), reader::values_32_body{},
         "uint32_t id; uint32_t number; uint32_t values[number];"},
        {id_of_kind(kind::values_64), reader::values_64_body{},
         "uint32_t id; uint32_t number; uint64_t values[number];"},
        {id_of_kind(kind::error), reader::error_body{},
         "uint32_t id; uint32_t error_id; uint32_t line; string function; string file; string ffdc_id;\n"
         "        string catalogue; uint32_t message_set; uint32_t message_number; string default_message;\n"
         "        string message; uint32_t n_arguments; struct argument arguments[n_arguments];"},
        {id_of_kind(kind::strings), reader::strings_body{}, "uint32_t id; uint32_t number; string strings[number];"},
        {id_of_kind(kind::start), reader::start_body{}, "uint32_t pid; uint64_t ticks_per_second; int64_t epoch_ns;"},
        {id_of_kind(kind::time_calibration), reader::calibration_body{},
         "uint64_t ticks_per_second; int64_t epoch_ns;"},
        {id_of_kind(kind::restart), reader::restart_body{},
         "uint32_t pid; uint64_t ticks_per_second; int64_t epoch_ns; string text;"},
    }};
    return classes;
}

std::uint8_t class_of(const reader::trace_record &record)
{
    const bool unknown = std::holds_alternative<reader::unknown_body>(record.body);
    return unknown ? unknown_class : static_cast<std::uint8_t>(record.raw.header.function);
}

void append_bytes(std::string &out, std::span<const std::byte> bytes)
{
    out.append(reinterpret_cast<const char *>(bytes.data()), bytes.size());
}

// The fields of a body, in the order of its event class. Nothing in an element of a sequence refers to a field of the
// same element, as lengths of blocks would: programs that copy traces fail on that.
class body_fields
{
public:
    body_fields(std::string &out, std::uint16_t code) : out_(out), code_(code) {}

    // These are no events: they hold no record.
    void operator()(const reader::free_body &) {}
    void operator()(const reader::unfinished_body &) {}

    void operator()(const reader::identifier_body &body) { append_u32(out_, body.id); }
    void operator()(const reader::page_note_body &body) { append_text(out_, body.text); }

    void operator()(const reader::data_blocks_body &body)
    {
        append_u32(out_, body.id);
        append_u32(out_, body.count);
        append_u32(out_, static_cast<std::uint32_t>(body.blocks.size()));
        std::uint32_t bytes = 0;
        for (const auto block : body.blocks) {
            append_u32(out_, static_cast<std::uint32_t>(block.size()));
            bytes += static_cast<std::uint32_t>(block.size());
        }
        append_u32(out_, bytes);
        for (const auto block : body.blocks) append_bytes(out_, block);
    }

    void operator()(const reader::values_32_body &body)
    {
        append_u32(out_, body.id);
        append_u32(out_, static_cast<std::uint32_t>(body.values.size()));
        for (std::size_t i = 0; i < body.values.size(); ++i) append_u32(out_, body.values[i]);
    }

    void operator()(const reader::values_64_body &body)
    {
        append_u32(out_, body.id);
        append_u32(out_, static_cast<std::uint32_t>(body.values.size()));
        for (std::size_t i = 0; i < body.values.size(); ++i) append_u64(out_, body.values[i]);
    }

    void operator()(const reader::strings_body &body)
    {
        append_u32(out_, body.id);
        append_u32(out_, static_cast<std::uint32_t>(body.strings.size()));
        for (const auto text : body.strings) append_text(out_, text);
    }

    void operator()(const reader::error_body &body)
    {
        append_u32(out_, body.id);
        append_u32(out_, body.error_id);
        append_u32(out_, body.line);
        append_text(out_, body.function.value_or(""));
        append_text(out_, body.file.value_or(""));
        append_text(out_, body.ffdc_id.value_or(""));
        append_text(out_, body.catalogue.value_or(""));
        append_u32(out_, body.message_set);
        append_u32(out_, body.message_number);
        append_text(out_, body.default_message.value_or(""));
        append_text(out_, body.default_message ? reader::fill_in(*body.default_message, body.arguments) : "");
        append_u32(out_, static_cast<std::uint32_t>(body.arguments.size()));
        for (const auto &argument : body.arguments) append_argument(argument);
    }

    void operator()(const reader::start_body &body)
    {
        append_u32(out_, body.pid);
        append_time_base(body.time_info);
    }

    void operator()(const reader::restart_body &body)
    {
        (*this)(body.start);
        append_text(out_, body.text);
    }

    void operator()(const reader::calibration_body &body) { append_time_base(body.time_info); }

    void operator()(const reader::unknown_body &body)
    {
        out_ += static_cast<char>(code_ & 0xFF);
        out_ += static_cast<char>(code_ >> 8);
        append_u32(out_, static_cast<std::uint32_t>(body.bytes.size()));
        append_bytes(out_, body.bytes);
    }

private:
    void append_time_base(const cu_timeinfo_t &info)
    {
        append_u64(out_, info.timeinfo1);
        append_u64(out_, info.timeinfo2);
    }

    // Type, what is stored, and the value as text.
    void append_argument(const reader::error_argument &argument)
    {
        append_u32(out_, static_cast<std::uint32_t>(argument.type));
        append_u64(out_, argument.bits);
        if (argument.type == reader::argument_type::string)
            append_text(out_, argument.text.value_or(""));
        else
            append_text(out_, argument_value(argument));
    }

    std::string &out_;
    std::uint16_t code_;
};

template <typename T>
void append_number(std::string &out, T value)
{
    for (std::size_t i = 0; i < sizeof(T); ++i) out += static_cast<char>(value >> (8 * i) & 0xFF);
}

} // namespace

void append_u32(std::string &out, std::uint32_t value) { append_number(out, value); }
void append_u64(std::string &out, std::uint64_t value) { append_number(out, value); }

void append_text(std::string &out, std::string_view text)
{
    append_escaped(out, text, charset::utf_8);
    out += '\0';
}

void append_ctf_event(std::string &out, const reader::trace_record &record, std::uint64_t ns,
                      const std::string &problem)
{
    const auto &header = record.raw.header;
    out += static_cast<char>(class_of(record) + (problem.empty() ? 0 : damaged_class));
    append_u64(out, ns);
    append_u32(out, header.seq);
    append_u32(out, header.thread);
    append_text(out, component_name(header));
    if (!problem.empty()) append_text(out, problem);
    std::visit(body_fields(out, header.function), record.body);
}

std::string ctf_event_types()
{
    return R"(struct argument {
    enum : uint32_t {
        int_value = 0, long_value = 1, long_long_value = 2, double_value = 3, reserved = 4, text_value = 5, pointer = 6
    } type;
    xint64_t bits;
    string value;
};
)";
}

std::string ctf_event_classes()
{
    std::string out;
    for (const auto &[id, example, fields] : event_classes()) {
        const auto name = kind_name(example);
        out += fmt::format("\nevent {{\n    name = \"{}\";\n    id = {};\n    stream_id = 0;\n"
                           "    fields := struct {{\n        {}\n    }};\n}};\n",
                           name, id, fields);
        out += fmt::format("\nevent {{\n    name = \"{}\";\n    id = {};\n    stream_id = 0;\n"
                           "    context := struct {{ string problem; }};\n"
                           "    fields := struct {{\n        {}\n    }};\n}};\n",
                           name, id + damaged_class, fields);
    }
    return out;
}

} // namespace qn::dump
