#include "schedule/jobs.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>
#include <filesystem>
#include <set>

#include "base/ctl.hpp"
#include "schedule/cron_times.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// Takes the first word off `text`.
std::string_view take_word(std::string_view& text) {
  text = host::trimmed(text);
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
  line = host::trimmed(line);
  if (is_comment(line)) {
    return std::nullopt;
  }
  Job job{file, JobKind::report, {}, take_times(line)};
  take_word(line);  // the user
  // The program may stand behind others: a test that it is there, nice, ionice, flock...
  for (std::string_view before; !line.empty();) {
    const std::string_view word = take_word(line);
    if (before == kProgram && (word == "--report" || word == "--data")) {
      job.kind = word == "--data" ? JobKind::data : JobKind::report;
      job.profile = take_word(line);
      break;
    }
    before = word;
  }
  return job.profile.empty() ? std::nullopt : std::optional(std::move(job));
}

template <typename Visit>
void each_line(std::string_view text, Visit visit) {
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find('\n', start), text.size());
    visit(text.substr(start, end - start));
    start = end + 1;
  }
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
  if (const auto text = host::read_file(file, kLargestCronFile)) {
    for (Job& job : jobs_in(file, *text)) {
      jobs.push_back(std::move(job));
    }
  }
}

}  // namespace

const char* option_of(JobKind kind) {
  return kind == JobKind::report ? "--report" : "--data";
}

std::vector<Job> jobs_in(const std::string& file, std::string_view text) {
  std::vector<Job> jobs;
  each_line(text, [&](std::string_view line) {
    if (auto job = job_in(file, line)) {
      jobs.push_back(std::move(*job));
    }
  });
  return jobs;
}

void check_runs_only(const std::string& profile, const std::string& file, std::string_view text) {
  bool only = true;
  each_line(text, [&](std::string_view line) {
    const auto job = job_in({}, line);
    only = only && (is_comment(host::trimmed(line)) || (job && job->profile == profile));
  });
  if (!only) {
    throw Failure(file + " holds other jobs than those of profile " + profile +
                  "; move them to a file of their own");
  }
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
  return jobs;
}

std::optional<std::time_t> next_run(const Job& job, std::time_t now) try {
  return CronTimes(job.times).next(now);
} catch (const std::exception&) {
  return std::nullopt;
}

std::string cron_file_problem(const std::string& file) {
  struct stat status {};
  if (lstat(file.c_str(), &status) != 0) {
    return errno == ENOENT ? "is missing" : std::strerror(errno);
  }
  if (!S_ISREG(status.st_mode)) {
    return "is no regular file";
  }
  if (status.st_uid != 0) {
    return "doesn't belong to root";
  }
  if ((status.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
    return "can be written by others than its owner";
  }
  const auto text = host::read_file(file, kLargestCronFile);
  return text && !text->empty() && !text->ends_with('\n') ? "has no line end at its end" : "";
}

std::string remove_cron_file(const Section& profile) {
  const std::string id = profile.value(kScheduleKey);
  if (id.empty()) {
    return "";
  }
  if (!admin::is_schedule_id(id)) {
    throw Failure("profile " + profile.name + ": " + kScheduleKey + " = " + id +
                  " is no schedule identifier; unset it with vornctl profile set");
  }
  std::string path = admin::schedule_file(id);
  check_runs_only(profile.name, path, host::read_file(path, kLargestCronFile).value_or(""));
  if (unlink(path.c_str()) != 0 && errno != ENOENT) {
    throw Failure(path + " can't be removed (" + std::strerror(errno) + "); run this as root");
  }
  return path;
}

}  // namespace ctl
