// Where the files of a profile's runs are.
#ifndef VORN_HOST_RUN_PATHS_HPP
#define VORN_HOST_RUN_PATHS_HPP

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/text_containers.hpp"
#include "vorn/base/file_io.hpp"
#include "vorn/text.h"

namespace host {

// Why `dir` can't be a report folder ("is not absolute"), or null. The program puts these paths
// between single quotes in shell commands without escaping them.
const char* report_dir_error(std::string_view dir);

// The folder that the profile's key `report_dir` names, or the default: absolute, without slashes
// at its end (so "/" is the empty text). Nothing, after one log line, when the program couldn't
// work with it: not absolute, with "..", a single quote or a control character, or too long.
std::optional<std::string> report_dir(const char* profile, const VLIBCSzHash& hash);

// The statistics database of `profile`.
std::string statistics_path(const std::string& profile);
// Removes it with its folder. Only for who holds the profile: a run has its rows there. False after
// a log line.
bool remove_statistics(const std::string& profile);

// Opens the folder of a profile's reports, if nobody but root decides what stands in it and above
// it (base/trusted_folder.hpp); no descriptor and a log line otherwise. An absent one is silent,
// with ENOENT.
Fd open_report_folder(const std::string& folder);
// What keeps `dir` from having such folders, with a remedy; empty when nothing does.
std::string report_dir_problem(const std::string& dir);
// The names in an open folder, "." and ".." left out; those up to where it couldn't be read on.
std::vector<std::string> entries_of(const Fd& folder);
// The name that a report has while it isn't finished, by the name that it gets.
std::string unfinished_name(const std::string& name);

// The unfinished reports in `folder`, which belongs to one profile. Nothing, after one log line,
// when `folder` is a link or not this user's; an absent one is an empty answer.
std::optional<std::vector<std::string>> unfinished_reports(const std::string& folder);

// The report run that this process is in the middle of.
struct ReportRun {
  std::string profile;
  std::string unfinished;     // real_path_date
  std::string finished;       // real_path_date_final
  std::string page;           // real_path_report_final
  std::string report_list{};  // of the profile
  std::size_t keep = 0;       // reports that the profile keeps; 0: all
  bool mail_failed = false;
  bool fleet_failed = false;
  VLIBCSzHash settings{0};  // the profile's section
};

std::optional<ReportRun>& report_run();

// The first run at this time in `folder` whose name nothing has, neither finished nor unfinished.
ReportRun unused_run(const std::string& profile, const std::string& folder);

}  // namespace host

#endif
