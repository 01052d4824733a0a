#include "rep_folder_usage.hpp"

#include <array>

#include "facts/tallies.hpp"
#include "listed_report.hpp"

namespace vornreport {
namespace {

constexpr std::array kColumns{kPlain, kName, kPlain, kPlain, kMoment};
constexpr ListedReport kReport{.format = report_format::kFolderUsage,
                               .module = "src/rep_folder_usage",
                               .csv_header = "Share\tFolder\tSize(Byte)\tFile Count\tNewest",
                               .columns = kColumns};

}  // namespace

int32_t folder_usage(ReportArgs* args) {
  std::vector<ListedRow> rows;
  for (const LargeFolder& folder : tallies().largest_folders()) {
    rows.push_back({tallies().shares()[folder.share].name(), folder.folder,
                    std::to_string(folder.amount.bytes), std::to_string(folder.amount.files),
                    std::to_string(folder.newest)});
  }
  return run_listed_report(kReport, args, rows);
}

}  // namespace vornreport
