// The parts of a report's page that are the same in every one; made by the build from the files of this folder and the
// chart library.
#pragma once

#include <string_view>

namespace qn::dump
{

struct page_assets {
    std::string_view page; // HTML with places for the rest, see page.cpp
    std::string_view style;
    std::string_view style_sha256; // in hexadecimal
    std::string_view script;
    std::string_view script_sha256;
};

// Null in a build without them.
const page_assets *report_assets();

} // namespace qn::dump
