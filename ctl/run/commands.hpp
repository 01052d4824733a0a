// The commands that make reports and tell of them.
#ifndef VORN_CTL_RUN_COMMANDS_HPP
#define VORN_CTL_RUN_COMMANDS_HPP

#include <CLI/App.hpp>

namespace ctl {

void add_run_command(CLI::App& app);
void add_status_command(CLI::App& app);
void add_reports_command(CLI::App& app);
void add_log_command(CLI::App& app);

// Adds "compare" to the group `reports`.
void add_compare_command(CLI::App& reports);

}  // namespace ctl

#endif
