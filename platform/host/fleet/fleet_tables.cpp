#include "fleet/fleet_tables.hpp"

#include <algorithm>
#include <cstdlib>
#include <functional>
#include <set>
#include <utility>

#include "report_format/fleet.hpp"

namespace host {
namespace {

using report_format::fleet_literal;
using report_format::FleetPartition;
using report_format::FleetTable;

constexpr std::int64_t kLongestReport = 900;
constexpr std::int64_t kDay = 86400;

std::string qualified(const FleetConf& conf, const std::string& table) {
  return "`" + conf.database + "`.`" + table + "`";
}

std::string columns_of(const FleetTable& table) {
  return std::string("(server String, profile String, run UInt64, ") + table.columns + ")";
}

// One value of a statement's one row.
std::string value_of(Engine& engine, std::size_t node, const std::string& sql, std::string& value) {
  const bool done = engine.select_on(node, sql, [&](const std::vector<char*>& fields) {
    value = fields[0] != nullptr ? fields[0] : "";
    return true;
  });
  return done ? "" : engine.problem();
}

// What the parts are made as: replicas of each other where the cluster has such.
std::string engine_of_parts(Engine& engine, std::size_t node, const FleetTable& table,
                            std::string& kind) {
  const FleetConf& conf = engine.conf();
  std::string replicas = "0";
  if (!conf.cluster.empty()) {
    std::string problem =
        value_of(engine, node,
                 "select toString(max(replica_num)) from system.clusters where cluster=" +
                     fleet_literal(conf.cluster),
                 replicas);
    if (!problem.empty()) {
      return problem;
    }
    if (replicas == "0") {
      return conf.urls[node] + " knows no cluster " + conf.cluster +
             "; name one of its remote_servers";
    }
  }
  const std::string path =
      "/clickhouse/tables/{shard}/" + conf.database + "/" + conf.part_of(table.name);
  kind = std::strtoull(replicas.c_str(), nullptr, 10) > 1
             ? "ReplicatedMergeTree(" + fleet_literal(path) + ", '{replica}')"
             : "MergeTree";
  return "";
}

std::string make_table(Engine& engine, std::size_t node, const FleetTable& table) {
  const FleetConf& conf = engine.conf();
  const std::string part = conf.part_of(table.name);
  std::string kind;
  if (std::string problem = engine_of_parts(engine, node, table, kind); !problem.empty()) {
    return problem;
  }
  if (!engine.execute(node, "create table if not exists " + qualified(conf, part) + " " +
                                columns_of(table) + " engine = " + kind +
                                " partition by (server, profile, run) order by (" + table.order +
                                ")")) {
    return engine.problem();
  }
  if (conf.cluster.empty()) {
    return "";
  }
  return engine.execute(node, "create table if not exists " + qualified(conf, table.name) + " " +
                                  columns_of(table) + " engine = Distributed(" +
                                  fleet_literal(conf.cluster) + ", " +
                                  fleet_literal(conf.database) + ", " + fleet_literal(part) +
                                  ", cityHash64(server))")
             ? ""
             : engine.problem();
}

// A database that was made for one node holds rows that a cluster's tables would hide, and the
// other way round.
std::string check_layout(Engine& engine, std::size_t node) {
  const FleetConf& conf = engine.conf();
  std::string kind;
  std::string problem =
      value_of(engine, node,
               "select engine from system.tables where database=" + fleet_literal(conf.database) +
                   " and name=" + fleet_literal(report_format::kFleetRun.name),
               kind);
  if (!problem.empty() || kind.empty() || (kind == "Distributed") == !conf.cluster.empty()) {
    return problem;
  }
  return "database " + conf.database + " on " + conf.urls[node] + " was made " +
         (conf.cluster.empty() ? "for a cluster" : "without a cluster") +
         "; name another one with --database";
}

// Drops, on every node, the partitions of all tables that `is_dropped` picks.
std::string drop_where(Engine& engine,
                       const std::function<bool(const FleetPartition&)>& is_dropped) {
  const FleetConf& conf = engine.conf();
  for (std::size_t node = 0; node < engine.nodes(); ++node) {
    // The run's line goes first: what is left of a run without it is seen by nobody.
    for (std::size_t left = report_format::kFleetTables.size(); left > 0; --left) {
      const std::string part = conf.part_of(report_format::kFleetTables[left - 1]->name);
      std::vector<std::string> partitions;
      const bool listed = engine.select_on(
          node,
          "select distinct partition from system.parts where active and database=" +
              fleet_literal(conf.database) + " and table=" + fleet_literal(part),
          [&](const std::vector<char*>& fields) {
            partitions.emplace_back(fields[0] != nullptr ? fields[0] : "");
            return true;
          });
      if (!listed) {
        return engine.problem();
      }
      for (const std::string& text : partitions) {
        FleetPartition partition;
        if (report_format::read_partition(text, partition) && is_dropped(partition) &&
            !engine.execute(node, "alter table " + qualified(conf, part) + " drop partition (" +
                                      fleet_literal(partition.server) + ", " +
                                      fleet_literal(partition.profile) + ", " +
                                      std::to_string(partition.run) + ")")) {
          return engine.problem();
        }
      }
    }
  }
  return "";
}

std::int64_t number(const char* text) {
  return text != nullptr ? std::strtoll(text, nullptr, 10) : 0;
}

}  // namespace

std::string make_tables(Engine& engine) {
  for (std::size_t node = 0; node < engine.nodes(); ++node) {
    if (std::string problem = check_layout(engine, node); !problem.empty()) {
      return problem;
    }
    if (!engine.execute(node, "create database if not exists `" + engine.conf().database + "`")) {
      return engine.problem();
    }
    for (const FleetTable* table : report_format::kFleetTables) {
      if (std::string problem = make_table(engine, node, *table); !problem.empty()) {
        return problem;
      }
    }
  }
  return "";
}

std::string list_runs(Engine& engine, std::vector<FleetRun>& runs) {
  constexpr char kRuns[] =
      "select server, profile, toString(max(run)), argMax(started, run), argMax(finished, run), "
      "argMax(since_last, run), argMax(files, run), argMax(bytes, run) from run "
      "group by server, profile order by server, profile";
  runs.clear();
  const bool done = engine.select(kRuns, [&](const std::vector<char*>& fields) {
    enum Field { kServer, kProfile, kRun, kStarted, kFinished, kInterval, kFiles, kBytes, kCount };
    if (fields.size() != kCount) {
      return false;
    }
    const auto text = [&](Field field) { return fields[field] != nullptr ? fields[field] : ""; };
    runs.push_back({text(kServer), text(kProfile), std::strtoull(text(kRun), nullptr, 10),
                    number(fields[kStarted]), number(fields[kFinished]), number(fields[kInterval]),
                    std::strtoull(text(kFiles), nullptr, 10),
                    std::strtoull(text(kBytes), nullptr, 10)});
    return true;
  });
  return done ? "" : engine.problem();
}

std::string drop_old_runs(Engine& engine, const std::vector<FleetRun>& newest, std::int64_t now) {
  return drop_where(engine, [&](const FleetPartition& partition) {
    const auto found = std::find_if(newest.begin(), newest.end(), [&](const FleetRun& run) {
      return run.server == partition.server && run.profile == partition.profile;
    });
    const bool is_replaced = found != newest.end() && partition.run < found->run &&
                             found->finished < now - kLongestReport;
    const auto begun = static_cast<std::int64_t>(partition.run / report_format::kRunsInSecond);
    const bool is_complete = found != newest.end() && partition.run == found->run;
    return is_replaced || (!is_complete && begun < now - kDay &&
                           (found == newest.end() || partition.run > found->run));
  });
}

std::string drop_server(Engine& engine, const std::string& server, std::size_t& dropped) {
  std::set<std::pair<std::string, std::uint64_t>> runs;
  std::string problem = drop_where(engine, [&](const FleetPartition& partition) {
    if (partition.server == server) {
      runs.emplace(partition.profile, partition.run);
    }
    return partition.server == server;
  });
  dropped = runs.size();
  return problem;
}

}  // namespace host
