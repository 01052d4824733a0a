#include "schedule/timers.hpp"

#include <grp.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <filesystem>

#include "base/ask_program.hpp"
#include "base/ctl.hpp"
#include "base/stored_reports.hpp"
#include "vorn/base/cron_times.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

constexpr const char* kHead = "# Written by vornctl; change it with vornctl schedule.\n";
constexpr const char* kDropIn = "/vornctl.conf";
constexpr std::array kKinds{JobKind::report, JobKind::data};
constexpr const char* kOwnPlaces = "/usr/vorn/var";  // that the services may write to anyway

// What systemctl answers. Throws a Failure with the first line of its complaint.
std::string systemctl(std::vector<std::string> arguments) {
  constexpr std::chrono::seconds kLimit{60};
  arguments.insert(arguments.begin(), "systemctl");
  const auto answer = ask_program(arguments, kLimit);
  if (!answer) {
    throw Failure("there is no systemctl on this machine; use cron, without --timer");
  }
  if (answer->status != 0) {
    const std::string line = answer->error.substr(0, answer->error.find('\n'));
    throw Failure("systemctl " + arguments[1] + " " + arguments.back() + " failed: " + line);
  }
  return answer->out;
}

void reload() {
  if (systemd_runs()) {
    systemctl({"daemon-reload"});
  }
}

// --- Drop-ins -----------------------------------------------------------------------------------

std::string drop_in_of(const std::string& unit) {
  return VORN_PATH_UNITS "/" + unit + ".d" + kDropIn;
}

void write_drop_in(const std::string& unit, const std::string& text) {
  constexpr mode_t kMode = 0644;
  constexpr mode_t kFolderMode = 0755;
  const std::string path = drop_in_of(unit);
  const std::string folder = path.substr(0, path.rfind('/'));
  const bool is_made = mkdir(folder.c_str(), kFolderMode) == 0 || errno == EEXIST;
  host::AtomicFile file(path);
  if (!is_made || file.fd() < 0 || fchmod(file.fd(), kMode) != 0 ||
      !host::write_all(file.fd(), kHead + text) || !file.commit()) {
    throw Failure(path + " can't be written (" + std::strerror(errno) + "); see to its folder");
  }
}

// True when there was one.
bool remove_drop_in(const std::string& unit) {
  const std::string path = drop_in_of(unit);
  if (unlink(path.c_str()) != 0) {
    if (errno == ENOENT) {
      return false;
    }
    throw Failure(path + " can't be removed (" + std::strerror(errno) + "); see to its folder");
  }
  rmdir(path.substr(0, path.rfind('/')).c_str());  // unless others have files in it
  return true;
}

// --- What a service may write -------------------------------------------------------------------

// A path as a word of a unit's line.
std::string unit_word(const std::string& path) {
  std::string word = "\"";
  for (const char c : path) {
    word += c == '"' || c == '\\' ? std::string("\\") + c : c == '%' ? "%%" : std::string(1, c);
  }
  return word + '"';
}

// The folders that a report run writes to and that are not the product's own.
std::vector<std::string> folders_elsewhere(const Section& profile) {
  std::vector<std::string> folders;
  const std::string metrics = profile.value("metrics_file");
  for (const std::string& folder :
       {profile.value("report_dir"), metrics.substr(0, metrics.rfind('/') + 1)}) {
    const std::string path = folder.substr(0, folder.find_last_not_of('/') + 1);
    if (!path.empty() && path != kOwnPlaces && !path.starts_with(std::string(kOwnPlaces) + "/") &&
        std::find(folders.begin(), folders.end(), path) == folders.end()) {
      folders.push_back(path);
    }
  }
  return folders;
}

bool is_private(const std::string& folder) {
  return (folder + "/").starts_with("/tmp/") || (folder + "/").starts_with("/var/tmp/");
}

// The name of a folder's group when reports in it get that group; else empty.
std::string group_for(const struct stat& folder) {
  const group* found =
      (folder.st_mode & S_ISGID) != 0 && folder.st_gid != 0 ? getgrgid(folder.st_gid) : nullptr;
  return found == nullptr ? "" : found->gr_name;
}

void write_service(const Section& profile, JobKind kind) {
  const std::string unit = admin::service_of(kind, profile.name);
  std::string text;
  if (kind == JobKind::report) {
    for (const std::string& folder : folders_elsewhere(profile)) {
      struct stat status {};
      if (is_private(folder)) {
        throw Failure(folder +
                      " would be the service's own, as all of /tmp; choose another folder");
      }
      if (stat(folder.c_str(), &status) != 0) {
        throw Failure(folder + " can't be found (" + std::strerror(errno) +
                      "), and a service can't make it; run mkdir " + folder);
      }
      text += "ReadWritePaths=" + unit_word(folder) + "\n";
      if (const std::string group = group_for(status); !group.empty()) {
        text += "SupplementaryGroups=" + group + "\n";
      }
    }
  }
  if (text.empty()) {
    remove_drop_in(unit);
  } else {
    write_drop_in(unit, "[Service]\n" + text);
  }
}

bool has_timer(const std::string& profile, JobKind kind) {
  const std::vector<Job> jobs = admin::scheduled_jobs();
  return std::any_of(jobs.begin(), jobs.end(), [&](const Job& job) {
    return job.by == Scheduler::timer && job.kind == kind && job.profile == profile;
  });
}

// Whether the value of a property of systemd's that lists paths names `folder` or one above it.
bool allows(const std::string& paths, std::filesystem::path folder) {
  for (; folder.has_relative_path(); folder = folder.parent_path()) {
    for (const char* frame : {" ", "\""}) {
      if ((" " + paths + " ").find(frame + folder.string() + frame) != std::string::npos) {
        return true;
      }
    }
  }
  return false;
}

// Whether root may, with no other right than to read everything.
bool may_write(const struct stat& folder, const std::string& groups) {
  const group* found = getgrgid(folder.st_gid);
  const bool in_group =
      folder.st_gid == 0 ||
      (found != nullptr &&
       (" " + groups + " ").find(" " + std::string(found->gr_name) + " ") != std::string::npos);
  const mode_t needed = folder.st_uid == 0 ? S_IWUSR : in_group ? S_IWGRP : S_IWOTH;
  return (folder.st_mode & needed) != 0;
}

std::string property(const std::string& unit, const char* name) {
  const std::string value = systemctl({"show", "--value", std::string("--property=") + name, unit});
  return value.substr(0, value.find('\n'));
}

}  // namespace

bool systemd_runs() {
  return access("/run/systemd/system", F_OK) == 0;
}

bool is_active(const std::string& timer) {
  const auto answer = ask_program({"systemctl", "is-active", "--quiet", timer});
  return answer && answer->status == 0;
}

void set_timer(const Section& profile, JobKind kind, const std::string& times) {
  const std::vector<std::string> calendar = host::CronTimes(times).calendar();
  if (calendar.empty()) {
    throw Failure("a timer can't stand for " + times + "; give times, or use --cron", kWrongUsage);
  }
  const std::string timer = admin::timer_of(kind, profile.name);
  const std::string shipped = VORN_PATH_SHIPPED_UNITS "/" + admin::timer_of(kind, "");
  if (access(shipped.c_str(), F_OK) != 0) {
    throw Failure(shipped + " is missing, so there can be no timer; install the product again");
  }
  write_service(profile, kind);
  // At the very time, as cron does; the shipped timer's other runs are none of this one's.
  std::string text =
      "[Timer]\n" VORN_TIMER_TIMES "=" + times + "\nRandomizedDelaySec=0\nOnCalendar=\n";
  for (const std::string& value : calendar) {
    text += "OnCalendar=" + value + "\n";
  }
  write_drop_in(timer, text);
  reload();
  systemctl({"enable", "--quiet", timer});
  if (systemd_runs()) {
    systemctl({"restart", timer});
  }
}

std::vector<std::string> remove_timers(const std::string& profile) {
  std::vector<std::string> removed;
  for (const JobKind kind : kKinds) {
    const std::string timer = admin::timer_of(kind, profile);
    const bool is_enabled = has_timer(profile, kind);
    if (is_enabled) {
      if (systemd_runs()) {
        systemctl({"stop", timer});
      }
      systemctl({"disable", "--quiet", timer});
    }
    const bool had_own = remove_drop_in(timer);
    remove_drop_in(admin::service_of(kind, profile));
    unlink(("/var/lib/systemd/timers/stamp-" + timer).c_str());
    if (is_enabled || had_own) {
      removed.push_back(timer);
    }
  }
  if (!removed.empty()) {
    reload();
  }
  return removed;
}

void refresh_services(const Section& profile) {
  if (has_timer(profile.name, JobKind::report)) {
    write_service(profile, JobKind::report);
    reload();
  }
}

std::vector<std::string> service_problems(const Section& profile) {
  std::vector<std::string> problems;
  if (!systemd_runs() || !has_timer(profile.name, JobKind::report)) {
    return problems;
  }
  const std::string unit = admin::service_of(JobKind::report, profile.name);
  const std::string paths = property(unit, "ReadWritePaths");
  const std::string groups = property(unit, "SupplementaryGroups");
  for (const std::string& folder : folders_elsewhere(profile)) {
    struct stat status {};
    if (is_private(folder)) {
      problems.push_back(folder + " is in a /tmp of the service's own; choose another folder");
    } else if (stat(folder.c_str(), &status) != 0) {
      problems.push_back(folder + " can't be found (" + std::strerror(errno) + "); make it");
    } else if (!allows(paths, folder)) {
      problems.push_back(folder + " is read-only for the service; run vornctl schedule " +
                         profile.name + " --timer, which allows it");
    } else if (!may_write(status, groups)) {
      problems.push_back(folder +
                         " belongs to others, and the service may not write there; run "
                         "chown root " +
                         folder);
    }
  }
  return problems;
}

}  // namespace ctl
