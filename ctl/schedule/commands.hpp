// The command that has profiles run by cron.
#ifndef VORN_CTL_SCHEDULE_COMMANDS_HPP
#define VORN_CTL_SCHEDULE_COMMANDS_HPP

#include <CLI/App.hpp>

namespace ctl {

void add_schedule_command(CLI::App& app);

}  // namespace ctl

#endif
