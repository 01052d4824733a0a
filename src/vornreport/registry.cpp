// How to add a report:
//   1. Add its format to kReports of report_format/reports.hpp, at the place it shall have on the
//      page: name, variable and limits, which page and vornctl take from there.
//   2. Write src/rep_<name>.cpp: a StatisticsReport record, its report function and the function
//      that names its statement; a ListedReport for one whose rows gathering has counted; for
//      others a report function of their own.
//   3. Add its line to kRegistry below, at the same place.
//   4. Add its section to the page: one entry in reportUI/page/src/sections.js, and its texts in
//      the dictionaries of reportUI/template/lang.
#include "vornreport/registry.hpp"

#include <algorithm>
#include <array>
#include <string_view>

#include "facts/run_facts.hpp"
#include "rep_coverage.hpp"
#include "rep_duplicate_file/duplicate_file.hpp"
#include "rep_file_age.hpp"
#include "rep_file_group.hpp"
#include "rep_file_owner.hpp"
#include "rep_folder_usage.hpp"
#include "rep_growth.hpp"
#include "rep_large_file.hpp"
#include "rep_modify_time.hpp"
#include "rep_quota_usage.hpp"
#include "rep_share_list.hpp"
#include "rep_volume_usage.hpp"
#include "report_format/reports.hpp"
#include "vornreport/report_data.hpp"

namespace vornreport {
namespace {

constexpr ReportEntry entry(const report_format::ReportFormat& format, ReportFunction report,
                            StatementFunction statement = nullptr,
                            CollectFunction collect = nullptr) {
  const ReportSource source = format.of_files ? ReportSource::kStatistics : ReportSource::kSystem;
  ReportEntry made{{}, source, report, statement, collect};
  std::string_view(format.name).copy(made.name, sizeof made.name - 1);
  return made;
}

constexpr std::array kRegistry{
    entry(report_format::kQuotaUsage, quota_usage),
    entry(report_format::kFileOwner, file_owner_db, file_owner_statement),
    entry(report_format::kVolumeUsage, volume_usage, nullptr, volume_usage_collect_data),
    entry(report_format::kShareList, share_list_db, share_list_statement),
    entry(report_format::kFileGroup, file_group_db, file_group_statement),
    entry(report_format::kDuplicateFile, duplicate_file, duplicate_file_statement),
    entry(report_format::kLargeFile, large_file_db, large_file_statement),
    entry(report_format::kLeastModify, least_modify_db, least_modify_statement),
    entry(report_format::kMostModify, most_modify_db, most_modify_statement),
    entry(report_format::kFolderUsage, folder_usage),
    entry(report_format::kFileAge, file_age),
    entry(report_format::kGrowth, growth),
    entry(report_format::kCoverage, coverage),
};

// Everyone else goes by the table of formats.
constexpr bool is_table_of_formats() {
  return std::equal(kRegistry.begin(), kRegistry.end(), report_format::kReports.begin(),
                    report_format::kReports.end(),
                    [](const ReportEntry& entry, const report_format::ReportFormat* format) {
                      return std::string_view(entry.name) == format->name;
                    });
}
static_assert(is_table_of_formats());

// Selection looks for a name anywhere in the list, so a name inside another would be selected with
// it.
constexpr bool names_stand_apart() {
  for (const ReportEntry& outer : kRegistry) {
    for (const ReportEntry& inner : kRegistry) {
      const std::string_view name(inner.name);
      if (name.empty() ||
          (&outer != &inner && std::string_view(outer.name).find(name) != std::string_view::npos)) {
        return false;
      }
    }
  }
  return true;
}
static_assert(names_stand_apart());

}  // namespace

std::span<const ReportEntry> report_registry() {
  return kRegistry;
}

void run_report(const ReportEntry& entry, ReportArgs& args) {
  const auto found_no_quotas = [&] {
    return entry.name == std::string_view(report_format::kQuotaUsage.name) && run_facts().quotas &&
           run_facts().quotas->users().empty() && !report_data_lost();
  };
  if (entry.report(&args) < 0 && !found_no_quotas()) {
    tell_failed_report(entry.name);
  }
}

bool is_selected(const ReportEntry& entry, const char* report_list) {
  return report_format::is_selected(entry.name, report_list);
}

}  // namespace vornreport
