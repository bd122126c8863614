// The limit that a process has for the size of its files (ulimit -f). No state, no lock.
#pragma once

#include <cstdint>
#include <sys/resource.h>

namespace qn::platform
{
// A write beyond the process's file size limit would raise SIGXFSZ, whose default is death.
inline bool exceeds_file_size_limit(uint64_t size)
{
    rlimit limit;
    return getrlimit(RLIMIT_FSIZE, &limit) == 0 && limit.rlim_cur != RLIM_INFINITY && size > limit.rlim_cur;
}
} // namespace qn::platform
