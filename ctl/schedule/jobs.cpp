#include "schedule/jobs.hpp"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cstring>
#include <exception>

#include "run/run_paths.hpp"
#include "schedule/cron_times.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

constexpr std::size_t kLargestCronFile = 1U << 20U;

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

bool only_runs(const std::string& profile, std::string_view text) {
  bool only = true;
  each_line(text, [&](std::string_view line) {
    const auto job = job_in({}, line);
    only = only && (is_comment(host::trimmed(line)) || (job && job->profile == profile));
  });
  return only;
}

std::vector<Job> scheduled_jobs() {
  std::vector<Job> jobs;
  append_jobs("/etc/crontab", jobs);
  const host::Fd folder(open(VORN_PATH_CRON, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  std::vector<std::string> names;
  if (folder) {
    names = host::entries_of(folder);
  }
  std::sort(names.begin(), names.end());
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

std::string cron_file(const std::string& id) {
  return VORN_PATH_CRON "/vornreport-" + id;
}

}  // namespace ctl
