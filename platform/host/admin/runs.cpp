#include "vorn/admin/runs.hpp"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstring>

#include "admin/section_hash.hpp"
#include "base/host_log.hpp"
#include "config/profile.hpp"
#include "outcome/metrics.hpp"
#include "run/run_lock.hpp"
#include "run/run_paths.hpp"
#include "vorn/admin/history.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"
#include "vorn/report.h"

namespace admin {
namespace {

constexpr std::size_t kLargestFile = 4096;

std::string status_file(const std::string& profile) {
  return VORN_PATH_STATUS "/" + profile;
}

std::string lock_file(const std::string& profile) {
  return VORN_PATH_STATUS "/." + profile + ".lock";
}

pid_t holder_of(const std::string& profile) {
  const auto text = host::read_file(lock_file(profile), kLargestFile);
  pid_t pid = 0;
  if (text) {
    std::from_chars(text->data(), text->data() + text->size(), pid);
  }
  return pid;
}

RunState state_of(const std::string& profile, const report_format::RunStatus& status) {
  if (status.word == report_format::kSuccess) {
    return RunState::succeeded;
  }
  if (!report_format::was_cut(status)) {
    return RunState::failed;
  }
  // "global" keeps this word when all went well.
  struct stat stored {};
  const bool has_collected = profile == "global" &&
                             stat(status_file(profile).c_str(), &stored) == 0 &&
                             samples_since(profile, stored.st_mtime) > 0;
  return has_collected ? RunState::succeeded : RunState::ended_early;
}

// Without paths only what needs no configuration is removed.
bool clean_up(const Section& profile) {
  VLIBCSzHash hash = hash_of(profile);
  VLIBCSzHash* keys = &hash;
  const char* name = profile.name.c_str();
  const bool is_placed = VornQazInitRealPath(name, &keys, 0) == 0;
  return VornQazReportCleanTmp(name, is_placed ? keys : nullptr) == 0 && is_placed;
}

}  // namespace

LastRun last_run(const std::string& profile) {
  LastRun run;
  const bool is_running = host::held_by_other(profile);
  const auto text = host::read_file(status_file(profile), kLargestFile);
  const bool is_missing = !text && errno == ENOENT;
  if (text) {
    run.status = report_format::status_of(*text);
  }
  if (is_running) {
    run.state = RunState::running;
    run.process = holder_of(profile);
  } else if (text) {
    run.state = state_of(profile, run.status);
  } else if (is_missing) {
    run.state = RunState::never_ran;
  }
  return run;
}

std::string metrics_file_problem(const std::string& value) {
  const char* error = host::metrics_file_error(value);
  if (error != nullptr) {
    return error;
  }
  const std::string problem = host::metrics_file_problem(value);
  return problem.empty() ? "" : "can't be written: " + problem;
}

std::optional<RunTrace> last_trace(const std::string& profile) {
  const auto taken = host::last_taken_for_run(profile);
  if (!taken) {
    return std::nullopt;
  }
  RunTrace trace{taken->process, taken->time, std::nullopt};
  struct stat stored {};
  if (!host::held_by_other(profile) && stat(status_file(profile).c_str(), &stored) == 0) {
    trace.ended = stored.st_mtime;
  }
  return trace;
}

std::optional<report_format::Progress> read_progress(const std::string& profile) {
  if (!host::held_by_other(profile)) {
    return std::nullopt;  // a killed run leaves what it has told
  }
  const auto text = host::read_file(VORN_PATH_PROGRESS "/" + profile, kLargestFile);
  return text ? report_format::progress_of(*text) : std::nullopt;
}

Hold hold_profile(const std::string& profile) {
  switch (host::take_profile(profile, host::TakeFor::administration)) {
    case host::TakeResult::taken:
      return Hold::taken;
    case host::TakeResult::busy:
      return Hold::running;
    case host::TakeResult::failed:
      break;
  }
  return Hold::failed;
}

bool end_killed_run(const Section& profile) {
  const bool is_clean = clean_up(profile);
  return VornQazStatusUpdate(profile.name.c_str(), report_format::kFail) == 0 && is_clean;
}

bool forget_runs(const Section& profile) {
  const bool is_clean = clean_up(profile);
  unlink(status_file(profile.name).c_str());
  return is_clean;
}

bool move_status(const std::string& profile, const std::string& to) {
  // Who holds it goes on doing so, by the other name; without it only its last run isn't known.
  std::rename(lock_file(profile).c_str(), lock_file(to).c_str());
  if (std::rename(status_file(profile).c_str(), status_file(to).c_str()) == 0 || errno == ENOENT) {
    return true;
  }
  host::log_line("the status of profile \"%s\" can't be renamed (%s); run this as root",
                 profile.c_str(), std::strerror(errno));
  return false;
}

std::optional<std::vector<std::string>> leftovers_of(const Section& profile) {
  const auto dir = host::report_dir(profile.name.c_str(), hash_of(profile));
  auto left = dir ? host::unfinished_reports(*dir + "/" + profile.name) : std::nullopt;
  if (const std::string file = host::statistics_path(profile.name);
      left && access(file.c_str(), F_OK) == 0) {
    left->push_back(file);
  }
  return left;
}

bool is_schedule_id(std::string_view id) {
  return host::valid_schedule_id(id);
}

std::string schedule_file(const std::string& id) {
  return host::schedule_file(id);
}

}  // namespace admin
