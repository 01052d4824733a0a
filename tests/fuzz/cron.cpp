// The times of a schedule in the first line, then a cron file.
#include <stdexcept>

#include "fuzz.hpp"
#include "schedule/jobs.hpp"
#include "vorn/base/cron_times.hpp"

namespace {

constexpr std::time_t kNow = 1'763'463'600;

void check_times(const std::string& text) try {
  const host::CronTimes times(text);
  const host::CronTimes again(times.text());
  fuzz::require(again.text() == times.text(), "times that are written are read");
  const auto next = times.next(kNow);
  fuzz::require(again.next(kNow) == next, "they mean the same");
  fuzz::require(!next || (*next > kNow && *next % 60 == 0), "the next run is a minute to come");
} catch (const std::runtime_error&) {
}

}  // namespace

void fuzz::one(std::string_view text) {
  static const bool plain_zone = setenv("TZ", "UTC0", 1) == 0;
  require(plain_zone, "the zone is set");
  check_times(take_line(text));
  const auto jobs = host::jobs_in("file", text);
  require(static_cast<long>(jobs.size()) <= 1 + std::count(text.begin(), text.end(), '\n'),
          "a line is a job at most");
  for (std::size_t i = 0; i < jobs.size(); ++i) {
    require(jobs[i].profile.find_first_of(" \t\n") == std::string::npos && !jobs[i].profile.empty(),
            "a profile is a word");
    if (i == 0) {
      host::next_run(jobs[i], kNow);
    }
  }
}
