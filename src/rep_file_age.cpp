#include "rep_file_age.hpp"

#include <array>

#include "facts/tallies.hpp"
#include "listed_report.hpp"
#include "report_format/ages.hpp"

namespace vornreport {
namespace {

constexpr std::array kColumns{kPlain, kPlain, kPlain, kPlain};
constexpr ListedReport kReport{.format = report_format::kFileAge,
                               .module = "src/rep_file_age",
                               .csv_header = "Share\tAge(Days)\tFile Count\tSize(Byte)",
                               .columns = kColumns,
                               .fleet_sql =
                                   "select concat(server, ':', value[1]), value[2], value[3], "
                                   "value[4] from report_row where {runs} and report = 'file_age' "
                                   "order by server, profile, position"};

}  // namespace

// Shares in their order, ages from the youngest on; those without files are left out.
int32_t file_age(ReportArgs* args) {
  if (args->fleet != nullptr) {
    return run_fleet_report(kReport, args);
  }
  std::vector<ListedRow> rows;
  for (const ShareTally& share : tallies().shares()) {
    for (size_t age = 0; age < report_format::kAges.size(); ++age) {
      if (const Amount& amount = share.ages()[age]; amount.files > 0) {
        rows.push_back({share.name(), report_format::kAges[age].name, std::to_string(amount.files),
                        std::to_string(amount.bytes)});
      }
    }
  }
  return run_listed_report(kReport, args, rows);
}

}  // namespace vornreport
