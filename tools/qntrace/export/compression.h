// How the output of an export may be packed.
#pragma once

namespace qn::dump
{

enum class compression { none, gzip, zstd };

} // namespace qn::dump
