// Debug lines in the system log, for whoever services the library: written only when QN_TR_DEBUG_LEVEL asks for them.
#pragma once

#include <sys/syslog.h>

#include <qn.h>

#include "trace/files/shared_words.h"

// Verbosity from QN_TR_DEBUG_LEVEL; 0 is silent. Written by init() under the global mutex, read anywhere.
extern qn_uint32_t global_debug_level;

namespace qn::tr
{
inline bool debug_level_above(qn_uint32_t level)
{
    return __builtin_expect(load_relaxed(global_debug_level) > level, 0);
}

// Writes one line, whatever the level is. A cancellation point.
void log_line(int priority, const char *format, ...) QN_PRINTF_LIKE(2, 3);

// Writes one line at priority warning when the level is above 7. A cancellation point then.
void debug(const char *format, ...) QN_PRINTF_LIKE(1, 2);

// The same at priority error.
void debug_error(const char *format, ...) QN_PRINTF_LIKE(1, 2);
} // namespace qn::tr
