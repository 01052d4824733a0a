#include "vorn/admin/fleet.hpp"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <ctime>

#include "base/host_log.hpp"
#include "fleet/engine.hpp"
#include "fleet/fleet_conf.hpp"
#include "fleet/fleet_tables.hpp"
#include "report_format/fleet.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace admin {
namespace {

// True when there is nothing to tell.
bool tell(const std::string& problem) {
  if (!problem.empty()) {
    host::log_line("%s", problem.c_str());
  }
  return problem.empty();
}

std::optional<host::FleetConf> configuration() {
  host::FleetReading reading = host::read_fleet_conf();
  if (!reading.conf) {
    tell(reading.problem.empty() ? "no fleet is configured; run vornctl fleet set --url URL"
                                 : reading.problem);
  }
  return std::move(reading.conf);
}

bool make_if_missing() {
  struct stat status {};
  if (stat(VORN_PATH_FLEET, &status) == 0) {
    return true;
  }
  host::AtomicFile file(VORN_PATH_FLEET);
  if (file.fd() >= 0 && host::write_all(file.fd(), "# The fleet's engine; see fleet.conf(5).\n") &&
      file.commit()) {
    return true;
  }
  host::log_line(VORN_PATH_FLEET " can't be made (%s)", std::strerror(errno));
  return false;
}

void apply(const Changes& changes, std::vector<std::pair<std::string, std::string>>& entries) {
  for (const auto& [key, value] : changes) {
    const std::string& name = key;
    std::erase_if(entries, [&](const auto& entry) { return entry.first == name; });
    if (value) {
      entries.emplace_back(key, *value);
    }
  }
}

}  // namespace

bool set_fleet(const Changes& changes) {
  if (!make_if_missing()) {
    return false;
  }
  const auto before = read_section(VORN_PATH_FLEET, host::kFleetSection);
  auto entries = before ? before->entries : std::vector<std::pair<std::string, std::string>>{};
  apply(changes, entries);
  host::FleetReading reading = host::fleet_conf_of(entries);
  if (!reading.conf) {
    return tell(reading.problem);
  }
  host::Engine engine(*reading.conf);
  for (std::size_t node = 0; node < engine.nodes(); ++node) {
    if (!engine.execute(node, "select 1")) {
      return tell(engine.problem() + "; nothing is changed");
    }
  }
  return before ? change_section(VORN_PATH_FLEET, host::kFleetSection, changes)
                : add_section(VORN_PATH_FLEET, host::kFleetSection, changes);
}

bool init_fleet() {
  const auto conf = configuration();
  if (!conf) {
    return false;
  }
  host::Engine engine(*conf);
  host::FleetListing listing;
  return tell(host::make_tables(engine)) && tell(host::list_runs(engine, listing)) &&
         tell(host::drop_old_runs(engine, listing));
}

std::optional<std::vector<FleetRun>> fleet_runs(std::int64_t now) {
  const auto conf = configuration();
  if (!conf) {
    return std::nullopt;
  }
  host::Engine engine(*conf);
  host::FleetListing listing;
  if (!tell(host::list_runs(engine, listing))) {
    return std::nullopt;
  }
  tell(host::drop_old_runs(engine, listing));  // which takes nothing from the answer
  std::vector<FleetRun> told;
  for (const host::FleetRun& run : host::newest_runs(listing)) {
    told.push_back({run.server, run.profile, run.started, run.finished, run.files, run.bytes,
                    report_format::is_overdue(run.started, run.interval, now)});
  }
  return told;
}

bool rename_fleet_runs(const std::string& from, const std::string& to) {
  const host::FleetReading reading = host::read_fleet_conf();
  if (!reading.conf) {
    return tell(reading.problem);
  }
  host::Engine engine(*reading.conf);
  return tell(host::rename_runs(engine, from, to));
}

bool forget_server(const std::string& server, const std::string& profile) {
  const auto conf = configuration();
  if (!conf) {
    return false;
  }
  host::Engine engine(*conf);
  std::size_t dropped = 0;
  return tell(host::drop_server(engine, server, profile, dropped)) &&
         (dropped > 0 || tell("the fleet has no rows of " +
                              (profile.empty() ? "" : "profile " + profile + " of ") + "server " +
                              server + "; vornctl fleet status lists its servers"));
}

}  // namespace admin
