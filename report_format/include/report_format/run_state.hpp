// The two small files by which a run tells others how it is doing: its status, kept after it, and
// its progress, removed at its end.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace report_format {

// --- Status: /usr/vorn/var/status/<profile>
// -------------------------------------------------------

// The first line of the file.
inline constexpr const char* kCollecting = "collect_data";
inline constexpr const char* kSuccess = "success";
inline constexpr const char* kFail = "fail";

// Behind it stand "key = value" lines; a reader leaves keys aside that it doesn't know.
struct RunStatus {
  std::string word;
  std::string report{};       // folder name of the finished report; only of kSuccess
  int incidents = 0;          // that the report tells
  bool mail_failed = false;   // its mail reached nobody
  bool fleet_failed = false;  // it is missing from the fleet, which the report couldn't tell
  // Seconds since the epoch, 0 where there is none: of this run, then of runs before it, too.
  std::int64_t started = 0;
  std::int64_t ended = 0;
  std::int64_t report_started = 0;  // when the last run began that was to make a report
  std::int64_t succeeded = 0;       // when the last one ended that made one
};
// Whether the status is that of a run that goes on or was killed. ("global" keeps it when all went
// well.)
inline bool was_cut(const RunStatus& status) {
  return status.word == kCollecting && status.ended == 0;
}
std::string status_text(const RunStatus& status);
RunStatus status_of(std::string_view text);

// --- Progress: /usr/vorn/var/progress/<profile>
// ----------------------------------------------------

enum class Phase : std::uint8_t { kStarting, kGathering, kReporting, kAssembling, kPublishing };

struct Progress {
  Phase phase = Phase::kStarting;
  std::string share;        // kGathering
  std::uint64_t files = 0;  // counted so far, in all shares
  std::string report;       // kReporting
  int number = 0;           // of that report, from 1
  int reports = 0;          // that the run makes
};
// One line of JSON: phase ("starting", "gathering", "reporting", "assembling", "publishing"),
// share, files, report, number, reports.
std::string progress_text(const Progress& progress);
std::optional<Progress> progress_of(std::string_view text);

}  // namespace report_format
