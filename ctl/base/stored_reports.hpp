// The finished reports of a profile. Every failure is thrown as a Failure.
#ifndef VORN_CTL_STORED_REPORTS_HPP
#define VORN_CTL_STORED_REPORTS_HPP

#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

#include "report_format/facts_file.hpp"
#include "vorn/admin/reports.hpp"

namespace ctl {

using admin::ReportSize;
using Reports = std::vector<admin::StoredReport>;

// The folder of the profile's reports; it can't be told when `report_dir` can't be worked with.
std::string folder_of_reports(const admin::Section& profile);

// The reports in `folder`, oldest first, with their sizes if asked for.
Reports reports_in(const std::string& folder, ReportSize size);

// The whole report that is called `date`, else the newest one whose name begins so. Throws a
// Failure when there is none.
const admin::StoredReport& find_report(const std::string& profile, const Reports& reports,
                                       const std::string& date);

// What the report tells of itself; nothing for one of before that, or a damaged one.
std::optional<report_format::Facts> facts_of(const admin::StoredReport& report);

// The report as every command's JSON has it: `name`, `path` of the page, `made`, `bytes`, `whole`,
// and out of report.json `complete`, `level` and `incidents`, null when it doesn't tell.
nlohmann::ordered_json json_of(const admin::StoredReport& report,
                               const std::optional<report_format::Facts>& facts);
// The worst that a report says of what it has seen.
const char* level_of(const report_format::Facts& facts);

// The newest one that is whole, or nothing.
std::optional<admin::StoredReport> newest_whole(const Reports& reports);

}  // namespace ctl

#endif
