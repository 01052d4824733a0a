// The runs of a profile: who holds it, how the last one ended, and what a killed one has left.
//
// `profile` is always a name that is_profile_name() takes.
#pragma once

#include <sys/types.h>

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "report_format/run_state.hpp"
#include "vorn/admin/configuration.hpp"

namespace admin {

enum class RunState {
  never_ran,
  running,
  succeeded,
  failed,
  ended_early,  // killed, or the machine went down
  unknown       // the status can't be read
};

struct LastRun {
  RunState state = RunState::unknown;
  pid_t process = 0;                // of one that is running; 0 when it can't be told
  report_format::RunStatus status;  // as the last one that got so far has stored it
};
LastRun last_run(const std::string& profile);

// What is wrong with a value of the profile's key metrics_file, as the end of a sentence that
// begins with it, or nothing.
std::string metrics_file_problem(const std::string& value);

// The process of the last run, for whoever looks for its messages. Nothing when none is known.
struct RunTrace {
  pid_t process = 0;
  std::time_t started = 0;
  std::optional<std::time_t> ended;  // when it stored its status last; nothing while it runs
};
std::optional<RunTrace> last_trace(const std::string& profile);

// How far the run that is going on has come; nothing when there is none or it doesn't tell.
std::optional<report_format::Progress> read_progress(const std::string& profile);

// --- Holding ------------------------------------------------------------------------------------

enum class Hold {
  taken,    // until this process ends or takes another profile, no run of it can begin
  running,  // another process holds it
  failed    // after a message
};
Hold hold_profile(const std::string& profile);

// Both are for a profile that this process holds, and remove what its runs have begun: unfinished
// reports, statistics, temporary names; never a finished report. False after a message.
//
// The run was killed: stores that it failed.
bool end_killed_run(const Section& profile);
// The profile is about to go: its status goes as well.
bool forget_runs(const Section& profile);
// The profile is about to be called `to`: its status is told of that name. False after a message.
bool move_status(const std::string& profile, const std::string& to);

// What a killed run of the profile has left, by path. Nothing, after a message, when its folder of
// reports can't be looked into.
std::optional<std::vector<std::string>> leftovers_of(const Section& profile);

// --- Schedules ----------------------------------------------------------------------------------

// Whether `id` can be the value of the profile's key that names its schedule.
bool is_schedule_id(std::string_view id);
// The cron file of a schedule.
std::string schedule_file(const std::string& id);

}  // namespace admin
