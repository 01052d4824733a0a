// Reports whose rows are in memory when they run: what gathering has counted. Their block and CSV
// file have the form of those of the statistics reports (report_frame.hpp).
#pragma once

#include <span>
#include <string>
#include <vector>

#include "report_format/reports.hpp"
#include "report_frame.hpp"
#include "vornreport/report_args.hpp"

namespace vornreport {

// How a column is written.
struct ListedColumn {
  ColumnText data_text;
  ColumnText csv_text;
};
inline constexpr ListedColumn kPlain{ColumnText::kRaw, ColumnText::kField};
inline constexpr ListedColumn kName{ColumnText::kEscaped, ColumnText::kField};
inline constexpr ListedColumn kMoment{ColumnText::kRaw, ColumnText::kTime};

// One report.
struct ListedReport {
  const report_format::ReportFormat& format;  // name, variable, limits
  const char* module;                         // in log lines
  const char* csv_header;                     // without line feed
  std::span<const ListedColumn> columns;
  // The same over a fleet, out of the rows that its servers have sent of this report.
  const char* fleet_sql = nullptr;
};

// A text for each column; what stands behind them is for the fleet alone.
using ListedRow = std::vector<std::string>;

// Writes the block, the CSV file and the counts of rows. 0; -1 on failure, which is logged.
int32_t run_listed_report(const ListedReport& report, const ReportArgs* args,
                          const std::vector<ListedRow>& rows);

// The same with the rows of the fleet that `args` names.
int32_t run_fleet_report(const ListedReport& report, const ReportArgs* args);

}  // namespace vornreport
