// The body of a record, by kind.
//
// Text and bytes are views into the record's own bytes and live as long as they do. Every count, length and offset of
// a body is checked against the record before it is followed; what does not fit is left out and `problem` says so, so
// that the sound part of a damaged record can still be shown. Counts that no writer gives are not followed either: a body
// takes little memory, whatever stands in the record.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "tools/qntrace/reader/bytes.h"
#include "tools/qntrace/reader/walk.h"
#include "trace/files/format.h"

namespace qn::reader
{

// `number` values side by side, loaded as they are asked for: a record may hold millions.
template <typename T>
class value_list
{
public:
    value_list() = default;
    value_list(byte_view view, std::size_t at, std::size_t count) : view_(view), at_(at), count_(count) {}
    std::size_t size() const { return count_; }
    T operator[](std::size_t index) const { return view_.load<T>(at_ + index * sizeof(T)); }

private:
    byte_view view_;
    std::size_t at_ = 0;
    std::size_t count_ = 0;
};

struct free_body {
};

struct unfinished_body {
};

struct identifier_body {
    std::uint32_t id = 0;
};

struct page_note_body {
    std::string_view text;
};

struct data_blocks_body {
    std::uint32_t id = 0;
    std::uint32_t count = 0; // as stored: a "negative" one stands for no blocks
    std::vector<std::span<const std::byte>> blocks;
};

struct values_32_body {
    std::uint32_t id = 0;
    value_list<std::uint32_t> values;
};

struct values_64_body {
    std::uint32_t id = 0;
    value_list<std::uint64_t> values;
};

struct strings_body {
    std::uint32_t id = 0;
    std::vector<std::string_view> strings;
};

enum class argument_type : std::uint32_t {
    int_value = 0,
    long_value = 1,
    long_long_value = 2,
    double_value = 3,
    reserved = 4,
    string = 5,
    pointer = 6,
};

struct error_argument {
    argument_type type = argument_type::reserved; // possibly none of the above
    std::uint64_t bits = 0;                       // the value; of a string its offset
    std::optional<std::string_view> text;         // of a string
};

struct error_body {
    std::uint32_t id = 0;
    std::uint32_t error_id = 0;
    std::uint32_t line = 0;
    std::uint32_t message_set = 0;
    std::uint32_t message_number = 0;
    std::optional<std::string_view> function;
    std::optional<std::string_view> file;
    std::optional<std::string_view> ffdc_id;
    std::optional<std::string_view> catalogue;
    std::optional<std::string_view> default_message;
    std::vector<error_argument> arguments;
};

struct start_body {
    std::uint32_t pid = 0;
    cu_timeinfo_t time_info = {};
};

struct restart_body {
    start_body start;
    std::string_view text;
};

struct calibration_body {
    cu_timeinfo_t time_info = {};
};

// A kind that no version of the format has.
struct unknown_body {
    std::span<const std::byte> bytes; // behind the record header
};

using record_body =
    std::variant<free_body, unfinished_body, identifier_body, page_note_body, data_blocks_body, values_32_body,
                 values_64_body, error_body, strings_body, start_body, calibration_body, restart_body, unknown_body>;

// False for what holds no record: free space, and a record that was not completed.
bool carries_data(const record_body &body);

struct decoded_record {
    record_body body;
    std::string problem; // what does not fit; empty when all is sound
};

decoded_record decode(const raw_record &record);

} // namespace qn::reader
