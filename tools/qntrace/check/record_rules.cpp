#include "tools/qntrace/check/record_rules.h"

#include <algorithm>
#include <string_view>
#include <variant>
#include <vector>

#include <fmt/format.h>

#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/traces/losses.h"
#include "trace/files/format.h"

namespace qn::dump
{
namespace
{

namespace format = qn::tr::format;

// A rest that is too short for a header stays with its record, and one more where a salvaged ring was closed.
constexpr std::uint64_t most_slack = 2 * format::record_header_bytes;
// Of a record that was cut to the longest length: what is left of a 64-bit value.
constexpr std::uint64_t most_cut_off = sizeof(std::uint64_t) - 1;

std::vector<std::string_view> texts_in(const reader::error_body &body)
{
    std::vector<std::string_view> texts;
    for (const auto &text : {body.function, body.file, body.ffdc_id, body.catalogue, body.default_message})
        if (text) texts.push_back(*text);
    for (const auto &argument : body.arguments)
        if (argument.text) texts.push_back(*argument.text);
    return texts;
}

// Each text has its own bytes. One that runs into another has lost its NUL.
bool texts_overlap(const reader::error_body &body)
{
    auto texts = texts_in(body);
    const auto begins_earlier = [](std::string_view left, std::string_view right) {
        return left.data() < right.data();
    };
    std::sort(texts.begin(), texts.end(), begins_earlier);
    const auto runs_into = [](std::string_view left, std::string_view right) {
        return right.data() <= left.data() + left.size();
    };
    return std::adjacent_find(texts.begin(), texts.end(), runs_into) != texts.end();
}

// The bytes that a record needs for what it holds.
class needed_bytes
{
public:
    explicit needed_bytes(const reader::byte_view &record) : record_(record) {}

    std::uint64_t operator()(const reader::free_body &) const { return record_.size(); }
    std::uint64_t operator()(const reader::unfinished_body &) const { return record_.size(); }
    std::uint64_t operator()(const reader::unknown_body &) const { return record_.size(); }
    std::uint64_t operator()(const reader::identifier_body &) const { return sizeof(trace_record_id_t); }
    std::uint64_t operator()(const reader::start_body &) const { return sizeof(trace_record_start_t); }
    std::uint64_t operator()(const reader::calibration_body &) const { return sizeof(time_calibration_t); }
    std::uint64_t operator()(const reader::page_note_body &body) const { return end_of(body.text); }
    std::uint64_t operator()(const reader::restart_body &body) const { return end_of(body.text); }

    std::uint64_t operator()(const reader::data_blocks_body &body) const
    {
        std::uint64_t bytes = sizeof(trace_record_data_t);
        for (const auto block : body.blocks) bytes += format::block_bytes(static_cast<std::uint32_t>(block.size()));
        return bytes;
    }

    std::uint64_t operator()(const reader::values_32_body &body) const
    {
        return sizeof(trace_record_values_t) + body.values.size() * sizeof(std::uint32_t);
    }

    std::uint64_t operator()(const reader::values_64_body &body) const
    {
        return sizeof(trace_record_values_t) + body.values.size() * sizeof(std::uint64_t);
    }

    std::uint64_t operator()(const reader::strings_body &body) const
    {
        std::uint64_t bytes = sizeof(trace_record_strings_t);
        for (const auto text : body.strings) bytes += text.size() + 1;
        return bytes;
    }

    std::uint64_t operator()(const reader::error_body &body) const
    {
        std::uint64_t end = sizeof(trace_record_error_t) + body.arguments.size() * sizeof(trace_error_arg_t);
        for (const auto text : texts_in(body)) end = std::max(end, end_of(text));
        return end;
    }

private:
    // Behind the NUL of a text that stands in the record.
    std::uint64_t end_of(std::string_view text) const
    {
        const auto *begin = reinterpret_cast<const char *>(record_.bytes().data());
        return static_cast<std::uint64_t>(text.data() + text.size() + 1 - begin);
    }

    const reader::byte_view &record_;
};

bool is_the_librarys(const reader::record_body &body)
{
    return std::holds_alternative<reader::page_note_body>(body) || std::holds_alternative<reader::start_body>(body) ||
           std::holds_alternative<reader::restart_body>(body) || std::holds_alternative<reader::calibration_body>(body);
}

const reader::start_body *start_in(const reader::record_body &body)
{
    if (const auto *restart = std::get_if<reader::restart_body>(&body)) return &restart->start;
    return std::get_if<reader::start_body>(&body);
}

} // namespace

std::string what_is_wrong(const reader::trace_record &record)
{
    const auto &header = record.raw.header;
    if (is_the_librarys(record.body) &&
        !std::equal(header.component.begin(), header.component.end(), std::begin(format::library_component)))
        return fmt::format("a record of the kind {}, which the library writes itself, is another component's",
                           kind_name(record.body));
    const auto *start = start_in(record.body);
    if (start != nullptr && start->pid == 0) return "the process that starts here has the id 0";
    if (const auto *note = std::get_if<reader::page_note_body>(&record.body)) {
        if (header.seq != 0) return "a page note, which begins a page with the number 0, stands amid the records";
        if (times_not_spooled(note->text) == 0) return "the page note does not tell how often the page was overwritten";
    }
    const auto *error = std::get_if<reader::error_body>(&record.body);
    if (error != nullptr && texts_overlap(*error)) return "two texts of the error overlap";
    const std::uint64_t needed = std::visit(needed_bytes(record.raw.bytes), record.body);
    if (header.length > needed + most_slack + most_cut_off)
        return fmt::format("the record has {} bytes, what it holds needs {}", header.length, needed);
    return {};
}

bool is_sound(const reader::trace_record &record)
{
    return reader::carries_data(record.body) && record.problem.empty() && record.raw.header.seq % 2 == 0 &&
           what_is_wrong(record).empty();
}

} // namespace qn::dump
