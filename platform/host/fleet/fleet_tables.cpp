#include "fleet/fleet_tables.hpp"

#include <algorithm>
#include <cstdlib>
#include <functional>
#include <map>
#include <set>
#include <utility>

#include "fleet/fleet_nodes.hpp"
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

// What the parts are made as: replicas of each other where the cluster has such.
std::string engine_of_parts(const FleetConf& conf, const FleetTable& table, bool has_replicas) {
  const std::string path =
      "/clickhouse/tables/{shard}/" + conf.database + "/" + conf.part_of(table.name);
  return has_replicas ? "ReplicatedMergeTree(" + fleet_literal(path) + ", '{replica}')"
                      : "MergeTree";
}

std::string make_table(Engine& engine, std::size_t node, const FleetTable& table,
                       bool has_replicas) {
  const FleetConf& conf = engine.conf();
  const std::string part = conf.part_of(table.name);
  bool done = engine.execute(
      node, "create table if not exists " + qualified(conf, part) + " " + columns_of(table) +
                " engine = " + engine_of_parts(conf, table, has_replicas) +
                " partition by (server, profile, run) order by (" + table.order + ")");
  if (done && !conf.cluster.empty()) {
    done =
        engine.execute(node, "create table if not exists " + qualified(conf, table.name) + " " +
                                 columns_of(table) + " engine = Distributed(" +
                                 fleet_literal(conf.cluster) + ", " + fleet_literal(conf.database) +
                                 ", " + fleet_literal(part) + ", cityHash64(server))");
  }
  return done ? "" : engine.problem();
}

// Tables that were made before runs told their rows get the column for it.
std::string add_row_count(Engine& engine, std::size_t node, const std::string& table) {
  const FleetConf& conf = engine.conf();
  std::string found;
  std::string problem =
      ask_node(engine, node,
               "select name from system.columns where database=" + fleet_literal(conf.database) +
                   " and table=" + fleet_literal(table) + " and name='row_count'",
               found);
  if (!problem.empty() || !found.empty()) {
    return problem;
  }
  return engine.execute(node, "alter table " + qualified(conf, table) +
                                  " add column row_count UInt64 after since_last")
             ? ""
             : engine.problem();
}

// A database that was made for one node holds rows that a cluster's tables would hide, and the
// other way round; one without replicas doesn't become one with them.
std::string check_layout(Engine& engine, std::size_t node, bool has_replicas) {
  const FleetConf& conf = engine.conf();
  const auto find_kind = [&](const std::string& table, std::string& kind) {
    return ask_node(engine, node,
                    "select engine from system.tables where database=" +
                        fleet_literal(conf.database) + " and name=" + fleet_literal(table),
                    kind);
  };
  std::string kind;
  std::string part;
  std::string problem = find_kind(report_format::kFleetRun.name, kind);
  if (problem.empty()) {
    problem = find_kind(conf.part_of(report_format::kFleetRun.name), part);
  }
  if (!problem.empty()) {
    return problem;
  }
  const char* made = !kind.empty() && (kind == "Distributed") == conf.cluster.empty()
                         ? (conf.cluster.empty() ? "for a cluster" : "without a cluster")
                     : !part.empty() && (part == "ReplicatedMergeTree") != has_replicas
                         ? (has_replicas ? "without replicas" : "with replicas")
                         : nullptr;
  return made == nullptr ? ""
                         : "database " + conf.database + " on " + conf.urls[node] + " was made " +
                               made + "; name another one with --database";
}

// A node by what it is to the others.
struct Place {
  std::string url;
  std::size_t shard = 0;  // in the cluster; 0 when that isn't known
  std::string shard_macro, replica_macro;
};

std::string read_macros(Engine& engine, std::size_t node, Place& place) {
  for (const auto& [macro, value] :
       {std::pair{"shard", &place.shard_macro}, std::pair{"replica", &place.replica_macro}}) {
    std::string problem = ask_node(
        engine, node, "select substitution from system.macros where macro=" + fleet_literal(macro),
        *value);
    if (problem.empty() && value->empty()) {
      problem = engine.conf().urls[node] + " has no macro " + macro +
                ", by which replicas find each other; set it in its configuration";
    }
    if (!problem.empty()) {
      return problem;
    }
  }
  return "";
}

// Nodes whose macros don't fit would hold each other's rows, or never get them.
std::string check_macros(const std::vector<Place>& places) {
  for (std::size_t i = 0; i < places.size(); ++i) {
    for (std::size_t j = 0; j < i; ++j) {
      const Place& one = places[j];
      const Place& other = places[i];
      const bool is_known = one.shard != 0 && other.shard != 0;
      const bool is_same = one.shard_macro == other.shard_macro;
      if (is_known && (one.shard == other.shard) != is_same) {
        return "the macro shard of " + one.url + " and " + other.url +
               " doesn't fit the cluster; let a shard's replicas have one value, and every shard "
               "its own";
      }
      if (is_same && one.replica_macro == other.replica_macro) {
        return one.url + " and " + other.url +
               " have the same macros shard and replica; let every replica have its own";
      }
    }
  }
  return "";
}

// Everything that init can't mend.
std::string check_nodes(Engine& engine, bool& has_replicas) {
  std::vector<Place> places;
  for (std::size_t node = 0; node < engine.nodes(); ++node) {
    ClusterShape shape;
    std::string problem = read_shape(engine, node, shape);
    has_replicas = shape.has_replicas;
    if (problem.empty()) {
      problem = check_layout(engine, node, has_replicas);
    }
    if (problem.empty() && has_replicas) {
      places.push_back({engine.conf().urls[node], shape.own_shard, "", ""});
      problem = read_macros(engine, node, places.back());
    }
    if (!problem.empty()) {
      return problem;
    }
  }
  return check_macros(places);
}

// Drops what `is_dropped` picks, once among replicas. It learns whether the run may have a line:
// a node that doesn't answer may keep it, or one that others still wait for.
std::string drop_where(
    Engine& engine,
    const std::function<bool(const FleetPartition&, bool may_have_line)>& is_dropped) {
  const FleetConf& conf = engine.conf();
  std::vector<FleetNode> nodes;
  if (std::string problem = survey(engine, nodes); !problem.empty()) {
    return problem;
  }
  std::set<FleetPartition> lines;
  for (const FleetNode& node : nodes) {
    for (const auto& [partition, run] : node.kept) {
      if (run.has_line || nodes.size() < engine.nodes()) {
        lines.insert(partition);
      }
    }
  }
  std::set<std::pair<std::string, FleetPartition>> dropped;
  for (const FleetNode& node : nodes) {
    for (const auto& [partition, run] : node.kept) {
      if (!is_dropped(partition, lines.contains(partition)) ||
          !dropped.emplace(node.group, partition).second) {
        continue;
      }
      // The run's line goes first: what is left of a run without it is seen by nobody.
      for (std::size_t left = report_format::kFleetTables.size(); left > 0; --left) {
        const std::string part = conf.part_of(report_format::kFleetTables[left - 1]->name);
        if (!engine.execute(node.number, "alter table " + qualified(conf, part) +
                                             " drop partition (" + fleet_literal(partition.server) +
                                             ", " + fleet_literal(partition.profile) + ", " +
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

struct Line {
  FleetRun run;
  std::uint64_t rows = 0;  // that were sent with it
};

// The lines of all runs, the newest of a server's profile first.
std::string read_lines(Engine& engine, std::vector<Line>& lines) {
  constexpr char kLines[] =
      "select server, profile, toString(run), started, finished, since_last, files, bytes, "
      "row_count from run order by server, profile, run desc";
  const bool done = engine.select(kLines, [&](const std::vector<char*>& fields) {
    enum Field { kServer, kProfile, kRun, kStarted, kFinished, kInterval, kFiles, kBytes, kRows };
    if (fields.size() != kRows + 1) {
      return false;
    }
    const auto text = [&](Field field) { return fields[field] != nullptr ? fields[field] : ""; };
    const auto count = [&](Field field) { return std::strtoull(text(field), nullptr, 10); };
    lines.push_back(
        {{text(kServer), text(kProfile), count(kRun), number(fields[kStarted]),
          number(fields[kFinished]), number(fields[kInterval]), count(kFiles), count(kBytes)},
         count(kRows)});
    return true;
  });
  return done ? "" : engine.problem();
}

// Whether any node that a reader can come to has all that it should of the run, whose rows may be
// with several groups: a node that stopped taking them was replaced by another.
bool is_everywhere(const Line& line, const std::vector<FleetNode>& nodes) {
  const FleetPartition key{line.run.server, line.run.profile, line.run.run};
  std::map<std::string, KeptRun> least;  // of a group
  for (const FleetNode& node : nodes) {
    const auto kept = node.kept.find(key);
    const KeptRun run = kept != node.kept.end() ? kept->second : KeptRun{};
    const auto [place, is_new] = least.try_emplace(node.group, run);
    if (!is_new) {
      place->second.rows = std::min(place->second.rows, run.rows);
      place->second.has_line = place->second.has_line && run.has_line;
    }
  }
  std::uint64_t rows = 0;
  bool has_line = false;
  for (const auto& [group, run] : least) {
    rows += run.rows;
    has_line = has_line || run.has_line;
  }
  return has_line && rows >= line.rows;
}

// Numbers that not only one server's profile has.
std::set<std::uint64_t> shared_numbers(const std::vector<FleetNode>& nodes) {
  std::map<std::uint64_t, FleetPartition> owners;
  std::set<std::uint64_t> shared;
  for (const FleetNode& node : nodes) {
    for (const auto& [partition, kept] : node.kept) {
      if (owners.try_emplace(partition.run, partition).first->second != partition) {
        shared.insert(partition.run);
      }
    }
  }
  return shared;
}

std::int64_t begun(std::uint64_t run) {
  return static_cast<std::int64_t>(run / report_format::kRunsInSecond);
}

// Adds the run's rows under another profile.
std::string copy_statement(const FleetConf& conf, const FleetTable& table, const FleetRun& run,
                           const std::string& profile) {
  const std::string columns = report_format::fleet_column_names(table);
  return "insert into " + qualified(conf, conf.part_of(table.name)) + " (server, profile, run, " +
         columns + ") select server, " + fleet_literal(profile) + ", run, " + columns + " from " +
         qualified(conf, table.name) + " where server = " + fleet_literal(run.server) +
         " and profile = " + fleet_literal(run.profile) + " and run = " + std::to_string(run.run);
}

bool is_of_one(const FleetRun& run, const std::string& server, const std::string& profile) {
  return run.server == server && run.profile == profile;
}

}  // namespace

std::string make_tables(Engine& engine) {
  bool has_replicas = false;
  if (std::string problem = check_nodes(engine, has_replicas); !problem.empty()) {
    return problem;
  }
  for (std::size_t node = 0; node < engine.nodes(); ++node) {
    if (!engine.execute(node, "create database if not exists `" + engine.conf().database + "`")) {
      return engine.problem();
    }
    for (const FleetTable* table : report_format::kFleetTables) {
      if (std::string problem = make_table(engine, node, *table, has_replicas); !problem.empty()) {
        return problem;
      }
    }
    for (const std::string& table : {engine.conf().part_of(report_format::kFleetRun.name),
                                     std::string(report_format::kFleetRun.name)}) {
      if (std::string problem = add_row_count(engine, node, table); !problem.empty()) {
        return problem;
      }
    }
  }
  return "";
}

std::string list_runs(Engine& engine, FleetListing& listing) {
  listing = {};
  std::vector<Line> lines;
  std::vector<FleetNode> nodes;
  // What was there when a line was read is found by the look at the nodes that comes after.
  std::string problem = read_lines(engine, lines);
  if (problem.empty() && !engine.select("select toUInt64(now())", [&](const auto& fields) {
        listing.now = number(fields[0]);
        return true;
      })) {
    problem = engine.problem();
  }
  if (problem.empty()) {
    problem = survey(engine, nodes);
  }
  for (const FleetNode& node : nodes) {
    listing.answering.push_back(node.number);
  }
  const std::set<std::uint64_t> shared = shared_numbers(nodes);
  for (Line& line : lines) {
    line.run.has_shared_number = shared.contains(line.run.run);
    if (begun(line.run.run) > listing.now + kDay) {
      listing.ahead.push_back(std::move(line.run));
    } else if (is_everywhere(line, nodes)) {
      listing.complete.push_back(std::move(line.run));
    }
  }
  return problem;
}

std::vector<FleetRun> newest_runs(const FleetListing& listing) {
  std::vector<FleetRun> newest;
  for (const FleetRun& run : listing.complete) {
    if (newest.empty() || !is_of_one(newest.back(), run.server, run.profile)) {
      newest.push_back(run);
    }
  }
  return newest;
}

std::string drop_old_runs(Engine& engine, const FleetListing& listing) {
  const std::vector<FleetRun> newest = newest_runs(listing);
  return drop_where(engine, [&](const FleetPartition& partition, bool may_have_line) {
    const auto found = std::find_if(newest.begin(), newest.end(), [&](const FleetRun& run) {
      return is_of_one(run, partition.server, partition.profile);
    });
    const bool is_ahead = begun(partition.run) > listing.now + kDay;
    if (found != newest.end() && (partition.run <= found->run || is_ahead)) {
      return partition.run != found->run && found->finished < listing.now - kLongestReport;
    }
    return !may_have_line && begun(partition.run) < listing.now - kDay;
  });
}

std::string drop_server(Engine& engine, const std::string& server, const std::string& profile,
                        std::size_t& dropped) {
  std::set<std::pair<std::string, std::uint64_t>> runs;
  std::string problem = drop_where(engine, [&](const FleetPartition& partition, bool /*line*/) {
    const bool is_named =
        partition.server == server && (profile.empty() || partition.profile == profile);
    if (is_named) {
      runs.emplace(partition.profile, partition.run);
    }
    return is_named;
  });
  dropped = runs.size();
  return problem;
}

std::string rename_runs(Engine& engine, const std::string& from, const std::string& to) {
  const FleetConf& conf = engine.conf();
  FleetListing listing;
  if (std::string problem = list_runs(engine, listing); !problem.empty()) {
    return problem;
  }
  const std::vector<FleetRun> runs = newest_runs(listing);
  const auto run = std::find_if(runs.begin(), runs.end(), [&](const FleetRun& one) {
    return is_of_one(one, conf.server, from);
  });
  if (run == runs.end()) {
    return "";
  }
  // Once, on one node, whatever replicas there are. The run's line is the last one.
  for (const FleetTable* table : report_format::kFleetTables) {
    if (!engine.execute(conf.home(), copy_statement(conf, *table, *run, to))) {
      return engine.problem();
    }
  }
  std::size_t dropped = 0;
  return drop_server(engine, conf.server, from, dropped);
}

}  // namespace host
