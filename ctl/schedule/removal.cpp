#include "schedule/removal.hpp"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/ctl.hpp"
#include "schedule/timers.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/file_io.hpp"

namespace ctl {
namespace {

std::vector<Job> jobs_of(const std::string& profile) {
  std::vector<Job> jobs = admin::scheduled_jobs();
  std::erase_if(jobs, [&](const Job& job) { return job.profile != profile; });
  return jobs;
}

// A cron file that vornctl could have written, and that runs one profile.
bool is_own_file(const Job& job) try {
  if (job.by != Scheduler::cron || !job.file.starts_with(admin::schedule_file(""))) {
    return false;
  }
  check_runs_only(job.profile, job.file, host::read_file(job.file, kLargestCronFile).value_or(""));
  return true;
} catch (const Failure&) {
  return false;
}

void remove_file(const std::string& path) {
  if (unlink(path.c_str()) != 0 && errno != ENOENT) {
    throw Failure(path + " can't be removed (" + std::strerror(errno) + "); see to its folder");
  }
}

}  // namespace

std::string remove_cron_file(const Section& profile) {
  const std::string id = profile.value(kScheduleKey);
  if (id.empty()) {
    return "";
  }
  if (!admin::is_schedule_id(id)) {
    throw Failure("profile " + profile.name + ": " + kScheduleKey + " = " + id +
                  " is no schedule identifier; run vornctl profile set " + profile.name + " " +
                  kScheduleKey + " ''");
  }
  std::string path = admin::schedule_file(id);
  check_runs_only(profile.name, path, host::read_file(path, kLargestCronFile).value_or(""));
  remove_file(path);
  return path;
}

std::vector<std::string> remove_schedule(const Section& profile) {
  std::vector<std::string> removed;
  if (std::string path = remove_cron_file(profile); !path.empty()) {
    removed.push_back(std::move(path));
  }
  for (const Job& job : jobs_of(profile.name)) {
    if (is_own_file(job)) {
      remove_file(job.file);
      removed.push_back(job.file);
    }
  }
  for (std::string& timer : remove_timers(profile.name)) {
    removed.push_back(std::move(timer));
  }
  return removed;
}

std::string removal_of(const Job& job) {
  return job.by == Scheduler::timer || is_own_file(job)
             ? "run vornctl schedule " + job.profile + " --clean"
             : "remove its line from " + job.file;
}

void warn_of_jobs(const std::string& profile) {
  for (const Job& job : jobs_of(profile)) {
    warn(job.file + " still runs profile " + profile + "; " + removal_of(job));
  }
}

}  // namespace ctl
