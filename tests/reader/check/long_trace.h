// A wrapped ring of 64 KiB with records of every kind on both sides of its oldest record, all of them sound.
#pragma once

#include "reader/trace_builder.h"

namespace qn::test
{

inline constexpr std::size_t long_trace_bytes = 65536;

trace_builder long_trace(endian order = endian::little);

} // namespace qn::test
