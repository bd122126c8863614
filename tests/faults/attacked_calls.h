// The exported calls that are attacked: every one that allocates memory or does system calls.
#pragma once

#include <vector>

#include "faults/aftermath.h"

namespace qn::test
{
const std::vector<attacked_call> &attacked_calls();
const attacked_call &attacked_call_named(std::string_view name);
} // namespace qn::test
