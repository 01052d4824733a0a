#include "fleet/fleet_nodes.hpp"

#include <cstdlib>
#include <functional>
#include <set>
#include <utility>

namespace host {
namespace {

using report_format::fleet_literal;
using report_format::FleetTable;

std::uint64_t number(const char* text) {
  return text != nullptr ? std::strtoull(text, nullptr, 10) : 0;
}

std::string read_kept(Engine& engine, FleetNode& node) {
  const FleetConf& conf = engine.conf();
  const std::string line = conf.part_of(report_format::kFleetRun.name);
  std::set<std::string, std::less<>> tables;
  for (const FleetTable* table : report_format::kFleetTables) {
    tables.insert(conf.part_of(table->name));
  }
  const bool listed = engine.select_on(
      node.number,
      "select table, partition, toString(sum(rows)) from system.parts where active and database=" +
          fleet_literal(conf.database) + " group by table, partition",
      [&](const std::vector<char*>& fields) {
        enum Field { kTable, kPartition, kRows, kCount };
        report_format::FleetPartition partition;
        if (fields.size() == kCount && tables.contains(fields[kTable]) &&
            report_format::read_partition(fields[kPartition], partition)) {
          KeptRun& run = node.kept[std::move(partition)];
          (fields[kTable] == line ? run.has_line = true : run.rows += number(fields[kRows]));
        }
        return true;
      });
  return listed ? "" : engine.problem();
}

// Replicas of each other have one path at their coordinator.
std::string read_group(Engine& engine, FleetNode& node) {
  const FleetConf& conf = engine.conf();
  std::string problem = ask_node(
      engine, node.number,
      "select zookeeper_path from system.replicas where database=" + fleet_literal(conf.database) +
          " and table=" + fleet_literal(conf.part_of(report_format::kFleetRun.name)),
      node.group);
  if (node.group.empty()) {
    node.group = conf.urls[node.number];
  }
  return problem;
}

}  // namespace

std::string ask_node(Engine& engine, std::size_t node, const std::string& sql,
                     std::string& answer) {
  answer.clear();
  const bool done = engine.select_on(node, sql, [&](const std::vector<char*>& fields) {
    answer = fields[0] != nullptr ? fields[0] : "";
    return true;
  });
  return done ? "" : engine.problem();
}

std::string read_shape(Engine& engine, std::size_t node, ClusterShape& shape) {
  const FleetConf& conf = engine.conf();
  shape = {};
  if (conf.cluster.empty()) {
    return "";
  }
  std::uint64_t nodes = 0;
  const bool told = engine.select_on(
      node,
      "select toString(count()), toString(max(shard_num)), toString(max(replica_num)), "
      "toString(max(if(is_local, shard_num, 0))) from system.clusters where cluster=" +
          fleet_literal(conf.cluster),
      [&](const std::vector<char*>& fields) {
        enum Field { kNodes, kShards, kReplicas, kOwn, kCount };
        if (fields.size() != kCount) {
          return false;
        }
        nodes = number(fields[kNodes]);
        shape = {number(fields[kShards]), number(fields[kReplicas]) > 1, number(fields[kOwn])};
        return true;
      });
  if (!told) {
    return engine.problem();
  }
  if (nodes == 0) {
    return conf.urls[node] + " knows no cluster " + conf.cluster +
           "; name one of its remote_servers";
  }
  if (nodes > engine.nodes()) {
    return "cluster " + conf.cluster + " has " + std::to_string(nodes) + " nodes, but url names " +
           std::to_string(engine.nodes()) + "; let it name every one";
  }
  return "";
}

std::string survey(Engine& engine, std::vector<FleetNode>& nodes) {
  nodes.clear();
  std::set<std::string> groups;
  std::size_t shards = 1;
  std::string silent;
  for (std::size_t i = 0; i < engine.nodes(); ++i) {
    FleetNode node{i, "", {}};
    ClusterShape shape;
    std::string problem = read_shape(engine, i, shape);
    for (const auto& read : {read_group, read_kept}) {
      problem = problem.empty() ? read(engine, node) : problem;
    }
    if (problem.empty()) {
      shards = shape.shards;
      groups.insert(node.group);
      nodes.push_back(std::move(node));
    } else if (engine.is_silent()) {
      silent += silent.empty() ? problem : "; " + problem;
    } else {
      return problem;
    }
  }
  return silent.empty() || groups.size() >= shards ? "" : silent;
}

}  // namespace host
