// The fleet's tables in the engine: made, listed, and cleared of what nobody reads any more.
#ifndef VORN_HOST_FLEET_TABLES_HPP
#define VORN_HOST_FLEET_TABLES_HPP

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "fleet/engine.hpp"

namespace host {

// The newest complete run of a server's profile.
struct FleetRun {
  std::string server, profile;
  std::uint64_t run = 0;  // its number in the tables
  std::int64_t started = 0, finished = 0, interval = 0;
  std::uint64_t files = 0, bytes = 0;
};

// Each says what went wrong as one sentence; an empty one says that all is well.

// Makes what is missing, on every node.
std::string make_tables(Engine& engine);
// By server and profile.
std::string list_runs(Engine& engine, std::vector<FleetRun>& runs);
// Removes what no report can need: runs that a newer complete one has taken the place of a quarter
// of an hour ago, longer than a statement takes, and what was begun a day before it or more and
// never completed.
std::string drop_old_runs(Engine& engine, const std::vector<FleetRun>& newest, std::int64_t now);
// Removes all of the server's runs; `dropped` tells how many.
std::string drop_server(Engine& engine, const std::string& server, std::size_t& dropped);

}  // namespace host

#endif
