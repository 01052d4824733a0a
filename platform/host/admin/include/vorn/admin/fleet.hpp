// The fleet, as an administrator sets it up and looks at it. Each call that fails leaves a message.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "vorn/admin/configuration.hpp"

namespace admin {

// Changes the configuration of the fleet once every node has answered to it.
bool set_fleet(const Changes& changes);

// Makes the tables that are missing, on every node, and drops runs that nobody reads any more.
bool init_fleet();

// The newest complete run of a server's profile. Times in seconds since the epoch.
struct FleetRun {
  std::string server, profile;
  std::int64_t started = 0, finished = 0;
  std::uint64_t files = 0, bytes = 0;
  bool overdue = false;
};
// By server and profile, as of `now`; older runs are dropped.
std::optional<std::vector<FleetRun>> fleet_runs(std::int64_t now);

// Removes all rows of a server, or those of one profile unless `profile` is empty.
bool forget_server(const std::string& server, const std::string& profile);
// Has what a profile of this server has sent stand under its new name. Nothing to do, and true,
// where it has sent nothing or no fleet is configured.
bool rename_fleet_runs(const std::string& from, const std::string& to);

}  // namespace admin
