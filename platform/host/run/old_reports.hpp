// The finished reports of a profile, and the removal of old ones.
#ifndef VORN_HOST_OLD_REPORTS_HPP
#define VORN_HOST_OLD_REPORTS_HPP

#include <cstddef>
#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vorn/base/file_io.hpp"
#include "vorn/text.h"

namespace host {

// A folder that is named as a run names its finished report.
struct StoredReport {
  std::string name;             // YYYY-MM-DD_HH-MM-SS, with -2, -3... for later ones of one second
  std::time_t made = 0;         // when its run began, by its facts; else the name's local time
  bool is_whole = false;        // its report.html is a complete page; nothing else is ever removed
  unsigned long long size = 0;  // bytes on disk, with everything in it; only if asked for
};

enum class ReportSize { left_out, measured };

// Whether a run could have named its report so.
bool is_report_name(std::string_view name);

// The reports in `folder`, which belongs to one profile (report_dir and the profile's name), oldest
// first; those dated more than a day ahead, by a clock that was wrong, come before all others. What
// isn't named as a report, and what is a link, isn't listed. Nothing, after one log line, when
// `folder` is a link, not this user's, or can't be read; an absent one is an empty answer.
std::optional<std::vector<StoredReport>> stored_reports(const std::string& folder, ReportSize size);
// The same of a folder that open_report_folder() has opened.
std::vector<StoredReport> list_reports(const Fd& folder, ReportSize size);

// Removes the whole report `name` of `folder` and follows no link on the way. It loses its name
// first, so that a removal which is cut short leaves something that the profile's next run clears
// up. True when it is gone; otherwise false after one log line, with nothing removed when `name`
// isn't a whole report.
bool remove_report(const std::string& folder, const std::string& name);

// How many reports the profile's key `keep_reports` keeps; 0 is all: the key is unset, or after one
// log line no number from 1 on.
std::size_t reports_to_keep(const char* profile, const VLIBCSzHash& hash);

// Removes the oldest whole reports of `folder` until `keep` are left, but never `newest`. One log
// line for each that can't be removed.
void remove_old_reports(const std::string& folder, std::size_t keep, std::string_view newest);

}  // namespace host

#endif
