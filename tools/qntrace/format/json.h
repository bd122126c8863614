// A trace as JSON lines for programs: one object for the file's header, then one for each record.
//
// Integers of 64 bits and times in nanoseconds are strings of decimal digits, so that no reader rounds them; the
// identifier of a node is a string of 16 hexadecimal digits, as in the path of a copy. The output is pure ASCII:
// everything beyond it, and every control character, is written as \uXXXX.
//
// JSON text is Unicode, the bytes in a trace need not be. An object in which some text is not well-formed UTF-8 has
// "encoding": "latin-1", and then every character of its texts stands for the byte of that value: nothing is lost.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/qntrace/format/timestamps.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

struct json_options {
    bool raw = false; // offsets and header fields as stored, fillers and unfinished records too
    bool utc = false;
};

// Names and values of members.
using text_members = std::vector<std::pair<const char *, std::string>>;

class json_dump
{
public:
    explicit json_dump(const json_options &options) : options_(options), timestamps_(options.utc) {}

    // All append one line to `out`.
    void header(std::string &out, std::string_view path, const reader::file_header &header);
    // `origin` names where a record of several files comes from: members that stand before the record's own.
    void record(std::string &out, const reader::trace_record &record, const text_members &origin = {});
    // Only the members that its kind gives a record.
    void body(std::string &out, const reader::trace_record &record);

private:
    json_options options_;
    timestamps timestamps_;
};

} // namespace qn::dump
