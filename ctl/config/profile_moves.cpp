// vornctl profile copy and rename: a profile with all that belongs to it under another name.
//
// The section comes last but for the schedule: until it is there, no run can begin under the new
// name, and whatever ends this before can be tried again.
#include <algorithm>
#include <chrono>
#include <memory>

#include "base/ask_program.hpp"
#include "base/configuration.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "config/commands.hpp"
#include "report_format/values.hpp"
#include "schedule/removal.hpp"
#include "vorn/admin/fleet.hpp"
#include "vorn/admin/history.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

struct Move {
  std::string profile;
  std::string name;
  bool settings_only = false;
};

// The profile, held, when it can get another's name.
Section checked_profile(const Move& move) {
  check_profile_name(move.profile);
  check_profile_name(move.name);
  Section profile = read_profile(move.profile);
  if (profile_exists(move.name)) {
    throw Failure("profile \"" + move.name + "\" is there already; take another name");
  }
  hold_profile(move.profile);
  return profile;
}

std::string folder_beside(const std::string& folder, const std::string& name) {
  return folder.substr(0, folder.rfind('/') + 1) + name;
}

void copy_history(const Move& move) {
  if (!admin::copy_history(move.profile, move.name)) {
    throw host_failure("the history can't be copied");
  }
}

// --- Schedules, by the command that makes them ---------------------------------------------------

using Words = std::vector<std::string>;

// The words that give a profile the schedule that `profile` has; none without one.
Words schedule_words(const std::string& profile) {
  Words words;
  bool has_timer = false;
  for (const Job& job : admin::scheduled_jobs()) {
    if (job.profile != profile) {
      continue;
    }
    if (job.times.empty()) {
      throw Failure("the timer " + job.file + " has times that vornctl doesn't know; run vornctl " +
                    "schedule " + profile + " --clean first");
    }
    words.insert(words.end(), {option_of(job.kind), job.times});
    has_timer = has_timer || job.by == Scheduler::timer;
  }
  if (has_timer) {
    words.emplace_back("--timer");
  }
  return words;
}

void schedule(const std::string& profile, const Words& words) {
  Words command{"/usr/vorn/bin/vornctl", "schedule", profile};
  command.insert(command.end(), words.begin(), words.end());
  const auto done = ask_program(command);
  if (!done || done->status != 0) {
    throw Failure("the schedule of profile " + profile + " can't be changed: " +
                  (done ? done->error.substr(0, done->error.find('\n')) : command.front()));
  }
}

// --- copy ---------------------------------------------------------------------------------------

void copy_reports(const std::string& folder, const std::string& to) {
  constexpr std::chrono::hours kLimit{24};
  if (reports_in(folder, ReportSize::left_out).empty()) {
    return;
  }
  if (!admin::make_folder_like(folder, to)) {
    throw host_failure(to + " can't be made");
  }
  try {
    const auto done = ask_program({"cp", "-a", "--reflink=auto", "--", folder + "/.", to}, kLimit);
    if (!done || done->status != 0) {
      throw Failure("the reports can't be copied to " + to + ": " +
                    (done ? done->error.substr(0, done->error.find('\n')) : "cp is missing"));
    }
  } catch (const Failure&) {
    host::remove_tree(to);
    throw;
  }
  admin::update_index(to);  // it names the profile
}

constexpr const char* kMetricsKey = "metrics_file";

void copy_profile(const Move& move) {
  const Section profile = checked_profile(move);
  const std::string folder = folder_of_reports(profile);
  const Words words = move.settings_only ? Words{} : schedule_words(move.profile);
  if (!move.settings_only) {
    copy_reports(folder, folder_beside(folder, move.name));
    copy_history(move);
  }
  Changes entries;
  for (const auto& [key, value] : profile.entries) {
    if (key != kScheduleKey && key != kMetricsKey) {
      entries.emplace_back(key, value);
    }
  }
  add_section(VORN_PATH_CONFIG, move.name, entries);
  if (profile.find(kMetricsKey) != nullptr) {
    warn("profile " + move.name + " has no metrics_file, since each needs its own; name one with " +
         "vornctl profile set");
  }
  if (!words.empty()) {
    schedule(move.name, words);
  }
}

// --- rename -------------------------------------------------------------------------------------

void move_all(const Move& move, const Section& profile) {
  const std::string folder = folder_of_reports(profile);
  copy_history(move);
  if (!admin::move_reports(folder, folder_beside(folder, move.name)) ||
      !admin::move_status(move.profile, move.name)) {
    throw host_failure("the reports can't be moved");
  }
  change_section(VORN_PATH_CONFIG, move.profile, {{kScheduleKey, std::nullopt}}, move.name);
}

void rename_profile(const Move& move) {
  const Section profile = checked_profile(move);
  const Words words = schedule_words(move.profile);
  if (!words.empty()) {
    schedule(move.profile, {"--clean"});
  }
  try {
    move_all(move, profile);
  } catch (const Failure&) {
    if (!words.empty()) {
      schedule(move.profile, words);
    }
    throw;
  }
  if (!words.empty()) {
    schedule(move.name, words);
  }
  const bool is_forgotten = admin::forget_history(move.profile);
  const std::string* fleet = profile.find("fleet");
  if (fleet != nullptr && report_format::is_true(*fleet) &&
      !admin::rename_fleet_runs(move.profile, move.name)) {
    warn("the fleet keeps what " + move.profile +
         " has sent under this name, and counts it twice " +
         "after the next run; run vornctl fleet forget with the server's name and " + move.profile);
  }
  if (!is_forgotten) {
    throw host_failure("the history under the old name stays");
  }
  warn_of_jobs(move.profile);
}

void describe(CLI::App& command, void (*run)(const Move&), const std::shared_ptr<Move>& move) {
  add_profile_argument(command, move->profile);
  command.add_option("NAME", move->name, "The new name: A-Z a-z 0-9 . _ -")
      ->type_name("")
      ->required();
  command.callback([move, run] { run(*move); });
}

}  // namespace

void add_profile_moves(CLI::App& profile) {
  const auto copy = std::make_shared<Move>();
  CLI::App& command =
      *profile.add_subcommand("copy", "Make a profile like another, with all that it has");
  describe(command, copy_profile, copy);
  command.add_flag("--settings-only", copy->settings_only,
                   "Without its reports, history and schedule");
  describe(*profile.add_subcommand("rename", "Give a profile another name, with all that it has"),
           rename_profile, std::make_shared<Move>());
}

}  // namespace ctl
