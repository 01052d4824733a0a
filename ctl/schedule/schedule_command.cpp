// vornctl schedule: the cron file or the timers of a profile.
//
// The file and the profile's key are two things, so their order matters: the key is written first
// and removed last. Whatever ends this in between, no job is left that the profile doesn't name,
// and "vornreport --clean" removes what there is.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <nlohmann/json.hpp>

#include "base/ctl.hpp"
#include "base/texts.hpp"
#include "schedule/commands.hpp"
#include "schedule/jobs.hpp"
#include "schedule/removal.hpp"
#include "schedule/timers.hpp"
#include "vorn/admin/runs.hpp"
#include "vorn/base/cron_times.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/paths.h"

namespace ctl {
namespace {

struct Options {
  std::string profile;
  std::string report;
  std::string data;
  bool clean = false;
  bool timer = false;
  bool cron = false;
  bool json = false;
};

// An identifier that no other profile name gives. Cron leaves out files with a dot in their name,
// so a name with dots gets a digest behind it.
std::string id_for(const std::string& profile) {
  if (admin::is_schedule_id(profile)) {
    return profile;
  }
  constexpr std::size_t kKept = 48;
  std::uint32_t digest = 2166136261U;  // FNV-1a
  std::string id;
  for (const char c : profile) {
    digest = (digest ^ static_cast<unsigned char>(c)) * 16777619U;
    id += c == '.' ? '-' : c;
  }
  std::array<char, 16> suffix{};
  std::snprintf(suffix.data(), suffix.size(), "-%08x", digest);
  return id.substr(0, kKept) + suffix.data();
}

// The identifier that the profile has, unless it is of no use: then a new one.
std::string schedule_id(const Section& profile) {
  std::string kept = profile.value(kScheduleKey);
  if (!admin::is_schedule_id(kept)) {
    return id_for(profile.name);
  }
  for (const Section& other : read_profiles()) {
    if (other.name != profile.name && other.value(kScheduleKey) == kept) {
      throw Failure("profile " + other.name + " has the schedule " + kept + ", too; unset " +
                    kScheduleKey + " of one of them");
    }
  }
  return kept;
}

host::CronTimes parse_times(const std::string& option, const std::string& text) {
  try {
    return host::CronTimes(text);
  } catch (const std::runtime_error& error) {
    throw Failure(option + ": " + error.what(), kWrongUsage);
  }
}

// Where cron mails what a job prints is left to the machine (MAILTO, else the owner, root). The
// progress on standard output is dropped, so that a mail comes only when a command complained.
std::string job_line(const std::string& profile, JobKind kind, const std::string& times) {
  // A removed package leaves its schedules: they are silent then.
  return times + " root [ ! -x " + kProgram + " ] || " + kProgram + " " + option_of(kind) + " " +
         profile + " >/dev/null\n";
}

void write_cron_file(const std::string& path, const std::string& text) {
  host::AtomicFile file(path);  // cron leaves the temporary one out: its name begins with a dot
  constexpr mode_t kMode = 0644;
  if (file.fd() < 0 || fchmod(file.fd(), kMode) != 0 || !host::write_all(file.fd(), text) ||
      !file.commit()) {
    throw Failure(path + " can't be written (" + std::strerror(errno) +
                  "); see that cron is installed, or use --timer");
  }
}

// The cron file and the key are read, changed and written by one vornctl at a time. Beside the
// configuration, where only root can take the lock.
host::Fd lock_schedules() {
  constexpr const char* kLock = "/usr/vorn/etc/.vornreport.conf.schedules";
  host::Fd lock(open(kLock, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600));
  if (!lock || flock(lock.get(), LOCK_EX) != 0) {
    throw Failure(std::string(kLock) + " can't be locked (" + std::strerror(errno) +
                  "); see to its folder");
  }
  return lock;
}

// A kind of run that isn't named keeps its times, whoever starts it now.
void keep_times(const std::string& profile, const std::vector<Job>& jobs, std::string& report_times,
                std::string& data_times) {
  for (const Job& job : jobs) {
    std::string& times = job.kind == JobKind::report ? report_times : data_times;
    if (job.profile == profile && times.empty()) {
      times = job.times;
    }
  }
}

std::vector<Job> timers_of(const std::string& profile) {
  std::vector<Job> jobs = admin::scheduled_jobs();
  std::erase_if(
      jobs, [&](const Job& job) { return job.by != Scheduler::timer || job.profile != profile; });
  return jobs;
}

void tell_next(JobKind kind, const std::string& profile, const std::string& times,
               const std::string& by) {
  const auto next = host::CronTimes(times).next(std::time(nullptr));
  print_line(std::string(option_of(kind)) + " " + profile + ": " + times +
             (next ? ", next at " + time_text(*next) : "") + by);
}

void remove_cron_schedule(const Section& profile) {
  if (!remove_cron_file(profile).empty()) {
    change_section(VORN_PATH_CONFIG, profile.name, {{kScheduleKey, std::nullopt}});
  }
}

struct Times {
  JobKind kind;
  std::string times;  // empty: none
};

void set_timers(const Section& profile, const std::array<Times, 2>& all) {
  for (const auto& [kind, times] : all) {
    if (!times.empty()) {
      set_timer(profile, kind, times);
      tell_next(kind, profile.name, times, ", by " + admin::timer_of(kind, profile.name));
    }
  }
  remove_cron_schedule(profile);
}

void set_cron(const Section& profile, const std::string& path, const std::array<Times, 2>& all) {
  std::string text = "# Written by vornctl; change it with vornctl schedule.\n";
  for (const auto& [kind, times] : all) {
    text += times.empty() ? "" : job_line(profile.name, kind, times);
  }
  change_section(VORN_PATH_CONFIG, profile.name, {{kScheduleKey, schedule_id(profile)}});
  write_cron_file(path, text);
  remove_timers(profile.name);
  for (const auto& [kind, times] : all) {
    if (!times.empty()) {
      tell_next(kind, profile.name, times, "");
    }
  }
}

void set_schedule(const Options& options) {
  if (options.profile == "global" && !options.report.empty()) {
    throw Failure("\"global\" stands for the whole server and has no report; give --data only",
                  kWrongUsage);
  }
  // Both are read before anything is written.
  std::string report_times = options.report;
  std::string data_times = options.data;
  if (!report_times.empty()) {
    report_times = parse_times("--report", report_times).text();
  }
  if (!data_times.empty()) {
    data_times = parse_times("--data", data_times).text();
  }
  const host::Fd lock = lock_schedules();
  const Section profile = read_profile(options.profile);
  const std::string path = admin::schedule_file(schedule_id(profile));
  const auto read = host::read_file(path, kLargestCronFile);
  if (!read && access(path.c_str(), F_OK) == 0) {
    throw Failure(path + " can't be read, so it is left as it is; look into it and move it away");
  }
  const std::string before = read.value_or("");
  check_runs_only(profile.name, path, before);
  const std::vector<Job> timers = timers_of(profile.name);
  keep_times(profile.name, admin::jobs_in(path, before), report_times, data_times);
  keep_times(profile.name, timers, report_times, data_times);
  if (report_times.empty() && data_times.empty()) {
    throw Failure("say when: --report or --data with five cron fields; see vornctl(8)",
                  kWrongUsage);
  }
  const std::array<Times, 2> all{{{JobKind::report, report_times}, {JobKind::data, data_times}}};
  if (options.timer || (!options.cron && !timers.empty())) {
    set_timers(profile, all);
  } else {
    set_cron(profile, path, all);
  }
}

// Of a profile that is gone, too: an edited file may have left its jobs behind.
void clean_schedule(const std::string& name) {
  const host::Fd lock = lock_schedules();
  const bool is_gone = admin::is_profile_name(name) && !profile_exists(name);
  const Section profile = is_gone ? Section{name, {}} : read_profile(name);
  const std::vector<std::string> removed = remove_schedule(profile);
  if (is_gone && removed.empty()) {
    read_profile(name);  // which tells of a wrong name
  }
  if (profile.find(kScheduleKey) != nullptr) {
    change_section(VORN_PATH_CONFIG, name, {{kScheduleKey, std::nullopt}});
  }
  if (removed.empty()) {
    print_line("profile " + name + " has no schedule");
  }
  for (const std::string& job : removed) {
    print_line("removed " + job);
  }
  warn_of_jobs(name);
}

// All jobs, or those of one profile.
void show_schedules(const Options& options) {
  if (!options.profile.empty()) {
    read_profile(options.profile);  // which tells of a wrong name
  }
  auto list = nlohmann::ordered_json::array();
  Table table({{"PROFILE"}, {"RUN"}, {"TIMES"}, {"NEXT RUN"}, {"BY"}});
  for (const Job& job : admin::scheduled_jobs()) {
    if (!options.profile.empty() && job.profile != options.profile) {
      continue;
    }
    const auto next = next_run(job, std::time(nullptr));
    const char* kind = job.kind == JobKind::report ? "report" : "data";
    const bool is_timer = job.by == Scheduler::timer;
    table.add({job.profile, kind, times_text(job), next ? time_text(*next) : "-",
               is_timer ? admin::timer_of(job.kind, job.profile) : job.file});
    list.push_back({{"profile", job.profile},
                    {"kind", kind},
                    {"times", nullptr},
                    {"next_run", nullptr},
                    {"scheduler", word_for(job.by)},
                    {"file", job.file}});
    if (!job.times.empty()) {
      list.back()["times"] = job.times;
    }
    if (next) {
      list.back()["next_run"] = json_time(*next);
    }
  }
  if (options.json) {
    print_json(list);
  } else if (table.empty()) {
    print_line(options.profile.empty() ? "no runs are scheduled; see vornctl schedule --help"
                                       : "profile " + options.profile + " has no schedule");
  } else {
    table.print();
  }
}

void schedule(const Options& options) {
  const bool sets =
      !options.report.empty() || !options.data.empty() || options.timer || options.cron;
  if ((options.clean || sets) && options.profile.empty()) {
    throw Failure("name the profile; vornctl schedule alone shows what is scheduled", kWrongUsage);
  }
  if (options.clean) {
    clean_schedule(options.profile);
  } else if (sets) {
    set_schedule(options);
  } else {
    show_schedules(options);
  }
}

}  // namespace

void add_schedule_command(CLI::App& app) {
  auto options = std::make_shared<Options>();
  CLI::App* command =
      app.add_subcommand("schedule", "Print schedules, or have a profile run by the clock");
  add_profile_argument(*command, options->profile)->required(false);
  command
      ->add_option("--report", options->report, "When to make a report: five cron fields or @daily")
      ->type_name("TIMES");
  command->add_option("--data", options->data, "When to only collect data")->type_name("TIMES");
  command->add_flag("--clean", options->clean, "Remove the schedule")
      ->excludes("--report")
      ->excludes("--data");
  command->add_flag("--timer", options->timer, "Let a systemd timer start it, in place of cron")
      ->excludes("--clean");
  command->add_flag("--cron", options->cron, "Let cron start it, in place of a timer")
      ->excludes("--clean")
      ->excludes("--timer");
  add_json_flag(*command, options->json);
  command->callback([options] { schedule(*options); });
}

}  // namespace ctl
