// Following a live trace and printing it, for the commands that do.
#pragma once

#include <chrono>
#include <string>

#include <CLI/CLI.hpp>

#include "tools/qntrace/follow/follow_output.h"

namespace qn::dump
{

struct follow_options {
    follow_output_options output;
    bool coordinate = false;
    bool until_exit = false;
    std::chrono::nanoseconds interval = std::chrono::milliseconds(100);
};

// Adds --coordinate, --interval and --until-exit; to a command that may follow, as what makes sense with `follows` only.
void add_follow_options(CLI::App &command, follow_options &options, CLI::Option *follows = nullptr);

// Follows until it is told to end. Returns the exit status.
int follow(const std::string &name, const follow_options &options);

} // namespace qn::dump
