#include "rep_share_list.hpp"

#include "report_frame.hpp"

namespace vornreport {
namespace {

constexpr ReportColumn kColumns[] = {raw_column(0), share_volume_column(0), field_column(1)};

constexpr StatisticsReport kShareListReport{
    .format = report_format::kShareList,
    .module = "src/rep_share_list",
    .sql = "select share,sum(size) from file_stat group by share order by sum(size) desc;",
    // One column short of the rows: readers of the file count on the two names.
    .csv_header = "Share\tSize",
    .share_paths = SharePaths::kLeftOut,
    .columns = kColumns,
};

}  // namespace

const char* share_list_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kShareListReport.sql;
}

int32_t share_list_db(ReportArgs* args) {
  return run_statistics_report(kShareListReport, args);
}

}  // namespace vornreport
