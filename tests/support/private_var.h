// The fixed paths under /var, without touching the machine's: the test goes on in a process of its own, in a private
// mount namespace with an empty file system over /var.
#pragma once

#include <functional>
#include <string>

namespace qn::test
{
// Runs `body` in a forked child whose /var is empty and its own; true when it returned true. Skips the test (and returns
// true) where the kernel does not allow such a namespace. The library must not have been initialised before the call.
bool in_private_var(const std::function<bool()> &body);

// To be called in such a body: from now on /etc/machine-id holds `text`, and nothing else is in /etc.
void use_machine_id(const std::string &text);
} // namespace qn::test
