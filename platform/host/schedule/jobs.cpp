#include "schedule/jobs.hpp"

#include <sys/stat.h>

#include <algorithm>
#include <exception>
#include <filesystem>
#include <set>

#include "vorn/base/cron_times.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace host {
namespace {

constexpr const char* kProgramFile = "/usr/vorn/bin/vornreport";
constexpr std::size_t kLargestCronFile = 1U << 20U;  // that is looked into
constexpr const char* kWanted = VORN_PATH_UNITS "/timers.target.wants/";

// Takes the first word off `text`.
std::string_view take_word(std::string_view& text) {
  text = trimmed(text);
  const std::string_view word = text.substr(0, text.find_first_of(" \t"));
  text.remove_prefix(word.size());
  return word;
}

// What stands before the user and the command: five fields, or one that begins with '@'.
std::string take_times(std::string_view& line) {
  constexpr int kFields = 5;
  std::string times(take_word(line));
  for (int i = 1; i < kFields && !times.starts_with('@'); ++i) {
    times.append(" ").append(take_word(line));
  }
  return times;
}

bool is_comment(std::string_view line) {
  return line.empty() || line.front() == '#';
}

std::optional<Job> job_in(const std::string& file, std::string_view line) {
  line = trimmed(line);
  if (is_comment(line)) {
    return std::nullopt;
  }
  Job job{.file = file, .times = take_times(line)};
  take_word(line);  // the user
  // The program may stand behind others: a test that it is there, nice, ionice, flock...
  for (std::string_view before; !line.empty();) {
    const std::string_view word = take_word(line);
    if (before == kProgramFile && (word == "--report" || word == "--data")) {
      job.kind = word == "--data" ? JobKind::data : JobKind::report;
      job.profile = take_word(line);
      break;
    }
    before = word;
  }
  return job.profile.empty() ? std::nullopt : std::optional(std::move(job));
}

// Debian's cron leaves out every other name, so that editors' copies and packages' leftovers don't
// run.
bool is_cron_name(std::string_view name) {
  return std::all_of(name.begin(), name.end(), [](char c) {
    return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_' ||
           c == '-';
  });
}

void append_jobs(const std::string& file, std::vector<Job>& jobs) {
  if (const auto text = read_file(file, kLargestCronFile)) {
    for (Job& job : jobs_in(file, *text)) {
      jobs.push_back(std::move(job));
    }
  }
}

// --- Timers -------------------------------------------------------------------------------------

// What vornctl and the shipped units say in a line that systemd leaves aside.
std::string times_in(const std::string& file) {
  constexpr std::size_t kLargestUnit = 65536;
  constexpr std::string_view kKey = VORN_TIMER_TIMES "=";
  std::string times;
  each_line(read_file(file, kLargestUnit).value_or(""), [&](std::string_view line) {
    if (line.starts_with(kKey)) {
      times = trimmed(line.substr(kKey.size()));
    }
  });
  return times;
}

std::vector<std::string> drop_ins(const std::string& unit) {
  std::vector<std::string> found;
  std::error_code error;
  for (const auto& entry :
       std::filesystem::directory_iterator(VORN_PATH_UNITS "/" + unit + ".d", error)) {
    if (entry.path().extension() == ".conf") {
      found.push_back(entry.path());
    }
  }
  return found;
}

// The times of a timer that nobody else has a say in.
std::string times_of(const std::string& unit) {
  const std::string shipped = unit.substr(0, unit.find('@') + 1) + ".timer";
  const std::vector<std::string> own = drop_ins(unit);
  if (!drop_ins(shipped).empty() || own.size() > 1) {
    return "";
  }
  return times_in(own.empty() ? VORN_PATH_SHIPPED_UNITS "/" + shipped : own.front());
}

void append_timers(std::vector<Job>& jobs) {
  constexpr std::string_view kEnd = ".timer";
  std::error_code error;
  std::set<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(kWanted, error)) {
    names.insert(entry.path().filename().string());
  }
  for (const std::string& name : names) {
    for (const JobKind kind : {JobKind::report, JobKind::data}) {
      const std::string begin = timer_of(kind, "").substr(0, timer_of(kind, "").find('@') + 1);
      if (name.starts_with(begin) && name.ends_with(kEnd)) {
        jobs.push_back(
            {.file = kWanted + name,
             .kind = kind,
             .profile = name.substr(begin.size(), name.size() - begin.size() - kEnd.size()),
             .times = times_of(name),
             .by = Scheduler::timer});
      }
    }
  }
}

// Since when a job is there as it is.
std::time_t written(const Job& job) {
  struct stat status {};
  const std::string own = VORN_PATH_UNITS "/" + timer_of(job.kind, job.profile) + ".d";
  std::time_t newest = lstat(job.file.c_str(), &status) == 0 ? status.st_mtime : 0;
  if (job.by == Scheduler::timer && stat(own.c_str(), &status) == 0) {
    newest = std::max(newest, status.st_mtime);
  }
  return newest;
}

}  // namespace

std::vector<Job> jobs_in(const std::string& file, std::string_view text) {
  std::vector<Job> jobs;
  each_line(text, [&](std::string_view line) {
    if (auto job = job_in(file, line)) {
      jobs.push_back(std::move(*job));
    }
  });
  return jobs;
}

std::vector<Job> scheduled_jobs() {
  std::vector<Job> jobs;
  append_jobs("/etc/crontab", jobs);
  std::error_code error;
  std::set<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(VORN_PATH_CRON, error)) {
    names.insert(entry.path().filename().string());
  }
  for (const std::string& name : names) {
    if (is_cron_name(name)) {
      append_jobs(VORN_PATH_CRON "/" + name, jobs);
    }
  }
  append_timers(jobs);
  return jobs;
}

std::string timer_of(JobKind kind, const std::string& profile) {
  return (kind == JobKind::report ? "vornreport@" : "vornreport-data@") + profile + ".timer";
}

std::string service_of(JobKind kind, const std::string& profile) {
  return (kind == JobKind::report ? "vornreport@" : "vornreport-data@") + profile + ".service";
}

std::optional<std::time_t> next_run(const Job& job, std::time_t now) try {
  return CronTimes(job.times).next(now);
} catch (const std::exception&) {
  return std::nullopt;
}

std::optional<std::time_t> overdue_since(const std::string& profile, std::time_t begun,
                                         std::time_t now) {
  constexpr std::time_t kLeast = 1800;
  constexpr std::time_t kMost = 86400;
  std::optional<std::time_t> overdue;
  for (const Job& job : scheduled_jobs()) {
    const auto due = job.profile == profile && job.kind == JobKind::report
                         ? next_run(job, std::max(begun, written(job)))
                         : std::nullopt;
    const auto following = due ? next_run(job, *due) : std::nullopt;
    if (following && now >= *due + std::clamp(*following - *due, kLeast, kMost) &&
        (!overdue || *due < *overdue)) {
      overdue = due;
    }
  }
  return overdue;
}

}  // namespace host
