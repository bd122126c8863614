// The last column of the text: a record's body, on the rest of the line or, for data and errors, on lines below it.
#pragma once

#include <string>

#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

struct body_options {
    bool raw = false;
    charset printable = charset::ascii;
};

// Appends the body and the end of its last line.
void append_body(std::string &out, const reader::trace_record &record, const body_options &options);

} // namespace qn::dump
