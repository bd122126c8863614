// The fixed paths under /var, without touching the machine's: the test goes on in a process of its own, in a private
// mount namespace with an empty file system over /var.
#pragma once

#include <functional>

namespace qn::test
{
// Runs `body` in a forked child whose /var is empty and its own; true when it returned true. Skips the test (and returns
// true) where the kernel does not allow such a namespace. The library must not have been initialised before the call.
bool in_private_var(const std::function<bool()> &body);
} // namespace qn::test
