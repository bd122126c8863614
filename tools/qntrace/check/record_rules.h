// The rules for records that decoding can do without: what they are beside what their bodies say.
#pragma once

#include <string>

#include "tools/qntrace/reader/reader.h"

namespace qn::dump
{

// Why a record that could be decoded cannot have been written like this; empty when it can.
std::string what_is_wrong(const reader::trace_record &record);

// Whether the record carries data, all of it as it was written.
bool is_sound(const reader::trace_record &record);

} // namespace qn::dump
