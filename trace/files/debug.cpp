// Debug lines in the system log. No lock but the turn to write there.
#include "trace/files/debug.h"

#include <cstdarg>

#include "platform/common/system_log.h"

qn_uint32_t global_debug_level = 0;

namespace
{
[[gnu::format(printf, 2, 0)]] void write_line(int priority, const char *format, va_list args)
{
    const qn::platform::system_log_turn turn;
    if (turn) vsyslog(priority, format, args);
}
} // namespace

namespace qn::tr
{
void log_line(int priority, const char *format, ...)
{
    va_list args;
    va_start(args, format);
    write_line(priority, format, args);
    va_end(args);
}

void debug(const char *format, ...)
{
    if (!debug_level_above(7)) return;
    va_list args;
    va_start(args, format);
    write_line(LOG_WARNING, format, args);
    va_end(args);
}

void debug_error(const char *format, ...)
{
    if (!debug_level_above(7)) return;
    va_list args;
    va_start(args, format);
    write_line(LOG_ERR, format, args);
    va_end(args);
}
} // namespace qn::tr
