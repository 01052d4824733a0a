// The scheduled runs of the machine, as vornctl tells and removes them.
#ifndef VORN_CTL_JOBS_HPP
#define VORN_CTL_JOBS_HPP

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/configuration.hpp"
#include "vorn/admin/schedules.hpp"

namespace ctl {

inline constexpr std::size_t kLargestCronFile = 1U << 20U;  // that is looked into
inline constexpr const char* kScheduleKey = "schedule_collect_id";
inline constexpr const char* kProgram = "/usr/vorn/bin/vornreport";

using admin::Job;
using admin::JobKind;
using admin::Scheduler;

// "--report" or "--data", as on the command line of vornreport.
const char* option_of(JobKind kind);
const char* word_for(Scheduler scheduler);  // "cron", "timer"

// Throws a Failure when `text`, the content of the cron file `file`, holds anything else than jobs
// of `profile`, comments and blank lines.
void check_runs_only(const std::string& profile, const std::string& file, std::string_view text);

// The next run of a job, if its times are right and ever come. systemd is asked for that of a timer
// whose times aren't known.
std::optional<std::time_t> next_run(const Job& job, std::time_t now);

// When the job runs, for a reader: its times, or "as its unit says".
std::string times_text(const Job& job);

// Why cron would not read `file`, and what to do; empty when nothing is wrong.
std::string cron_file_problem(const std::string& file);

}  // namespace ctl

#endif
