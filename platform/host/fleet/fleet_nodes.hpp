// The engine's nodes as a cluster: how they belong together, and what each of them keeps.
#ifndef VORN_HOST_FLEET_NODES_HPP
#define VORN_HOST_FLEET_NODES_HPP

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "fleet/engine.hpp"
#include "report_format/fleet.hpp"

namespace host {

// The first field of the last row that a statement gives on the node; "" without a row. Says what
// went wrong, as all below: one sentence, empty when all is well.
std::string ask_node(Engine& engine, std::size_t node, const std::string& sql, std::string& answer);

// The configured cluster as a node knows it; without one, the node alone.
struct ClusterShape {
  std::size_t shards = 1;
  bool has_replicas = false;
  std::size_t own_shard = 0;  // the node's, from 1 on; 0 when the engine can't tell
};
// Goes wrong when it is no cluster, or one with nodes that the configuration doesn't name.
std::string read_shape(Engine& engine, std::size_t node, ClusterShape& shape);

struct KeptRun {
  std::uint64_t rows = 0;  // of all tables but the run's own
  bool has_line = false;
};
struct FleetNode {
  std::size_t number = 0;  // among the configured ones
  std::string group;       // nodes of one group are replicas of each other
  std::map<report_format::FleetPartition, KeptRun> kept;
};
// What the nodes that answer keep; those that don't are left out, as long as replicas of them
// answer.
std::string survey(Engine& engine, std::vector<FleetNode>& nodes);

}  // namespace host

#endif
