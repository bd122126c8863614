// The data of a report as the JSON that its page holds.
//
// Nothing in it can end the element that it stands in, or begin another: every < is written as an escape. Texts out of
// traces are made printable first, as for a terminal.
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "tools/qntrace/report/report_data.h"

namespace qn::dump
{

struct page_options {
    bool utc = false;
    std::string title;
    std::string selection; // the options that select records; empty: all
    bool damaged = false;  // some file is
};

// Called with one piece behind the other.
using text_sink = std::function<void(std::string_view)>;

// `data` is finished.
void write_page_json(const report_data &data, const page_options &options, const text_sink &write);

// What is left out of the page, a sentence each; empty when it is complete.
std::vector<std::string> thinning_notes(const report_data &data);

} // namespace qn::dump
