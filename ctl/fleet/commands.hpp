// The commands around a fleet of servers.
#ifndef VORN_CTL_FLEET_COMMANDS_HPP
#define VORN_CTL_FLEET_COMMANDS_HPP

#include <CLI/App.hpp>

namespace ctl {

void add_fleet_commands(CLI::App& app);

}  // namespace ctl

#endif
