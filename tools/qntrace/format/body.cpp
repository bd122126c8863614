#include "tools/qntrace/format/body.h"

#include <algorithm>

#include <fmt/compile.h>
#include <fmt/format.h>

#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/reader/message.h"

namespace qn::dump
{
namespace
{

constexpr std::string_view indent = "    ";
class body_writer
{
public:
    body_writer(std::string &out, const reader::trace_record &record, const body_options &options)
        : out_(out), record_(record), options_(options)
    {
    }

    void operator()(const reader::free_body &) { end_line(); }
    void operator()(const reader::unfinished_body &) { end_line(); }

    void operator()(const reader::identifier_body &body)
    {
        id(body.id);
        end_line();
    }

    void operator()(const reader::page_note_body &body)
    {
        quoted(body.text);
        end_line();
    }

    void operator()(const reader::data_blocks_body &body)
    {
        id(body.id);
        if (static_cast<std::int32_t>(body.count) < 0) {
            append(FMT_COMPILE(" count {}"), static_cast<std::int32_t>(body.count));
        } else {
            append(FMT_COMPILE(" {} block{}"), body.blocks.size(), body.blocks.size() == 1 ? "" : "s");
        }
        end_line();
        for (std::size_t i = 0; i < body.blocks.size(); ++i) {
            const auto bytes = body.blocks[i];
            append(FMT_COMPILE("{}block {}, {} byte{}\n"), indent, i, bytes.size(), bytes.size() == 1 ? "" : "s");
            hex_dump(bytes);
        }
    }

    void operator()(const reader::values_32_body &body)
    {
        id(body.id);
        values<std::int32_t>(body.values);
        end_line();
    }

    void operator()(const reader::values_64_body &body)
    {
        id(body.id);
        values<std::int64_t>(body.values);
        end_line();
    }

    void operator()(const reader::strings_body &body)
    {
        id(body.id);
        for (const auto text : body.strings) {
            out_ += ' ';
            quoted(text);
        }
        end_line();
    }

    void operator()(const reader::error_body &body)
    {
        id(body.id);
        append(FMT_COMPILE(" error={}"), body.error_id);
        if (body.file || body.line != 0) {
            out_ += " at ";
            append_escaped(out_, body.file.value_or("?"), options_.printable);
            append(FMT_COMPILE(":{}"), body.line);
        }
        if (body.function) {
            out_ += " in ";
            append_escaped(out_, *body.function, options_.printable);
        }
        end_line();
        if (body.default_message) {
            const auto message = reader::fill_in(*body.default_message, body.arguments);
            field("message", message);
            if (message != *body.default_message) field("default message", *body.default_message);
        }
        append(FMT_COMPILE("{}catalogue "), indent);
        if (body.catalogue) {
            quoted(*body.catalogue);
            out_ += ' ';
        }
        append(FMT_COMPILE("set {} message {}\n"), body.message_set, body.message_number);
        if (body.ffdc_id) field("ffdc id", *body.ffdc_id);
        for (std::size_t i = 0; i < body.arguments.size(); ++i) {
            const auto &argument = body.arguments[i];
            append(FMT_COMPILE("{}argument {} {} "), indent, i + 1, argument_type_name(argument.type));
            if (argument.text) {
                quoted(*argument.text);
            } else {
                out_ += argument.type == reader::argument_type::string ? "none" : argument_value(argument);
            }
            out_ += '\n';
        }
    }

    void operator()(const reader::start_body &body)
    {
        start(body);
        end_line();
    }

    void operator()(const reader::restart_body &body)
    {
        start(body.start);
        out_ += ' ';
        quoted(body.text);
        end_line();
    }

    void operator()(const reader::calibration_body &body)
    {
        append(FMT_COMPILE("ticks/s={}"), body.time_info.timeinfo1);
        if (options_.raw) append(FMT_COMPILE(" epoch={:#018x}"), body.time_info.timeinfo2);
        end_line();
    }

    void operator()(const reader::unknown_body &body)
    {
        append(FMT_COMPILE("code={}"), record_.raw.header.function);
        end_line();
        if (options_.raw) hex_dump(body.bytes);
    }

private:
    // The format is one of FMT_COMPILE: a dump spends most of its time here.
    template <typename Format, typename... Values>
    void append(const Format &text, const Values &...values)
    {
        fmt::format_to(std::back_inserter(out_), text, values...);
    }

    void quoted(std::string_view text) { append_quoted(out_, text, options_.printable); }

    void field(std::string_view name, std::string_view text)
    {
        append(FMT_COMPILE("{}{} "), indent, name);
        quoted(text);
        out_ += '\n';
    }

    void id(std::uint32_t id)
    {
        if (id == id_of_no_id) {
            out_ += "id=none";
        } else {
            append(FMT_COMPILE("id={}"), id);
        }
    }

    void start(const reader::start_body &body)
    {
        append(FMT_COMPILE("pid={} ticks/s={}"), body.pid, body.time_info.timeinfo1);
        if (options_.raw) append(FMT_COMPILE(" epoch={:#018x}"), body.time_info.timeinfo2);
    }

    // Decimal as a signed number, and in hexadecimal too where that may be what was meant.
    template <typename Signed, typename Values>
    void values(const Values &values)
    {
        out_ += " [";
        for (std::size_t i = 0; i < values.size(); ++i) {
            const auto value = values[i];
            const auto number = static_cast<Signed>(value);
            if (i != 0) out_ += ", ";
            append(FMT_COMPILE("{}"), number);
            if (number > 0xFFFF || number < -0x10000) append(FMT_COMPILE(" ({:#x})"), value);
        }
        out_ += ']';
    }

    // "0010  68 65 6c 6c 6f ...  |hello...|", sixteen bytes a line.
    void hex_dump(std::span<const std::byte> bytes)
    {
        constexpr std::size_t bytes_a_line = 16;
        for (std::size_t at = 0; at < bytes.size(); at += bytes_a_line) {
            const auto line = bytes.subspan(at, std::min(bytes_a_line, bytes.size() - at));
            append(FMT_COMPILE("{}{}{:04x} "), indent, indent, at);
            for (std::size_t i = 0; i < bytes_a_line; ++i) {
                if (i % 8 == 0) out_ += ' ';
                if (i < line.size()) {
                    append(FMT_COMPILE("{:02x} "), std::to_integer<unsigned>(line[i]));
                } else {
                    out_ += "   ";
                }
            }
            out_ += " |";
            for (const std::byte byte : line) {
                const auto c = std::to_integer<unsigned char>(byte);
                out_ += c >= 0x20 && c < 0x7F ? static_cast<char>(c) : '.';
            }
            out_ += "|\n";
        }
    }

    void end_line()
    {
        if (!record_.problem.empty() && !std::holds_alternative<reader::unfinished_body>(record_.body)) {
            append(FMT_COMPILE(" [damaged: {}]"), record_.problem);
        }
        while (!out_.empty() && out_.back() == ' ') {
            out_.pop_back();
        }
        out_ += '\n';
    }

    std::string &out_;
    const reader::trace_record &record_;
    const body_options &options_;
};

} // namespace

void append_body(std::string &out, const reader::trace_record &record, const body_options &options)
{
    std::visit(body_writer(out, record, options), record.body);
}

} // namespace qn::dump
