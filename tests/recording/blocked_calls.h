// Threads that hang in a system call until they are cancelled: the calls at which a thread inside the library can be
// cancelled, replaced in the test program.
#pragma once

#include <functional>
#include <string>

namespace qn::test
{
// Runs `body` in a thread of its own, which hangs in the call of that name, made for the `count`-th time in `body`, and
// is cancelled there. "open", "write", "fsync", "msync", "usleep" or "vsyslog".
// True when the thread came there and its cancellation was its end.
bool cancelled_in(const std::string &call, const std::function<void()> &body, int count = 1);
} // namespace qn::test
