// The scheduled runs of the machine: lines in cron's files that run vornreport, and its timers.
#ifndef VORN_HOST_JOBS_HPP
#define VORN_HOST_JOBS_HPP

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace host {

enum class JobKind { report, data };
enum class Scheduler { cron, timer };

struct Job {
  std::string file{};  // of cron's, or the timer's link that enables it
  JobKind kind = JobKind::report;
  std::string profile{};
  // As they stand in the file, and cron may find them wrong; empty for a timer whose times others
  // than vornctl have set.
  std::string times{};
  Scheduler by = Scheduler::cron;
};

// The jobs in `text`, the content of the cron file `file`.
std::vector<Job> jobs_in(const std::string& file, std::string_view text);

// The jobs in the files that cron reads, /etc/crontab and those of /etc/cron.d, and the timers that
// are enabled.
std::vector<Job> scheduled_jobs();

// The timer of a profile ("vornreport@weekly.timer"), and the service that it starts.
std::string timer_of(JobKind kind, const std::string& profile);
std::string service_of(JobKind kind, const std::string& profile);

// The next run of a job, if its times are known, right and ever come.
std::optional<std::time_t> next_run(const Job& job, std::time_t now);

// When a report of `profile` was due that has not begun by `now`. `begun` is when the last one
// began, 0 when none has. A run may be late: by a day, or where runs are nearer to each other,
// until the next one is due.
std::optional<std::time_t> overdue_since(const std::string& profile, std::time_t begun,
                                         std::time_t now);

}  // namespace host

#endif
