// The page of a report: one HTML file that needs nothing beside itself.
#pragma once

#include <string>

#include "tools/qntrace/report/assets.h"
#include "tools/qntrace/report/page_json.h"

namespace qn::dump
{

// In pieces. Its policy lets the browser run and apply nothing but the script and the style that stand in it, and load
// nothing at all.
void write_page(const page_assets &assets, const report_data &data, const page_options &options,
                const text_sink &write);

} // namespace qn::dump
