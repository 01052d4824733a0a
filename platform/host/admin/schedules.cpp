#include "vorn/admin/schedules.hpp"

#include <algorithm>

#include "schedule/jobs.hpp"

namespace admin {
namespace {

host::JobKind kind_of(JobKind kind) {
  return kind == JobKind::report ? host::JobKind::report : host::JobKind::data;
}

std::vector<Job> told(const std::vector<host::Job>& jobs) {
  std::vector<Job> all(jobs.size());
  std::transform(jobs.begin(), jobs.end(), all.begin(), [](const host::Job& job) {
    return Job{job.file, job.kind == host::JobKind::report ? JobKind::report : JobKind::data,
               job.profile, job.times,
               job.by == host::Scheduler::cron ? Scheduler::cron : Scheduler::timer};
  });
  return all;
}

}  // namespace

std::vector<Job> jobs_in(const std::string& file, std::string_view text) {
  return told(host::jobs_in(file, text));
}

std::vector<Job> scheduled_jobs() {
  return told(host::scheduled_jobs());
}

std::string timer_of(JobKind kind, const std::string& profile) {
  return host::timer_of(kind_of(kind), profile);
}

std::string service_of(JobKind kind, const std::string& profile) {
  return host::service_of(kind_of(kind), profile);
}

std::optional<std::time_t> overdue_since(const std::string& profile, std::time_t begun,
                                         std::time_t now) {
  return host::overdue_since(profile, begun, now);
}

}  // namespace admin
