// What a selection may ask of a record and of the file that it stands in.
//
// A filler's header is stale beyond its kind, length and sequence number, so it has no component, thread, id or time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/qntrace/reader/message.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

// The file of a record; both must outlive it.
struct trace_origin {
    std::string_view path; // as it was given
    const reader::file_header &header;
};

// In the order of the alternatives of record_body.
const std::vector<std::string_view> &kind_names();
// The names, separated by commas.
std::string kind_list();

// Without the blanks that fill a short one up; nothing for a filler.
std::optional<std::string_view> component_of(const reader::trace_record &record);
std::string_view without_trailing_blanks(std::string_view text);

std::optional<std::uint32_t> thread_of(const reader::trace_record &record);

// Nothing for the kinds that have none, and for records that were written without one.
std::optional<std::uint32_t> id_of(const reader::record_body &body);

// Whether `test` holds for any text of the record: its strings, its formatted text, an error's message with the
// arguments filled in, the text of a note or of a restart.
template <typename Test>
bool any_text(const reader::record_body &body, const Test &test)
{
    if (const auto *strings = std::get_if<reader::strings_body>(&body)) {
        for (const auto text : strings->strings) {
            if (test(text)) return true;
        }
        return false;
    }
    if (const auto *error = std::get_if<reader::error_body>(&body)) {
        return error->default_message && test(reader::fill_in(*error->default_message, error->arguments));
    }
    if (const auto *note = std::get_if<reader::page_note_body>(&body)) return test(note->text);
    if (const auto *restart = std::get_if<reader::restart_body>(&body)) return test(restart->text);
    return false;
}

} // namespace qn::dump
