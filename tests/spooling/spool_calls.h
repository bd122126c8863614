// The calls that spooling makes, in the hands of a test, beside those of files/support_calls.h: each goes to the test's
// function when there is one, else to the real call.
#pragma once

#include <ctime>
#include <functional>
#include <string>
#include <sys/time.h>
#include <sys/types.h>

#include <pthread.h>
#include <regex.h>

#include "files/support_calls.h"

namespace qn::test
{
struct spool_call_hooks {
    std::function<ssize_t(int fd, void *bytes, size_t count)> read;
    std::function<void(const char *path)> directory_made; // before it is made
    std::function<int(char *name, size_t size)> host_name;
    std::function<int(timeval *)> time_of_day;
    std::function<int(void *(*body)(void *))> thread_start;   // not made when the result is not 0
    std::function<void(const timespec &deadline)> timed_wait; // before it is made
    std::function<int(const char *pattern)> regcomp;
    std::function<void(const std::string &text)> log_line; // before it is caught
};

// The hooks, empty before and after each test. Set them while no other thread is inside the library.
spool_call_hooks &spool_calls();
} // namespace qn::test

// The real call, for a hook that passes some calls on.
extern "C" ssize_t __real_read(int fd, void *bytes, size_t count);
