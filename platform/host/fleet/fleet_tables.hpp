// The fleet's tables in the engine: made, listed, and cleared of what nobody reads any more.
#ifndef VORN_HOST_FLEET_TABLES_HPP
#define VORN_HOST_FLEET_TABLES_HPP

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "fleet/engine.hpp"

namespace host {

// A run by its line.
struct FleetRun {
  std::string server, profile;
  std::uint64_t run = 0;  // its number in the tables
  std::int64_t started = 0, finished = 0, interval = 0;
  std::uint64_t files = 0, bytes = 0;
  // Rows of another server or profile have its number.
  bool has_shared_number = false;
};

struct FleetListing {
  // Runs whose line is there with all of their rows, on every replica that answers: by server and
  // profile, the newest first.
  std::vector<FleetRun> complete;
  // Of a clock that was ahead by more than a day. They don't count: none that comes could replace
  // them.
  std::vector<FleetRun> ahead;
  std::int64_t now = 0;                // by the engine's clock
  std::vector<std::size_t> answering;  // nodes
};
// The first one of each profile.
std::vector<FleetRun> newest_runs(const FleetListing& listing);

// Each says what went wrong as one sentence; an empty one says that all is well.

// Makes what is missing, on every node, once all of them are fit for it.
std::string make_tables(Engine& engine);
std::string list_runs(Engine& engine, FleetListing& listing);
// Removes what no report can need: runs that a newer complete one has taken the place of a quarter
// of an hour ago, longer than a statement takes, those ahead of such a one, and what was begun a
// day before or more and never got its line.
std::string drop_old_runs(Engine& engine, const FleetListing& listing);
// Removes all runs of the server, or those of one profile unless `profile` is empty; `dropped`
// tells how many.
std::string drop_server(Engine& engine, const std::string& server, const std::string& profile,
                        std::size_t& dropped);
// Gives the newest run of this server's profile `from` to `to`, and removes the others.
std::string rename_runs(Engine& engine, const std::string& from, const std::string& to);

}  // namespace host

#endif
