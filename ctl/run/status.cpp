// vornctl status: how the profiles are doing.
#include <CLI/CLI.hpp>
#include <cstdio>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/ctl.hpp"
#include "report_format/facts_file.hpp"
#include "run/profile_state.hpp"
#include "schedule/schedules.hpp"

namespace ctl {
namespace {

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
  RunState state = RunState::unknown;
  std::string last_report;  // path of the page; empty when there is none
  std::time_t made = 0;
  std::uint64_t size = 0;
  std::optional<NextRun> next;
  std::optional<report_format::VolumeFacts> volume;  // the most pressing
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
  const std::string folder = report_folder(profile);
  if (const auto report = newest_whole(reports_in(folder, host::ReportSize::measured))) {
    const std::string place = folder + "/" + report->name;
    status.last_report = place + "/report.html";
    status.made = report->made;
    status.size = report->size;
    if (const auto facts = report_format::read_facts(place); facts && !facts->volumes.empty()) {
      status.volume = facts->volumes.front();
    }
  }
} catch (const Failure& failure) {
  warn(failure.what());
}

ProfileStatus status_of(const Section& profile, const std::vector<Job>& jobs, std::time_t now) {
  ProfileStatus status;
  status.name = profile.name;
  status.state = run_state(profile.name);
  status.next = next_of(profile.name, jobs, now);
  add_report(profile, status);
  return status;
}

nlohmann::ordered_json json_of(const report_format::VolumeFacts& volume) {
  nlohmann::ordered_json json{
      {"volume", volume.path}, {"percent", volume.percent}, {"days_to_full", nullptr}};
  if (volume.forecast.days) {
    json["days_to_full"] = *volume.forecast.days;
  }
  return json;
}

void print_as_json(const std::vector<ProfileStatus>& all) {
  auto array = nlohmann::ordered_json::array();
  for (const ProfileStatus& status : all) {
    nlohmann::ordered_json entry{{"profile", status.name}, {"status", word_for(status.state)}};
    entry["last_report"] = nullptr;
    entry["next_run"] = nullptr;
    entry["fullest_volume"] = nullptr;
    if (!status.last_report.empty()) {
      entry["last_report"] = {
          {"path", status.last_report}, {"made", json_time(status.made)}, {"bytes", status.size}};
    }
    if (status.next) {
      entry["next_run"] = {{"time", json_time(status.next->time)},
                           {"kind", status.next->kind == JobKind::report ? "report" : "data"}};
    }
    if (status.volume) {
      entry["fullest_volume"] = json_of(*status.volume);
    }
    array.push_back(std::move(entry));
  }
  print_json(array);
}

std::string volume_text(const report_format::VolumeFacts& volume) {
  char percent[32];
  std::snprintf(percent, sizeof percent, "%.0f %%", volume.percent);
  return std::string(percent) + " of " + volume.path;
}

std::string days_text(const report_format::VolumeFacts& volume) {
  using enum report_format::ForecastState;
  switch (volume.forecast.state) {
    case kFull:
      return "full";
    case kGrowing:
      return volume.forecast.days ? std::to_string(*volume.forecast.days) : "-";
    case kShrinking:
    case kSteady:
      return "not filling";
    case kShort:
      break;
  }
  return "-";
}

void print_as_table(const std::vector<ProfileStatus>& all) {
  Table table({{"PROFILE"},
               {"STATUS"},
               {"LAST REPORT"},
               {"SIZE", Table::Align::right},
               {"NEXT RUN"},
               {"FULLEST VOLUME"},
               {"DAYS TO FULL", Table::Align::right}});
  for (const ProfileStatus& status : all) {
    const bool reported = !status.last_report.empty();
    std::string next = status.next ? time_text(status.next->time) : "-";
    next += status.next && status.next->kind == JobKind::data ? " (data)" : "";
    table.add({status.name, word_for(status.state), reported ? time_text(status.made) : "-",
               reported ? size_text(status.size) : "-", next,
               status.volume ? volume_text(*status.volume) : "-",
               status.volume ? days_text(*status.volume) : "-"});
  }
  if (table.empty()) {
    print_line("no profiles; add one with vornctl profile add");
  } else {
    table.print();
  }
}

void status(const Options& options) {
  std::vector<Section> profiles =
      options.profile.empty() ? read_profiles() : std::vector{read_profile(options.profile)};
  const std::vector<Job> jobs = scheduled_jobs();
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
  CLI::App* command = app.add_subcommand("status", "Show runs, reports and schedules of profiles");
  add_profile_argument(*command, options->profile)->required(false);
  add_json_flag(*command, options->json);
  command->callback([options] { status(*options); });
}

}  // namespace ctl
