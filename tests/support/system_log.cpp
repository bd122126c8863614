#include "support/system_log.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <mutex>

namespace
{
std::mutex guard;
std::vector<qn::test::log_line> lines;
std::vector<qn::test::log_opening> openings;

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
void catch_line(int priority, const char *format, va_list args)
{
    char text[8192];
    std::vsnprintf(text, sizeof text, format, args);
    const std::lock_guard lock(guard);
    lines.push_back({priority, text});
}
#pragma GCC diagnostic pop
} // namespace

// The fortified build calls the ..._chk forms.
extern "C" {
void vsyslog(int priority, const char *format, va_list args) { catch_line(priority, format, args); }
void __vsyslog_chk(int priority, int, const char *format, va_list args) { catch_line(priority, format, args); }
void syslog(int priority, const char *format, ...)
{
    va_list args;
    va_start(args, format);
    catch_line(priority, format, args);
    va_end(args);
}
void __syslog_chk(int priority, int, const char *format, ...)
{
    va_list args;
    va_start(args, format);
    catch_line(priority, format, args);
    va_end(args);
}
void openlog(const char *identity, int options, int facility)
{
    const std::lock_guard lock(guard);
    openings.push_back({identity, options, facility});
}
}

namespace qn::test
{
std::vector<log_line> system_log()
{
    const std::lock_guard lock(guard);
    return lines;
}

std::vector<log_opening> system_log_openings()
{
    const std::lock_guard lock(guard);
    return openings;
}

void clear_system_log()
{
    const std::lock_guard lock(guard);
    lines.clear();
}

bool system_log_has(const std::string &text)
{
    const auto caught = system_log();
    return std::any_of(caught.begin(), caught.end(), [&](const log_line &line) { return line.text == text; });
}
} // namespace qn::test
