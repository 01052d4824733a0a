// What the machine shows of a profile: its runs, its reports, and how things are written here.
#ifndef VORN_CTL_PROFILE_STATE_HPP
#define VORN_CTL_PROFILE_STATE_HPP

#include <cstdint>
#include <ctime>
#include <optional>
#include <string>
#include <vector>

#include "base/configuration.hpp"
#include "run/old_reports.hpp"

namespace ctl {

// The profile's own folder of reports. Throws a Failure when `report_dir` can't be worked with.
std::string report_folder(const Section& profile);

// The reports in `folder`, oldest first, with their sizes if asked for. Throws a Failure when the
// folder can't be read.
std::vector<host::StoredReport> reports_in(const std::string& folder, host::ReportSize size);

// The newest one that is whole, or nothing.
std::optional<host::StoredReport> newest_whole(const std::vector<host::StoredReport>& reports);

// The number of samples of volumes that the history holds for `profile` since `start`.
int samples_since(const std::string& profile, std::time_t start);

enum class RunState {
  never_ran,
  running,
  succeeded,
  failed,
  ended_early,  // killed, or the machine went down
  unknown       // the status can't be read
};
RunState run_state(const std::string& profile);
const char* word_for(RunState state);

// The process that runs `profile`; 0 when there is none or it can't be told.
pid_t running_process(const std::string& profile);

std::string size_text(std::uint64_t bytes);  // "1.5 GiB"
std::string time_text(std::time_t time);     // "2026-11-21 04:00", local
std::string json_time(std::time_t time);     // "2026-11-21T04:00:00+0100"

}  // namespace ctl

#endif
