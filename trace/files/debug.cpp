#include "trace/files/debug.h"

#include <cstdarg>

qn_uint32_t global_debug_level = 0;

namespace qn::tr
{
void debug(const char *format, ...)
{
    if (!debug_level_above(7)) return;
    va_list args;
    va_start(args, format);
    vsyslog(LOG_WARNING, format, args);
    va_end(args);
}

void debug_error(const char *format, ...)
{
    if (!debug_level_above(7)) return;
    va_list args;
    va_start(args, format);
    vsyslog(LOG_ERR, format, args);
    va_end(args);
}
} // namespace qn::tr
