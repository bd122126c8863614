// The rules for the header's fields that the reading core has no use for; it checks those that it reads records by.
#pragma once

#include "tools/qntrace/reader/bytes.h"
#include "tools/qntrace/reader/finding.h"
#include "tools/qntrace/reader/header.h"

namespace qn::dump
{

// `bytes` is the header as it stands in the file.
void check_header(const reader::byte_view &bytes, const reader::file_header &header,
                  const reader::finding_sink &report);

// The values of a page's state that the format has, 0 for no page among them.
bool is_page_state(std::uint8_t state);
// Minutes that a local time can be away from UTC, as TZ may have them.
bool is_zone_offset(std::int32_t minutes);

} // namespace qn::dump
