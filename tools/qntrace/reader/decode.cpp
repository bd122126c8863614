#include "tools/qntrace/reader/decode.h"

#include <algorithm>

#include <fmt/format.h>

namespace qn::reader
{
namespace
{

namespace format = qn::tr::format;
using format::kind;

// What the writers' arguments are checked against.
constexpr std::uint32_t most_strings = 32;
constexpr std::uint32_t most_blocks = 128;
// An error has as many inserts as its message has conversions, for which there is no limit; a call with more is none.
constexpr std::uint32_t most_arguments = 4096;

// Decodes one record; the first thing that does not fit is the one that is told.
class decoder
{
public:
    explicit decoder(const byte_view &bytes) : bytes_(bytes) {}

    std::string take_problem() { return std::move(problem_); }

    bool holds_fixed_part(std::size_t fixed_bytes)
    {
        if (bytes_.size() >= fixed_bytes) return true;
        complain("record length {} is less than the {} bytes of this kind", bytes_.size(), fixed_bytes);
        return false;
    }

    identifier_body identifier()
    {
        if (!holds_fixed_part(sizeof(trace_record_id_t))) return {};
        return {bytes_.u32(offsetof(trace_record_id_t, id))};
    }

    page_note_body page_note() { return {text_to_the_end(sizeof(trace_record_string_t))}; }

    data_blocks_body data_blocks()
    {
        data_blocks_body body;
        if (!holds_fixed_part(sizeof(trace_record_data_t))) return body;
        body.id = bytes_.u32(offsetof(trace_record_data_t, trace_id));
        body.count = bytes_.u32(offsetof(trace_record_data_t, n_blocks));
        // The writer takes a count that is negative as a signed number and stores it with no blocks.
        if (static_cast<std::int32_t>(body.count) < 0) return body;
        const std::uint32_t count = bounded(body.count, most_blocks, "data blocks");
        std::uint64_t at = sizeof(trace_record_data_t);
        for (std::uint32_t i = 0; i < count; ++i) {
            constexpr std::size_t length_bytes = sizeof(trace_data_block_t);
            if (!bytes_.holds(at, length_bytes)) {
                complain("{} data blocks are announced, {} fit", body.count, i);
                break;
            }
            const auto length = static_cast<std::int32_t>(bytes_.u32(at));
            if (length < 0 || !bytes_.holds(at + length_bytes, static_cast<std::uint64_t>(length))) {
                complain("the length {} of data block {} does not fit into the record", length, i);
                break;
            }
            body.blocks.push_back(bytes_.part(at + length_bytes, static_cast<std::uint64_t>(length)));
            at += format::block_bytes(static_cast<std::uint32_t>(length));
        }
        return body;
    }

    template <typename Body, typename T>
    Body values()
    {
        Body body;
        constexpr std::size_t fixed_bytes = sizeof(trace_record_values_t);
        if (!holds_fixed_part(fixed_bytes)) return body;
        body.id = bytes_.u32(offsetof(trace_record_values_t, id));
        const std::uint32_t number = bytes_.u32(offsetof(trace_record_values_t, number));
        const std::uint64_t room = (bytes_.size() - fixed_bytes) / sizeof(T);
        if (number > room) complain("{} values are announced, {} fit", number, room);
        body.values = value_list<T>(bytes_, fixed_bytes, std::min<std::uint64_t>(number, room));
        return body;
    }

    strings_body strings()
    {
        strings_body body;
        constexpr std::size_t fixed_bytes = sizeof(trace_record_strings_t);
        if (!holds_fixed_part(fixed_bytes)) return body;
        body.id = bytes_.u32(offsetof(trace_record_strings_t, id));
        const std::uint32_t number = bytes_.u32(offsetof(trace_record_strings_t, number));
        const std::uint32_t announced = bytes_.u32(offsetof(trace_record_strings_t, len_strings));
        const std::uint32_t count = bounded(number, most_strings, "strings");
        const std::uint64_t room = bytes_.size() - fixed_bytes;
        if (announced > room) complain("{} bytes of strings are announced, {} fit", announced, room);
        auto rest = bytes_.chars(fixed_bytes, std::min<std::uint64_t>(announced, room));
        while (body.strings.size() < count) {
            const auto [text, terminated] = cut_at_nul(rest);
            if (!terminated) {
                complain("{} strings are announced, {} are complete", number, body.strings.size());
                break;
            }
            body.strings.push_back(text);
            rest.remove_prefix(text.size() + 1);
        }
        if (problem_.empty() && !rest.empty()) {
            complain("{} bytes behind the last string belong to none", rest.size());
        }
        return body;
    }

    error_body error()
    {
        error_body body;
        constexpr std::size_t fixed_bytes = sizeof(trace_record_error_t);
        if (!holds_fixed_part(fixed_bytes)) return body;
        body.id = bytes_.u32(offsetof(trace_record_error_t, traceId));
        body.error_id = bytes_.u32(offsetof(trace_record_error_t, errorId));
        body.line = bytes_.u32(offsetof(trace_record_error_t, lineNumber));
        body.message_set = bytes_.u32(offsetof(trace_record_error_t, msgSetNumber));
        body.message_number = bytes_.u32(offsetof(trace_record_error_t, msgNumber));

        std::uint32_t count = bytes_.u32(offsetof(trace_record_error_t, argCount));
        const std::uint64_t room = (bytes_.size() - fixed_bytes) / sizeof(trace_error_arg_t);
        if (count > room) {
            complain("{} arguments are announced, {} fit", count, room);
            count = 0; // what stands there is as likely the strings
        }
        const std::uint64_t strings_at = fixed_bytes + count * sizeof(trace_error_arg_t);
        count = bounded(count, most_arguments, "arguments");
        text_room_ = bytes_.size() - strings_at;
        const auto string_of = [&](std::size_t field) { return string_at(bytes_.u32(field), strings_at); };
        body.function = string_of(offsetof(trace_record_error_t, funcNameOffset));
        body.file = string_of(offsetof(trace_record_error_t, fileNameOffset));
        body.ffdc_id = string_of(offsetof(trace_record_error_t, ffdcIdOffset));
        body.catalogue = string_of(offsetof(trace_record_error_t, msgCatNameOffset));
        body.default_message = string_of(offsetof(trace_record_error_t, defMsgOffset));
        for (std::uint32_t i = 0; i < count; ++i) {
            const std::uint64_t at = fixed_bytes + i * sizeof(trace_error_arg_t);
            error_argument argument;
            argument.type = static_cast<argument_type>(bytes_.u32(at + offsetof(trace_error_arg_t, type)));
            argument.bits = bytes_.u64(at + offsetof(trace_error_arg_t, value));
            if (argument.type == argument_type::string) argument.text = string_at(argument.bits, strings_at);
            body.arguments.push_back(argument);
        }
        return body;
    }

    start_body start()
    {
        if (!holds_fixed_part(sizeof(trace_record_start_t))) return {};
        return {bytes_.u32(offsetof(trace_record_start_t, pid)), time_info(offsetof(trace_record_start_t, timeInfo))};
    }

    restart_body restart()
    {
        restart_body body{start(), {}};
        if (problem_.empty()) body.text = text_to_the_end(sizeof(trace_record_start_t));
        return body;
    }

    calibration_body calibration()
    {
        if (!holds_fixed_part(sizeof(time_calibration_t))) return {};
        return {time_info(offsetof(time_calibration_t, reBase))};
    }

    unknown_body unknown(std::uint16_t function)
    {
        complain("no record is of kind {}", function);
        return {bytes_.bytes().subspan(format::record_header_bytes)};
    }

private:
    template <typename... Values>
    void complain(fmt::format_string<const Values &...> text, const Values &...values)
    {
        if (problem_.empty()) problem_ = fmt::format(text, values...);
    }

    // How many of what is announced are decoded, so that what is damaged takes no more memory than what is sound.
    std::uint32_t bounded(std::uint32_t announced, std::uint32_t most, std::string_view what)
    {
        if (announced > most) complain("{} {} are announced, no writer gives more than {}", announced, what, most);
        return std::min(announced, most);
    }

    cu_timeinfo_t time_info(std::size_t at)
    {
        cu_timeinfo_t info = {};
        info.timeinfo1 = bytes_.u64(at);
        info.timeinfo2 = bytes_.u64(at + 8);
        if (info.timeinfo1 == 0) complain("the time base has {} ticks a second", info.timeinfo1);
        return info;
    }

    std::string_view text_to_the_end(std::size_t at)
    {
        if (!holds_fixed_part(at + 1)) return {};
        const auto [text, terminated] = cut_at_nul(bytes_.chars(at, bytes_.size() - at));
        if (!terminated) complain("the text at {} of the record has no end", at);
        return text;
    }

    // A string of an error record; none at offset 0. The strings stand behind the arguments, and each has its own bytes:
    // together they are no longer than what there is.
    std::optional<std::string_view> string_at(std::uint64_t offset, std::uint64_t strings_at)
    {
        if (offset == 0) return std::nullopt;
        if (offset < strings_at || offset >= bytes_.size()) {
            complain("the string offset {} lies outside {} to {}", offset, strings_at, bytes_.size());
            return std::nullopt;
        }
        const std::uint64_t rest = bytes_.size() - offset;
        const auto [text, terminated] = cut_at_nul(bytes_.chars(offset, std::min(rest, text_room_)));
        if (!terminated && rest > text_room_) {
            complain("the string at {} of the record runs into another one", offset);
            text_room_ = 0;
            return std::nullopt;
        }
        if (!terminated) {
            complain("the string at {} of the record has no end", offset);
            return std::nullopt;
        }
        text_room_ -= text.size() + 1;
        return text;
    }

    const byte_view &bytes_;
    std::uint64_t text_room_ = 0; // for the strings of an error that were not decoded yet
    std::string problem_;
};

} // namespace

bool carries_data(const record_body &body)
{
    return !std::holds_alternative<free_body>(body) && !std::holds_alternative<unfinished_body>(body);
}

decoded_record decode(const raw_record &record)
{
    decoder from(record.bytes);
    const auto with_problem = [&](record_body body) { return decoded_record{std::move(body), from.take_problem()}; };
    if (record.oversized) {
        return {unknown_body{}, fmt::format("record length {} is more than half the ring, which no writer is given",
                                            record.header.length)};
    }
    switch (static_cast<kind>(record.header.function)) {
    case kind::free_space: return {free_body{}, {}};
    case kind::being_written:
        return {unfinished_body{}, "this record is being written, or its writer died before it was complete"};
    case kind::identifier: return with_problem(from.identifier());
    case kind::page_note: return with_problem(from.page_note());
    case kind::data_blocks: return with_problem(from.data_blocks());
    case kind::values_32: return with_problem(from.values<values_32_body, std::uint32_t>());
    case kind::values_64: return with_problem(from.values<values_64_body, std::uint64_t>());
    case kind::error: return with_problem(from.error());
    case kind::strings: return with_problem(from.strings());
    case kind::start: return with_problem(from.start());
    case kind::time_calibration: return with_problem(from.calibration());
    case kind::restart: return with_problem(from.restart());
    }
    return with_problem(from.unknown(record.header.function));
}

} // namespace qn::reader
