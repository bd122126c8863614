// Values that nobody means well with: formats, sizes, regular expressions, bytes of all kinds.
#pragma once

#include <string>
#include <vector>

namespace qn::test
{
const std::vector<std::string> &hostile_values();
} // namespace qn::test
