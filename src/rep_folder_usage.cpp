#include "rep_folder_usage.hpp"

#include <array>
#include <utility>

#include "facts/tallies.hpp"
#include "listed_report.hpp"

namespace vornreport {
namespace {

constexpr std::array kColumns{kPlain, kName, kPlain, kPlain, kMoment};
constexpr ListedReport kReport{.format = report_format::kFolderUsage,
                               .module = "src/rep_folder_usage",
                               .csv_header = "Share\tFolder\tSize(Byte)\tFile Count\tNewest",
                               .columns = kColumns,
                               .fleet_sql =
                                   "select concat(server, ':', value[1]), value[2], value[3], "
                                   "value[4], value[5] from report_row "
                                   "where {runs} and report = 'folder_usage' "
                                   "order by toUInt64OrZero(value[3]) desc, position, server, "
                                   "profile limit 10000"};

}  // namespace

int32_t folder_usage(ReportArgs* args) {
  if (args->fleet != nullptr) {
    return run_fleet_report(kReport, args);
  }
  std::vector<ListedRow> rows;
  for (LargeFolder& folder : tallies().largest_folders()) {
    ListedRow row{tallies().shares()[folder.share].name(), "", std::to_string(folder.amount.bytes),
                  std::to_string(folder.amount.files), std::to_string(folder.newest)};
    row[1] = std::move(folder.folder);
    rows.push_back(std::move(row));
  }
  return run_listed_report(kReport, args, rows);
}

}  // namespace vornreport
