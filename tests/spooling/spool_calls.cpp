#include "spooling/spool_calls.h"

#include <cstdarg>
#include <cstdio>

#include <gtest/gtest.h>

namespace
{
// A hook may use what belongs to its test; the library still makes calls when the program ends.
class hooks_end_with_their_test : public testing::EmptyTestEventListener
{
    void OnTestEnd(const testing::TestInfo &) override { qn::test::spool_calls() = {}; }
};

[[maybe_unused]] const bool hooks_end = [] {
    testing::UnitTest::GetInstance()->listeners().Append(new hooks_end_with_their_test);
    return true;
}();
} // namespace

namespace qn::test
{
spool_call_hooks &spool_calls()
{
    static spool_call_hooks hooks;
    return hooks;
}
} // namespace qn::test

using qn::test::spool_calls;

namespace
{
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
std::string text_of(const char *format, va_list args)
{
    char text[8192];
    va_list copy;
    va_copy(copy, args);
    std::vsnprintf(text, sizeof text, format, copy);
    va_end(copy);
    return text;
}
#pragma GCC diagnostic pop
} // namespace

// The names are the linker's. The fortified build calls the ..._chk forms.
#pragma GCC visibility push(default)
extern "C" {
int __real_mkdir(const char *path, mode_t mode);
int __real_gethostname(char *name, size_t size);
int __real_gettimeofday(timeval *time, void *zone);
int __real_pthread_create(pthread_t *thread, const pthread_attr_t *attributes, void *(*body)(void *), void *argument);
int __real_pthread_cond_timedwait(pthread_cond_t *condition, pthread_mutex_t *mutex, const timespec *deadline);
int __real_regcomp(regex_t *regex, const char *pattern, int flags);
void __real_vsyslog(int priority, const char *format, va_list args);

ssize_t __wrap_read(int fd, void *bytes, size_t count)
{
    return spool_calls().read ? spool_calls().read(fd, bytes, count) : __real_read(fd, bytes, count);
}
ssize_t __wrap___read_chk(int fd, void *bytes, size_t count, size_t) { return __wrap_read(fd, bytes, count); }

int __wrap_mkdir(const char *path, mode_t mode)
{
    if (spool_calls().directory_made) spool_calls().directory_made(path);
    return __real_mkdir(path, mode);
}

int __wrap_gethostname(char *name, size_t size)
{
    return spool_calls().host_name ? spool_calls().host_name(name, size) : __real_gethostname(name, size);
}
int __wrap___gethostname_chk(char *name, size_t size, size_t) { return __wrap_gethostname(name, size); }

int __wrap_gettimeofday(timeval *time, void *zone)
{
    return spool_calls().time_of_day ? spool_calls().time_of_day(time) : __real_gettimeofday(time, zone);
}

int __wrap_pthread_create(pthread_t *thread, const pthread_attr_t *attributes, void *(*body)(void *), void *argument)
{
    const int refused = spool_calls().thread_start ? spool_calls().thread_start(body) : 0;
    return refused != 0 ? refused : __real_pthread_create(thread, attributes, body, argument);
}

int __wrap_pthread_cond_timedwait(pthread_cond_t *condition, pthread_mutex_t *mutex, const timespec *deadline)
{
    if (spool_calls().timed_wait) spool_calls().timed_wait(*deadline);
    return __real_pthread_cond_timedwait(condition, mutex, deadline);
}

int __wrap_regcomp(regex_t *regex, const char *pattern, int flags)
{
    const int refused = spool_calls().regcomp ? spool_calls().regcomp(pattern) : 0;
    return refused != 0 ? refused : __real_regcomp(regex, pattern, flags);
}

void __wrap_vsyslog(int priority, const char *format, va_list args)
{
    if (spool_calls().log_line) spool_calls().log_line(text_of(format, args));
    __real_vsyslog(priority, format, args);
}
void __wrap___vsyslog_chk(int priority, int, const char *format, va_list args)
{
    __wrap_vsyslog(priority, format, args);
}
void __wrap_syslog(int priority, const char *format, ...)
{
    va_list args;
    va_start(args, format);
    __wrap_vsyslog(priority, format, args);
    va_end(args);
}
void __wrap___syslog_chk(int priority, int, const char *format, ...)
{
    va_list args;
    va_start(args, format);
    __wrap_vsyslog(priority, format, args);
    va_end(args);
}
}
#pragma GCC visibility pop
