#include "fleet_action.hpp"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <map>
#include <optional>
#include <set>
#include <string_view>
#include <utility>
#include <vector>

#include "actions.hpp"
#include "facts/fleet_facts.hpp"
#include "facts/run_facts.hpp"
#include "module.hpp"
#include "out_of_memory.hpp"
#include "report_format/fleet.hpp"
#include "report_format/reports.hpp"
#include "shell.hpp"
#include "sigterm.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"
#include "vornreport/error_log.hpp"
#include "vornreport/fleet_source.hpp"
#include "vornreport/registry.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

using report_format::fleet_literal;

constexpr char kProfile[] = "fleet";  // on the page, and in the facts

void complain(const std::string& text) {
  std::fprintf(stderr, "vornfleet: %s\n", report_format::facts_text(text).c_str());
}

// --- Which runs ----------------------------------------------------------------------------------

struct Run {
  std::string server, profile;
  uint64_t number = 0;
  int64_t started = 0, interval = 0;
  bool is_ahead = false, has_shared_number = false;
};

int add_run(void* context, int columns, char** values, char** /*names*/) noexcept {
  enum Column { kServer, kProfileName, kNumber, kStarted, kInterval, kAhead, kShared, kCount };
  if (columns != kCount || values[kServer] == nullptr || values[kProfileName] == nullptr) {
    return -1;
  }
  static_cast<std::vector<Run>*>(context)->push_back(
      {values[kServer], values[kProfileName], std::strtoull(values[kNumber], nullptr, 10),
       std::strtoll(values[kStarted], nullptr, 10), std::strtoll(values[kInterval], nullptr, 10),
       *values[kAhead] == '1', *values[kShared] == '1'});
  return 0;
}

std::set<std::string, std::less<>> words_of(std::string_view list) {
  std::set<std::string, std::less<>> words;
  while (!list.empty()) {
    std::string_view word = list.substr(0, list.find(','));
    list.remove_prefix(std::min(word.size() + 1, list.size()));
    word.remove_prefix(std::min(word.find_first_not_of(' '), word.size()));
    word = word.substr(0, word.find_last_not_of(' ') + 1);
    if (!word.empty()) {
      words.emplace(word);
    }
  }
  return words;
}

// The newest complete ones of the servers asked for, by server, the newest first; none, after a
// complaint, when one has none. What doesn't count for its clock is told.
std::vector<Run> choose_runs(VORNFleet* fleet, const std::string& servers) {
  std::vector<Run> listed;
  if (VORNFleetRuns(fleet, add_run, &listed) < 0) {
    complain(VORNFleetProblem(fleet));
    return {};
  }
  std::vector<Run> runs;
  for (const Run& run : listed) {
    if (run.is_ahead) {
      record_incident("server_overdue", run.server,
                      "server " + run.server + " (" + run.profile +
                          ") sent a run from the future, which doesn't count; set its clock",
                      AlreadyLogged::kYes);
    } else if (runs.empty() || runs.back().server != run.server ||
               runs.back().profile != run.profile) {
      runs.push_back(run);
    }
  }
  std::stable_sort(runs.begin(), runs.end(), [](const Run& one, const Run& other) {
    return one.server == other.server ? one.number > other.number : one.server < other.server;
  });
  const auto wanted = words_of(servers);
  std::set<std::string, std::less<>> found;
  std::erase_if(runs, [&](const Run& run) {
    found.insert(run.server);
    return !wanted.empty() && !wanted.contains(run.server);
  });
  for (const std::string& name : wanted) {
    if (!found.contains(name)) {
      complain("the fleet has no complete run of server " + name +
               "; vornctl fleet status lists its servers");
      return {};
    }
  }
  if (runs.empty()) {
    complain("the fleet has no complete run; set fleet = true in a profile and run it");
  }
  return runs;
}

std::string key_of(const Run& run) {
  return "(" + fleet_literal(run.server) + ", " + fleet_literal(run.profile) + ", " +
         std::to_string(run.number) + ")";
}

// Their numbers pick the rows in a tenth of the time, as long as nobody else's have them.
std::string condition_of(const std::vector<Run>& runs) {
  const bool by_number =
      std::none_of(runs.begin(), runs.end(), [](const Run& run) { return run.has_shared_number; });
  std::string keys;
  for (const Run& run : runs) {
    keys += (keys.empty() ? "" : ", ") + (by_number ? std::to_string(run.number) : key_of(run));
  }
  return (by_number ? "run in (" : "(server, profile, run) in (") + keys + ")";
}

// Whether all that a report was made of is still there, and nothing else by its numbers, or it says
// that it isn't.
bool still_stand(VORNFleet* fleet, const std::vector<Run>& runs) {
  std::vector<Run> listed;
  if (VORNFleetRuns(fleet, add_run, &listed) < 0) {
    complain(VORNFleetProblem(fleet));
    return false;
  }
  std::map<std::string, Run> complete;
  for (const Run& run : listed) {
    complete.emplace(key_of(run), run);
  }
  const bool all = std::all_of(runs.begin(), runs.end(), [&](const Run& run) {
    const auto found = complete.find(key_of(run));
    return found != complete.end() && found->second.has_shared_number == run.has_shared_number;
  });
  if (!all) {
    complain("a run was dropped or sent while the report was made; make it again");
  }
  return all;
}

using FactsOfRuns = std::map<std::pair<std::string, std::string>, report_format::Facts>;

int add_facts(void* context, int columns, char** values, char** /*names*/) noexcept {
  if (columns != 3 ||
      std::any_of(values, values + columns, [](const char* value) { return value == nullptr; })) {
    return -1;
  }
  if (auto facts = report_format::facts_of(values[2])) {
    (*static_cast<FactsOfRuns*>(context))[{values[0], values[1]}] = std::move(*facts);
  }
  return 0;
}

// What each run has found out, in their order; a run whose facts can't be understood fails the
// report.
std::optional<std::vector<FleetMember>> read_members(VORNFleet* fleet,
                                                     const std::vector<Run>& runs) {
  FactsOfRuns found;
  const std::string sql = "select server, profile, report from run where " + condition_of(runs);
  if (VORNFleetSelect(fleet, sql.c_str(), add_facts, &found) < 0) {
    complain(VORNFleetProblem(fleet));
    return std::nullopt;
  }
  std::vector<FleetMember> members;
  for (const Run& run : runs) {
    auto facts = found.extract({run.server, run.profile});
    if (!facts) {
      complain("the facts of server " + run.server + " can't be understood; run its profile " +
               run.profile + " again, or vornctl fleet forget it");
      return std::nullopt;
    }
    members.push_back({run.server, std::move(facts.mapped())});
  }
  return members;
}

// --- What the report says about the fleet itself -------------------------------------------------

void tell_overdue(const std::vector<Run>& runs, int64_t now) {
  for (const Run& run : runs) {
    if (report_format::is_overdue(run.started, run.interval, now)) {
      const std::string name = run.server + " (" + run.profile + ")";
      record_incident("server_overdue", name,
                      "server " + name + " is overdue: see to its runs, or vornctl fleet forget " +
                          run.server + " " + run.profile,
                      AlreadyLogged::kYes);
    }
  }
}

// A share that two profiles of a server report counts twice.
void tell_repeated_shares(const std::vector<FleetMember>& members) {
  std::set<std::string> seen;
  for (const FleetMember& member : members) {
    if (!member.facts.shares) {
      continue;
    }
    for (const report_format::ShareFacts& share : *member.facts.shares) {
      const std::string name = fleet_name(member.server, share.name);
      if (!seen.insert(name).second) {
        record_incident("share_overlap", name,
                        "share " + name +
                            " was sent by two profiles of its server, so sums count "
                            "it twice; take fleet = true from one of them, and vornctl fleet "
                            "forget what it has sent",
                        AlreadyLogged::kYes);
      }
    }
  }
}

// --- The report ----------------------------------------------------------------------------------

struct FleetRun {
  FleetSource source;
  std::vector<FleetMember> members;
  HashHandle profile, users, volumes, shares;
};

HashHandle new_hash() {
  return HashHandle(VLIBCSzHashAlloc(kPlatformSlots));
}

bool set(HashHandle& hash, const char* key, const std::string& value) {
  return with_address(hash, [&](VLIBCSzHash** raw) {
           return VLIBCSzHashSetValue(raw, key, value.c_str());
         }) == 0;
}

// By content where every server that looked for duplicates compared contents.
bool all_by_content(const std::vector<FleetMember>& members) {
  bool found = false;
  for (const FleetMember& member : members) {
    if (member.facts.duplicates) {
      found = true;
      if (!member.facts.duplicates->by_content) {
        return false;
      }
    }
  }
  return found;
}

bool prepare(const FleetOrder& order, FleetRun& run) {
  run.profile = new_hash();
  run.users = new_hash();
  run.volumes = new_hash();
  run.shares = new_hash();
  if (!run.profile || !run.users || !run.volumes || !run.shares ||
      !set(run.profile, "report_list", order.reports) ||
      !set(run.profile, "language", order.language) ||
      !set(run.profile, "duplicate_compare", all_by_content(run.members) ? "true" : "false")) {
    return false;
  }
  for (const FleetMember& member : run.members) {
    if (!member.facts.shares) {
      continue;
    }
    for (const report_format::ShareFacts& share : *member.facts.shares) {
      set(run.shares, fleet_name(member.server, share.name).c_str(), share.path);
    }
  }
  return with_address(run.profile, [&](VLIBCSzHash** hash) {
           return VORNFleetReportBegin(order.folder.c_str(), hash);
         }) == 0;
}

void run_reports(FleetRun& run, const std::string& report_list) {
  for (const ReportEntry& entry : report_registry()) {
    if (!is_selected(entry, report_list.c_str())) {
      continue;
    }
    ReportArgs args{kProfile,         run.profile.get(), run.users.get(), run.volumes.get(),
                    run.shares.get(), nullptr,           nullptr,         0,
                    &run.source};
    run_report(entry, args);
  }
}

FactsSource facts_source(const FleetOrder& order) {
  std::array<char, 256> text{};
  FactsSource source;
  source.host = VornQazGetHostName(text.data(), text.size()) < 0 ? "" : text.data();
  source.time_zone = VornQazGetTimeZone(text.data(), text.size()) < 0 ? "" : text.data();
  source.now = std::time(nullptr);
  source.report_list = order.reports;
  source.has_walked = true;
  return source;
}

// False, logged, when there is no whole page.
bool make_page(const FleetOrder& order, const std::vector<Run>& runs, FleetRun& run) {
  const PathText data_path = report_data_path();
  run_command(kDriverModule, __LINE__, VORN_PATH_TEMPLATE_SCRIPT " header %s", data_path.c_str());
  std::array<char, 8> language{};
  if (VornQazImportLang(run.profile.get(), language.data(), language.size()) < 0) {
    return false;
  }
  run_facts().language = language.data();
  run_command(kDriverModule, __LINE__, VORN_PATH_TEMPLATE_SCRIPT " lang %s %s", data_path.c_str(),
              language.data());
  run_reports(run, order.reports);
  const char* date_dir = set_value(run.profile.get(), "real_path_date");
  return date_dir != nullptr && still_stand(run.source.fleet, runs) && !report_data_lost() &&
         write_facts(fleet_facts(std::move(run.members), run_facts(), facts_source(order)),
                     date_dir, data_path.c_str()) &&
         build_report_html(kProfile, run.profile.get(), data_path.c_str()) > 0 &&
         !report_data_lost() && correct_report_dir(kProfile, run.profile.get()) == 0 &&
         !report_data_lost();
}

}  // namespace

std::string fleet_report(const FleetOrder& order) {
  end_without_memory(nullptr, nullptr);
  VornQazSetEnv();
  setup_signal(SIGTERM);
  listen_for_incidents();
  run_facts().profile = kProfile;
  run_facts().started = std::time(nullptr);
  VORNFleet* opened = nullptr;
  const int found = VORNFleetOpen(&opened);
  const FleetHandle fleet(opened);
  if (found != 0) {
    complain(found > 0 ? "no fleet is configured; run vornctl fleet set --url URL"
                       : VORNFleetProblem(fleet.get()));
    return "";
  }
  const std::vector<Run> runs = choose_runs(fleet.get(), order.servers);
  auto members = runs.empty() ? std::nullopt : read_members(fleet.get(), runs);
  if (!members) {
    return "";
  }
  FleetRun run{{fleet.get(), condition_of(runs)}, std::move(*members), {}, {}, {}, {}};
  tell_overdue(runs, run_facts().started);
  tell_repeated_shares(run.members);
  take_over_incidents(run.members);
  if (!prepare(order, run)) {
    return "";
  }
  const bool is_made = make_page(order, runs, run);
  if (VORNFleetReportEnd(is_made ? 1 : 0) < 0) {
    return "";
  }
  const char* page = set_value(run.profile.get(), "real_path_report_final");
  return page != nullptr ? page : "";
}

}  // namespace vornreport
