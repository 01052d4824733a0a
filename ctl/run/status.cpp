// vornctl status: how the profiles are doing.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "run/commands.hpp"
#include "schedule/jobs.hpp"

namespace ctl {
namespace {

using Json = nlohmann::ordered_json;
using report_format::TextForm;

struct Options {
  std::string profile;
  bool json = false;
};

struct NextRun {
  std::time_t time = 0;
  JobKind kind = JobKind::report;
};

struct ProfileStatus {
  std::string name;
  admin::RunState state = admin::RunState::unknown;
  bool mail_failed = false;
  bool fleet_failed = false;
  std::time_t started = 0;             // the last run, 0 when that isn't known
  std::time_t begun = 0;               // the last run that was to make a report, likewise
  std::optional<std::time_t> overdue;  // since when a report is
  std::optional<admin::StoredReport> last;
  std::optional<report_format::Facts> facts;  // of that report
  std::optional<NextRun> next;
};

std::optional<NextRun> next_of(const std::string& profile, const std::vector<Job>& jobs,
                               std::time_t now) {
  std::optional<NextRun> next;
  for (const Job& job : jobs) {
    const auto time = job.profile == profile ? next_run(job, now) : std::nullopt;
    if (time && (!next || *time < next->time)) {
      next = {*time, job.kind};
    }
  }
  return next;
}

// One folder that can't be read must not hide the other profiles.
void add_report(const Section& profile, ProfileStatus& status) try {
  status.last = newest_whole(reports_in(folder_of_reports(profile), ReportSize::measured));
  if (status.last) {
    status.facts = facts_of(*status.last);
  }
} catch (const Failure& failure) {
  warn(failure.what());
}

ProfileStatus status_of(const Section& profile, const std::vector<Job>& jobs, std::time_t now) {
  ProfileStatus status;
  status.name = profile.name;
  const admin::LastRun last = admin::last_run(profile.name);
  status.state = last.state;
  status.mail_failed = last.status.mail_failed;
  status.fleet_failed = last.status.fleet_failed;
  status.started = last.status.started;
  const bool is_cut = status.state == admin::RunState::ended_early;
  status.begun = std::max(last.status.report_started, is_cut ? status.started : 0);
  if (status.state != admin::RunState::running) {
    status.overdue = admin::overdue_since(profile.name, status.begun, now);
  }
  status.next = next_of(profile.name, jobs, now);
  add_report(profile, status);
  return status;
}

// --- JSON ---------------------------------------------------------------------------------------

// What the report itself says, with the words for it.
void add_facts(Json& entry, const report_format::Facts& facts) {
  const Json all = report_format::to_json(facts);
  entry["complete"] = facts.complete;
  entry["volume"] = all["volumes"].empty() ? Json(nullptr) : all["volumes"][0];
  entry["incidents"] = all["incidents"];
  entry["attention"] = Json::array();
  for (std::size_t i = 0; i < facts.attention.size(); ++i) {
    Json told = all["attention"][i];
    told["text"] = english().attention(TextForm::plain, facts.attention[i]);
    entry["attention"].push_back(std::move(told));
  }
}

void print_as_json(const std::vector<ProfileStatus>& all) {
  Json array = Json::array();
  for (const ProfileStatus& status : all) {
    Json entry{{"profile", status.name},
               {"status", word_for(status.state)},
               {"mail_failed", status.mail_failed},
               {"fleet_failed", status.fleet_failed},
               {"started", nullptr},
               {"overdue_since", nullptr},
               {"last_report", nullptr},
               {"next_run", nullptr},
               {"complete", nullptr},
               {"volume", nullptr},
               {"incidents", Json(nullptr)},
               {"attention", Json(nullptr)}};
    if (status.started > 0) {
      entry["started"] = json_time(status.started);
    }
    if (status.overdue) {
      entry["overdue_since"] = json_time(*status.overdue);
    }
    if (status.last) {
      entry["last_report"] = json_of(*status.last, status.facts);
    }
    if (status.next) {
      entry["next_run"] = {{"time", json_time(status.next->time)},
                           {"kind", status.next->kind == JobKind::report ? "report" : "data"}};
    }
    if (status.facts) {
      add_facts(entry, *status.facts);
    }
    array.push_back(std::move(entry));
  }
  print_json(array);
}

// --- Text ---------------------------------------------------------------------------------------

std::string volume_text(const std::optional<report_format::Facts>& facts) {
  if (!facts || facts->volumes.empty()) {
    return "-";
  }
  const report_format::VolumeFacts& volume = facts->volumes.front();
  return volume.path + ", " + english().percent(volume.percent);
}

std::string outlook_text(const std::optional<report_format::Facts>& facts) {
  return facts && !facts->volumes.empty()
             ? english().outlook(TextForm::plain, facts->volumes.front())
             : "-";
}

// What the last reports have to tell, a line each: that they didn't come, what they lack, then what
// needs attention.
void print_remarks(const ProfileStatus& status) {
  if (status.state == admin::RunState::ended_early && status.started > 0) {
    print_line(status.name + ": the run of " + time_text(status.started) + " didn't finish");
  }
  if (status.state == admin::RunState::failed) {
    print_line(status.name + ": the last run failed; vornctl log " + status.name +
               " says why, vornctl doctor what to do");
  }
  if (status.overdue) {
    print_line(status.name + ": " + overdue_text(status.begun, *status.overdue) +
               "; run vornctl doctor");
  }
  if (status.mail_failed) {
    print_line(status.name + ": " + unsent_mail(status.name));
  }
  if (status.fleet_failed) {
    print_line(status.name + ": " + missing_from_fleet(status.name));
  }
  if (!status.facts) {
    return;
  }
  for (const report_format::Incident& incident : status.facts->incidents) {
    print_line(status.name + ": " + english().incident(TextForm::plain, incident));
  }
  for (const report_format::Attention& entry : status.facts->attention) {
    if (entry.level != report_format::Level::kOk) {
      print_line(status.name + ": " + english().attention(TextForm::plain, entry));
    }
  }
}

void print_as_table(const std::vector<ProfileStatus>& all) {
  Table table({{"PROFILE"},
               {"STATUS"},
               {"LAST REPORT"},
               {"SIZE", Table::Align::right},
               {"NEXT RUN"},
               {"MOST PRESSING VOLUME"},
               {"OUTLOOK"}});
  for (const ProfileStatus& status : all) {
    std::string next = status.next ? time_text(status.next->time) : "-";
    next += status.next && status.next->kind == JobKind::data ? " (data)" : "";
    table.add({status.name, word_for(status.state),
               status.last ? time_text(status.last->made) : "-",
               status.last ? size_text(status.last->size) : "-", next, volume_text(status.facts),
               outlook_text(status.facts)});
  }
  if (table.empty()) {
    warn("there are no profiles; add one with vornctl profile add NAME");
    return;
  }
  table.print();
  for (const ProfileStatus& status : all) {
    print_remarks(status);
  }
}

void status(const Options& options) {
  std::vector<Section> profiles =
      options.profile.empty() ? read_profiles() : std::vector{read_profile(options.profile)};
  const std::vector<Job> jobs = admin::scheduled_jobs();
  const std::time_t now = std::time(nullptr);
  // What is collected for the whole server is of interest once it has times of its own.
  if (options.profile.empty() && next_of("global", jobs, now) && profile_exists("global")) {
    profiles.push_back(read_profile("global"));
  }
  std::vector<ProfileStatus> all;
  all.reserve(profiles.size());
  for (const Section& profile : profiles) {
    all.push_back(status_of(profile, jobs, now));
  }
  options.json ? print_as_json(all) : print_as_table(all);
}

}  // namespace

void add_status_command(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* command = app.add_subcommand(
      "status", "Print how profiles are doing: last run, newest report, next run");
  add_profile_argument(*command, options->profile)->required(false);
  add_json_flag(*command, options->json);
  command->callback([options] { status(*options); });
}

}  // namespace ctl
