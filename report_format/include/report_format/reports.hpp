// The reports as those who write and those who read them must agree on: names, variables of
// the page's blocks, and how many rows the page gets. The page's script takes them from here too
// (report_format/export).
#pragma once

#include <array>
#include <cstdint>
#include <string_view>

namespace report_format {

// What the page's limit of a report counts.
enum class LimitOf : std::uint8_t {
  kRows,         // all rows together
  kGroups,       // numbered groups, each with all its rows
  kRowsOfTable,  // the rows of each of the block's tables for itself
};

struct ReportFormat {
  const char* name;          // in `report_list`, of the section and of the CSV file
  const char* variable;      // of the block that the section's table reads
  int columns;               // values in a row of that block
  std::uint64_t page_limit;  // 0: none
  std::uint64_t csv_limit;   // 0: none
  LimitOf limit_of = LimitOf::kRows;
  bool has_csv_rows = true;  // whether its rows stand in csv/<name>.csv
  bool of_files = true;      // whether it is made of what gathering finds in the shares
};

inline constexpr ReportFormat kQuotaUsage{
    "quota_usage", "vornQuotaUsageTable", 4, 100, 0, LimitOf::kRowsOfTable, false, false};
inline constexpr ReportFormat kFileOwner{"file_owner", "vornFileOwnerData", 4, 0, 0};
inline constexpr ReportFormat kVolumeUsage{
    "volume_usage", "vornVolumeUsageData", 5, 0, 0, LimitOf::kRows, true, false};
inline constexpr ReportFormat kShareList{"share_list", "vornShareListData", 3, 0, 0};
inline constexpr ReportFormat kFileGroup{"file_group", "vornFileGroupTableData", 3,    100,
                                         10000,        LimitOf::kRows,           false};
inline constexpr ReportFormat kDuplicateFile{"duplicate_file", "vornDuplicateFileData", 5, 200, 0,
                                             LimitOf::kGroups};
inline constexpr ReportFormat kLargeFile{"large_file", "vornLargeFileData", 3, 200, 10000};
inline constexpr ReportFormat kLeastModify{"least_modify", "vornLeastModifyData", 4, 200, 10000};
inline constexpr ReportFormat kMostModify{"most_modify", "vornMostModifyData", 4, 200, 10000};

inline constexpr ReportFormat kFolderUsage{"folder_usage", "vornFolderUsageData", 5, 2000, 10000};
inline constexpr ReportFormat kFileAge{"file_age", "vornFileAgeData", 4, 0, 0};
inline constexpr ReportFormat kGrowth{"growth", "vornGrowthData", 6, 0, 0};
inline constexpr ReportFormat kCoverage{"coverage", "vornCoverageData", 7, 0, 0};

// In the order in which reports run and stand in the page.
inline constexpr std::array kReports{&kQuotaUsage, &kFileOwner,     &kVolumeUsage, &kShareList,
                                     &kFileGroup,  &kDuplicateFile, &kLargeFile,   &kLeastModify,
                                     &kMostModify, &kFolderUsage,   &kFileAge,     &kGrowth,
                                     &kCoverage};

// A report is selected when its name occurs anywhere in the list.
constexpr bool is_selected(std::string_view name, std::string_view report_list) {
  return report_list.find(name) != std::string_view::npos;
}
// What stands between the words of a list, for those who look at single words.
inline constexpr std::string_view kListSeparators = ", \t;";

// The block with the facts of a run.
inline constexpr const char* kFactsVariable = "vornFacts";
// The same object as a file, beside the page.
inline constexpr const char* kFactsFile = "report.json";
inline constexpr const char* kPageFile = "report.html";

}  // namespace report_format
