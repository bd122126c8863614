// Which records of a file a selection or a filter expression lets pass.
#pragma once

#include <cstdint>
#include <ctime>
#include <functional>
#include <string_view>
#include <vector>

#include "reader/trace_builder.h"
#include "tools/qntrace/select/selection.h"

namespace qn::test
{

using seqs = std::vector<std::uint32_t>;
using predicate = std::function<bool(const dump::trace_origin &, const reader::trace_record &)>;

// What "now" is in the tests: 2026-11-21T05:12:00Z, when a built file's counter stood at 0.
inline constexpr timespec test_now = {1'795'237'920, 0};

// Sequence numbers of the records that pass, fillers and unfinished ones included; the file is called dir/test.trc.
seqs seqs_if(const trace_builder &file, const predicate &passes);
seqs seqs_selected(const trace_builder &file, const dump::selection &selected);
seqs seqs_where(const trace_builder &file, std::string_view expression);

} // namespace qn::test
