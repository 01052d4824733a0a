// vornctl status: how the profiles are doing.
#include <CLI/CLI.hpp>
#include <memory>
#include <nlohmann/json.hpp>

#include "ctl.hpp"
#include "profile_state.hpp"
#include "schedules.hpp"

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
  std::optional<FullestVolume> fullest;
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
    status.last_report = folder + "/" + report->name + "/report.html";
    status.made = report->made;
    status.size = report->size;
    status.fullest = fullest_volume(folder + "/" + report->name);
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
      auto& volume = entry["fullest_volume"];
      volume = {{"volume", status.fullest->volume},
                {"percent", std::strtod(status.fullest->percent.c_str(), nullptr)}};
      volume["days_to_full"] = nullptr;
      if (!status.fullest->days.empty()) {
        volume["days_to_full"] = std::strtoll(status.fullest->days.c_str(), nullptr, 10);
      }
    }
    array.push_back(std::move(entry));
  }
  print_json(array);
}

std::string volume_text(const FullestVolume& volume) {
  char percent[32];
  std::snprintf(percent, sizeof percent, "%.0f %%", std::strtod(volume.percent.c_str(), nullptr));
  return std::string(percent) + " of " + volume.volume;
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
               status.fullest && !status.fullest->days.empty() ? status.fullest->days : "-"});
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
