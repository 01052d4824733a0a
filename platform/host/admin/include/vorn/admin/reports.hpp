// The finished reports of a profile, and the settings that say where and for how long they are
// kept.
#pragma once

#include <ctime>
#include <optional>
#include <string>
#include <vector>

#include "vorn/admin/configuration.hpp"

namespace admin {

struct StoredReport {
  std::string name;             // of its folder, which is named as a run names it
  std::string page;             // path of its page
  std::time_t made = 0;         // by its name, or by what it tells of itself
  bool is_whole = false;        // the page is complete; nothing else is ever removed
  unsigned long long size = 0;  // bytes on disk, with everything in it; only if asked for
};

// The folder of the profile's reports. Nothing, after a message, when its `report_dir` can't be
// worked with.
std::optional<std::string> report_folder(const Section& profile);

enum class ReportSize { left_out, measured };
// The reports in `folder`, which belongs to one profile, oldest first. What isn't named as a
// report, and what is a link, isn't listed. Nothing, after a message, when it can't be looked into;
// an absent one is an empty answer.
std::optional<std::vector<StoredReport>> stored_reports(const std::string& folder, ReportSize size);

// Removes the whole report `name` of `folder` and follows no link on the way. False after a
// message, with nothing removed when it isn't a whole report.
bool remove_report(const std::string& folder, const std::string& name);
// Brings the list of the reports in `folder` and the link to the newest up to date, which whoever
// has removed one, or brought one there, does at last. A message for what fails.
void update_index(const std::string& folder);
// Removes every whole report of `folder`, what pages are made of there, and the folder itself when
// nothing else is in it; a message when it stays. False, after a message, when a report is left.
bool remove_all_reports(const std::string& folder);

// Gives `folder` with its reports the path `to`, beside it. False after a message: there is
// something of that name already, or the folder can't be used. An absent one is fine.
bool move_reports(const std::string& folder, const std::string& to);
// Makes the new folder `to`, for a copy of the reports of `folder`, beside it. False, after a
// message or because there is no `folder`.
bool make_folder_like(const std::string& folder, const std::string& to);

// The link to `page` that its mail has; nothing, after a message, when it can't be made.
std::optional<std::string> link_to(const Section& profile, const std::string& page);

// --- Settings -----------------------------------------------------------------------------------
// Each says what is wrong with a value, as the end of a sentence that begins with it ("is not
// absolute"), or nothing.

std::string report_dir_problem(const std::string& value);
std::string link_base_problem(const std::string& value);
std::string keep_reports_problem(const std::string& value);

}  // namespace admin
