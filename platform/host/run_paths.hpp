// Where the files of a profile's runs are.
#ifndef VORN_HOST_RUN_PATHS_HPP
#define VORN_HOST_RUN_PATHS_HPP

#include <optional>
#include <string>
#include <vector>

#include "vorn/text.h"

namespace host {

// The folder that the profile's key `report_dir` names, or the default: absolute, without slashes
// at its end (so "/" is the empty text). Nothing, after one log line, when the program couldn't
// work with it: not absolute, with "..", a single quote or a control character, or too long.
std::optional<std::string> report_dir(const char* profile, const VLIBCSzHash& hash);

// The statistics database of `profile`.
std::string statistics_path(const std::string& profile);
// Removes it, with its journal.
void remove_statistics(const std::string& profile);

// The unfinished reports in `folder`, which belongs to one profile. Nothing, after one log line,
// when `folder` is a link or not this user's; an absent one is an empty answer.
std::optional<std::vector<std::string>> unfinished_reports(const std::string& folder);

// The report run that this process is in the middle of.
struct ReportRun {
  std::string profile;
  std::string unfinished;  // real_path_date
  std::string finished;    // real_path_date_final
  std::string page;        // real_path_report_final
};

std::optional<ReportRun>& report_run();

}  // namespace host

#endif
