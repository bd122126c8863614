// Threads that hang in a system call until they are cancelled: the calls at which a thread inside the library can be
// cancelled, replaced in the test program.
#pragma once

#include <functional>
#include <string>

namespace qn::test
{
inline const std::string any_call = "any";

// Runs `body` in a thread of its own, which hangs in the call of that name, made for the `count`-th time in `body`, and
// is cancelled there. "open", "read", "write", "close", "fsync", "msync", "usleep", "syslog", "vsyslog" or any_call.
// True when the thread came there and its cancellation was its end.
bool cancelled_in(const std::string &call, const std::function<void()> &body, int count = 1);
} // namespace qn::test
