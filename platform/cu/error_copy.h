// An error record in one piece of memory: the structure, then its inserts, then all its strings.
#pragma once

#include <qn_cu.h>

namespace qn::cu
{
// A copy that std::free() releases whole; null when there is no memory.
cu_error_t *copy_error(const cu_error_t &error);
} // namespace qn::cu
