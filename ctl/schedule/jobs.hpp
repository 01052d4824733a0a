// The scheduled runs of the machine: lines in cron's files that run vornreport.
#ifndef VORN_CTL_JOBS_HPP
#define VORN_CTL_JOBS_HPP

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/configuration.hpp"

namespace ctl {

inline constexpr std::size_t kLargestCronFile = 1U << 20U;  // that is looked into
inline constexpr const char* kScheduleKey = "schedule_collect_id";
inline constexpr const char* kProgram = "/usr/vorn/bin/vornreport";

enum class JobKind { report, data };
// "--report" or "--data", as on the command line of vornreport.
const char* option_of(JobKind kind);

// A line of a cron file that runs a profile.
struct Job {
  std::string file;
  JobKind kind = JobKind::report;
  std::string profile;
  std::string times;  // as it stands in the file; cron may find it wrong
};

// The jobs in `text`, the content of the cron file `file`.
std::vector<Job> jobs_in(const std::string& file, std::string_view text);
// Throws a Failure when `text`, the content of the cron file `file`, holds anything else than jobs
// of `profile`, comments and blank lines.
void check_runs_only(const std::string& profile, const std::string& file, std::string_view text);

// The jobs in the files that cron reads: /etc/crontab and those of /etc/cron.d.
std::vector<Job> scheduled_jobs();

// The next run of a job, if its times are right and ever come.
std::optional<std::time_t> next_run(const Job& job, std::time_t now);

// Why cron would not read `file`, and what to do; empty when nothing is wrong.
std::string cron_file_problem(const std::string& file);

// Removes the cron file of the profile's schedule, if it runs nothing else. Its path, or an empty
// text when the profile has no schedule. Throws a Failure when it stays.
std::string remove_cron_file(const Section& profile);

}  // namespace ctl

#endif
