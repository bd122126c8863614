// Error records for the files under construction.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "reader/trace_builder.h"

namespace qn::test
{

// One with an int and a string as its arguments. What is not given is not in the record.
struct error_record {
    std::uint32_t error_id = 18;
    std::optional<std::string> catalogue;
    std::uint32_t set = 1;
    std::uint32_t number = 7;
    std::optional<std::string> default_message = "Cannot open \"%2$s\": error %1$d.\n";
    std::int32_t code = 13;
    std::string name = "/tmp/a";
    std::optional<std::string> file = "reader.c";
    std::optional<std::string> function = "open_it";
    std::uint32_t line = 120;
    std::optional<std::string> ffdc_id;
};

void add_error(trace_builder &file, const error_record &error);

} // namespace qn::test
