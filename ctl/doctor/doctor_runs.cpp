// How runs are started, and what the last ones have left.
#include <unistd.h>

#include <algorithm>
#include <exception>
#include <filesystem>
#include <fstream>

#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "base/texts.hpp"
#include "doctor/doctor.hpp"
#include "schedule/removal.hpp"
#include "schedule/timers.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/cron_times.hpp"

namespace ctl {
namespace {

using admin::RunState;

bool cron_is_running() {
  std::error_code error;
  for (const auto& process : std::filesystem::directory_iterator("/proc", error)) {
    std::ifstream file(process.path() / "comm");
    std::string name;
    if (std::getline(file, name) && (name == "cron" || name == "crond")) {
      return true;
    }
  }
  return false;
}

void check_timer(Findings& findings, const Job& job, const std::string& subject) {
  const std::string timer = admin::timer_of(job.kind, job.profile);
  const auto next = next_run(job, std::time(nullptr));
  if (!systemd_runs()) {
    findings.add(Level::error, subject, "systemd doesn't run this machine, so nothing is started",
                 "use cron: vornctl schedule " + job.profile + " --cron");
  } else if (!is_active(timer)) {
    findings.add(Level::error, subject, "it is enabled but not started",
                 "run systemctl start " + timer);
  } else {
    findings.ok(subject, std::string(option_of(job.kind)) + " " + job.profile +
                             (next ? ", next at " + time_text(*next) : ""));
  }
}

void check_job(Findings& findings, const Job& job, const Configuration& configuration) {
  const std::string subject = "schedule " + job.file;
  const auto& profiles = configuration.profiles;
  const bool known = job.profile == "global" ||
                     std::any_of(profiles.begin(), profiles.end(), [&](const Section& profile) {
                       return profile.name == job.profile;
                     });
  if (!known) {
    findings.add(Level::warning, subject, "profile " + job.profile + " doesn't exist",
                 removal_of(job));
    return;
  }
  if (job.by == Scheduler::timer) {
    check_timer(findings, job, subject);
    return;
  }
  try {
    const auto next = host::CronTimes(job.times).next(std::time(nullptr));
    findings.ok(subject, std::string(option_of(job.kind)) + " " + job.profile + ", next at " +
                             (next ? time_text(*next) : "the machine's start"));
  } catch (const std::exception& wrong) {
    findings.add(Level::error, subject, wrong.what(),
                 "correct the line; cron leaves the whole file out");
  }
}

// What a killed run has left; nothing about a report_dir that can't be worked with, which has its
// finding.
void check_leftovers(Findings& findings, const Section& profile) {
  std::string folder;
  try {
    folder = folder_of_reports(profile);
  } catch (const Failure&) {
    return;
  }
  const auto left = admin::leftovers_of(profile);
  if (!left) {
    findings.add(Level::error, "reports of " + profile.name,
                 host_failure(folder + " can't be used; see who owns it").what());
  } else if (!left->empty()) {
    findings.add(Level::warning, "leftovers of " + profile.name, left->front(),
                 "the next run removes them, or " + std::string(kProgram) + " --clean " +
                     profile.name + ", which removes the schedule as well");
  }
}

}  // namespace

void check_schedules(Findings& findings, const Configuration& configuration) {
  const std::vector<Job> jobs = admin::scheduled_jobs();
  std::string checked;
  const bool uses_cron = std::any_of(jobs.begin(), jobs.end(),
                                     [](const Job& job) { return job.by == Scheduler::cron; });
  for (const Job& job : jobs) {
    check_job(findings, job, configuration);
    if (job.by == Scheduler::timer) {
      continue;
    }
    if (const std::string problem = cron_file_problem(job.file);
        !problem.empty() && checked != job.file) {
      findings.add(Level::error, "schedule " + job.file,
                   "it " + problem + ", so cron leaves it out", "run vornctl schedule again");
    }
    checked = job.file;
  }
  for (const Section& profile : configuration.profiles) {
    const std::string id = profile.value(kScheduleKey);
    if (!id.empty() && access(admin::schedule_file(id).c_str(), F_OK) != 0) {
      findings.add(Level::warning, "schedule of " + profile.name,
                   admin::schedule_file(id) + " is missing",
                   "run vornctl schedule " + profile.name + " with its times, or with --clean");
    }
  }
  for (const Section& profile : configuration.profiles) {
    for (const std::string& problem : service_problems(profile)) {
      findings.add(Level::error, "service " + admin::service_of(JobKind::report, profile.name),
                   problem);
    }
    const bool is_scheduled = std::any_of(jobs.begin(), jobs.end(), [&](const Job& job) {
      return job.profile == profile.name && job.kind == JobKind::report;
    });
    if (!is_scheduled) {
      findings.add(Level::warning, "schedule of " + profile.name, "nothing makes its reports",
                   "run vornctl schedule " + profile.name + " --report @weekly");
    }
  }
  if (uses_cron && cron_is_running()) {
    findings.ok("cron", "it runs");
  } else if (uses_cron) {
    findings.add(Level::error, "cron", "it does not run, so nothing is started",
                 "install the package cron or start it: systemctl enable --now cron");
  }
}

namespace {

// What the last report says that it lacks.
void check_last_report(Findings& findings, const Section& profile) try {
  const auto report = newest_whole(reports_in(folder_of_reports(profile), ReportSize::left_out));
  const auto facts = report ? facts_of(*report) : std::nullopt;
  for (const report_format::Incident& incident :
       facts ? facts->incidents : std::vector<report_format::Incident>{}) {
    const bool is_error = incident.level == report_format::IncidentLevel::kError;
    findings.add(is_error ? Level::error : Level::warning, "last report of " + profile.name,
                 incident.text);
  }
} catch (const Failure&) {
  // Other checks tell of a folder that can't be read.
}

}  // namespace

void check_last_runs(Findings& findings, const Configuration& configuration) {
  for (const Section& profile : configuration.profiles) {
    const std::string subject = "last run of " + profile.name;
    const admin::LastRun last = admin::last_run(profile.name);
    const RunState state = last.state;
    if (last.status.mail_failed) {
      findings.add(Level::warning, subject, unsent_mail(profile.name));
    }
    if (last.status.fleet_failed) {
      findings.add(Level::warning, subject, missing_from_fleet(profile.name));
    }
    const bool is_cut = state == RunState::ended_early;
    const std::time_t begun =
        std::max(last.status.report_started, is_cut ? last.status.started : 0);
    if (const auto due = admin::overdue_since(profile.name, begun, std::time(nullptr));
        due && state != RunState::running) {
      findings.add(Level::warning, "reports of " + profile.name, overdue_text(begun, *due),
                   "see that cron or the timer runs, and look into vornctl log " + profile.name);
    }
    if (state == RunState::failed || state == RunState::ended_early) {
      findings.add(
          Level::warning, subject, word_for(state),
          "look into vornctl log " + profile.name + ", then run vornctl run " + profile.name);
    } else {
      findings.ok(subject, word_for(state));
    }
    check_last_report(findings, profile);
    if (state != RunState::running) {  // what it has begun is no left-over
      check_leftovers(findings, profile);
    }
  }
}

}  // namespace ctl
