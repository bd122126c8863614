// Runs the command on a pseudo-terminal of its own.
#pragma once

#include <string>
#include <vector>

namespace qn::test
{

struct screening {
    int status = -1; // exit status, or -1 when a signal ended it
    int signal = 0;
    std::string screen; // all that came to the terminal, without carriage returns before line ends
};

// Standard input, output and error are the terminal.
screening run_on_terminal(const std::vector<std::string> &arguments, const std::vector<std::string> &environment = {});

// Standard output is a pipe, of which nothing is read for a while.
screening run_beside_terminal(const std::vector<std::string> &arguments, int milliseconds);

} // namespace qn::test
