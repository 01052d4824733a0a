#include "schedule/jobs.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <exception>

#include "base/ask_program.hpp"
#include "base/ctl.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/cron_times.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/base/words.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

// What systemd says of a timer's next run.
std::optional<std::time_t> asked_of_systemd(const Job& job) try {
  constexpr std::chrono::seconds kLimit{5};
  const auto answer =
      ask_program({"/usr/bin/systemctl", "show", "--timestamp=unix", "--value",
                   "--property=NextElapseUSecRealtime", admin::timer_of(job.kind, job.profile)},
                  kLimit);
  std::time_t time = 0;
  if (!answer || !answer->out.starts_with('@')) {
    return std::nullopt;
  }
  const char* end = answer->out.data() + answer->out.size();
  return std::from_chars(answer->out.data() + 1, end, time).ec == std::errc{} ? std::optional(time)
                                                                              : std::nullopt;
} catch (const Failure&) {
  return std::nullopt;
}

}  // namespace

const char* option_of(JobKind kind) {
  return kind == JobKind::report ? "--report" : "--data";
}

const char* word_for(Scheduler scheduler) {
  return scheduler == Scheduler::cron ? "cron" : "timer";
}

std::string times_text(const Job& job) {
  return job.times.empty() ? "as its unit says" : job.times;
}

void check_runs_only(const std::string& profile, const std::string& file, std::string_view text) {
  bool only = true;
  host::each_line(text, [&](std::string_view line) {
    const std::string_view text_of_line = host::trimmed(line);
    const auto jobs = admin::jobs_in({}, line);
    only = only && (text_of_line.empty() || text_of_line.front() == '#' ||
                    (!jobs.empty() && jobs.front().profile == profile));
  });
  if (!only) {
    throw Failure(file + " holds other jobs than those of profile " + profile +
                  "; move them to a file of their own");
  }
}

std::optional<std::time_t> next_run(const Job& job, std::time_t now) try {
  return job.times.empty() && job.by == Scheduler::timer ? asked_of_systemd(job)
                                                         : host::CronTimes(job.times).next(now);
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

}  // namespace ctl
