// How the output of an export may be packed.
#pragma once

#include <memory>

#include "tools/qntrace/console/output_file.h"

namespace qn::dump
{

enum class compression { none, gzip, zstd };

// Nothing for compression::none.
std::unique_ptr<output_file::packer> make_packer(compression packed);

} // namespace qn::dump
