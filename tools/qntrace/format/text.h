// A trace as text for people: a short description of the file, then one line a record, in columns.
#pragma once

#include <string>
#include <string_view>

#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

struct text_options {
    bool raw = false; // offsets and header fields as stored, fillers and unfinished records too
    bool utc = false;
    charset printable = charset::ascii;
    bool color = false; // for the component, the kind, and the bodies of errors, notices and damaged records
};

class text_dump
{
public:
    explicit text_dump(const text_options &options) : options_(options), timestamps_(options.utc) {}

    // Both append to `out`.
    void header(std::string &out, std::string_view path, const reader::file_header &header);
    void record(std::string &out, const reader::trace_record &record);
    // The line above the records, which header() ends with.
    void column_heads(std::string &out) const;

private:
    void summary(std::string &out, const reader::file_header &header);
    void raw_fields(std::string &out, const reader::file_header &header) const;
    void time_column(std::string &out, const reader::trace_record &record);
    void component_column(std::string &out, const reader::record_header &header) const;
    void kind_and_body(std::string &out, const reader::trace_record &record) const;
    void begin_color(std::string &out, std::string_view color) const;
    void end_color(std::string &out) const;
    std::string seconds_text(std::uint32_t seconds);

    text_options options_;
    timestamps timestamps_;
};

} // namespace qn::dump
