// The subcommands, one function each: it adds the command with its options to the parser, and leaves the exit status of
// a run in `status`.
#pragma once

#include <CLI/CLI.hpp>

namespace qn::dump
{

void add_check_command(CLI::App &app, int &status);
void add_completion_command(CLI::App &app, int &status);
void add_config_command(CLI::App &app, int &status);
void add_dump_command(CLI::App &app, int &status);
void add_errors_command(CLI::App &app, int &status);
void add_export_command(CLI::App &app, int &status);
void add_follow_command(CLI::App &app, int &status);
void add_info_command(CLI::App &app, int &status);
void add_merge_command(CLI::App &app, int &status);
void add_salvage_command(CLI::App &app, int &status);
void add_report_command(CLI::App &app, int &status);
void add_spool_command(CLI::App &app, int &status);
void add_stats_command(CLI::App &app, int &status);

} // namespace qn::dump
