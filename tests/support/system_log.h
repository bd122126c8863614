// What the library writes to the system log, caught: linking this file replaces syslog() and its kin in the program.
#pragma once

#include <string>
#include <vector>

namespace qn::test
{
struct log_line {
    int priority;
    std::string text;
};

struct log_opening {
    std::string identity;
    int options;
    int facility;
};

std::vector<log_line> system_log(); // since the program started, or the last clear
std::vector<log_opening> system_log_openings();
void clear_system_log();
bool system_log_has(const std::string &text); // a line that is exactly that, newline included
} // namespace qn::test
