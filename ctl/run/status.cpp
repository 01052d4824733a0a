// vornctl status: how the profiles are doing.
#include <CLI/CLI.hpp>
#include <cstdio>
#include <memory>
#include <nlohmann/json.hpp>

#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "run/commands.hpp"
#include "schedule/jobs.hpp"
#include "vorn/admin/figures.hpp"

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
  admin::RunState state = admin::RunState::unknown;
  std::string last_report;  // path of the page; empty when there is none
  std::time_t made = 0;
  std::uint64_t size = 0;
  std::optional<NextRun> next;
  std::optional<admin::FullestVolume> fullest;
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
  const Reports reports = reports_in(folder_of_reports(profile), ReportSize::measured);
  if (const auto report = newest_whole(reports)) {
    status.last_report = report->page;
    status.made = report->made;
    status.size = report->size;
    status.fullest = admin::fullest_volume(report->page);
  }
} catch (const Failure& failure) {
  warn(failure.what());
}

ProfileStatus status_of(const Section& profile, const std::vector<Job>& jobs, std::time_t now) {
  ProfileStatus status;
  status.name = profile.name;
  status.state = admin::last_run(profile.name).state;
  status.next = next_of(profile.name, jobs, now);
  add_report(profile, status);
  return status;
}

nlohmann::ordered_json json_of(const admin::FullestVolume& volume) {
  nlohmann::ordered_json json{
      {"volume", volume.name}, {"percent", volume.percent}, {"days_to_full", nullptr}};
  if (volume.outlook == admin::Outlook::days || volume.outlook == admin::Outlook::soon) {
    json["days_to_full"] = volume.days;
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
    if (status.fullest) {
      entry["fullest_volume"] = json_of(*status.fullest);
    }
    array.push_back(std::move(entry));
  }
  print_json(array);
}

std::string volume_text(const admin::FullestVolume& volume) {
  char percent[32];
  std::snprintf(percent, sizeof percent, "%.0f %%", volume.percent);
  return std::string(percent) + " of " + volume.name;
}

std::string days_text(const admin::FullestVolume& volume) {
  switch (volume.outlook) {
    case admin::Outlook::days:
      return std::to_string(volume.days);
    case admin::Outlook::soon:
      return "< 1";
    case admin::Outlook::no_growth:
      return "not filling";
    case admin::Outlook::unknown:
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
               status.fullest ? volume_text(*status.fullest) : "-",
               status.fullest ? days_text(*status.fullest) : "-"});
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
