// The configuration of the fleet: section [fleet] of fleet.conf.
#ifndef VORN_HOST_FLEET_CONF_HPP
#define VORN_HOST_FLEET_CONF_HPP

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace host {

inline constexpr const char* kFleetSection = "fleet";

struct FleetConf {
  std::vector<std::string> urls;  // of the engine's nodes, at least one
  std::string database;
  std::string cluster;         // empty: one node
  std::string user, password;  // empty: none
  bool insecure = false;
  std::string server;  // this server's name in the fleet

  // The table as a node keeps it.
  std::string part_of(std::string_view table) const;
  // The node, as its place in `urls`, that this server's rows go to while it can be reached.
  std::size_t home() const;
};

// What a section says, or, where it can't be worked with, one sentence that says what to do.
struct FleetReading {
  std::optional<FleetConf> conf;
  std::string problem;  // empty without a configuration: there is no fleet then
};

// `entries`: keys and values of the section. Reads the password from its file.
FleetReading fleet_conf_of(const std::vector<std::pair<std::string, std::string>>& entries);

// The section of VORN_PATH_FLEET.
FleetReading read_fleet_conf();

// Why `name` can't be a server's name in a fleet ("it holds a comma"), or null.
const char* server_name_error(std::string_view name);

}  // namespace host

#endif
