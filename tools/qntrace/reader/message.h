// The text of an error record's message: its default message with the arguments filled in.
//
// Both come from a file, so neither goes near the printf family. The conversions are taken apart here; one that does
// not match its argument, or has none, stays in the text as it stands.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/qntrace/reader/decode.h"

namespace qn::reader
{

std::string fill_in(std::string_view message, const std::vector<error_argument> &arguments);
// Nothing when a conversion would stay as it stands: then the message was not made for these arguments.
std::optional<std::string> fill_in_whole(std::string_view message, const std::vector<error_argument> &arguments);

} // namespace qn::reader
