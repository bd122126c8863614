// A file with every record kind, for the tests of the formats.
#pragma once

#include "reader/trace_builder.h"

namespace qn::test
{

trace_builder every_kind(endian order = endian::little);

} // namespace qn::test
