#include "rep_share_list.hpp"

#include "report_frame.hpp"

namespace vornreport {
namespace {

constexpr ReportColumn kColumns[] = {raw_column(0), share_volume_column(0), field_column(1)};

constexpr ReportColumn kFleetColumns[] = {path_column(0), path_column(1), field_column(2)};

constexpr StatisticsReport kShareListReport{
    .format = report_format::kShareList,
    .module = "src/rep_share_list",
    .sql = "select share,sum(size) from file_stat group by share order by sum(size) desc;",
    // One column short of the rows: readers of the file count on the two names.
    .csv_header = "Share\tSize",
    .share_paths = SharePaths::kLeftOut,
    .columns = kColumns,
    .fleet_sql =
        "select concat(server, ':', share), concat(server, ':', volume), s from "
        "(select server, profile, share, {sum} as s from file where {runs} "
        "group by server, profile, share) as sums any inner join "
        "(select server, profile, value[1] as share, value[3] as volume from report_row "
        "where {runs} and report = 'share' and value[3] != '') as shares "
        "using server, profile, share "
        "order by s desc, server, share, profile",
    .fleet_columns = kFleetColumns,
};

}  // namespace

const char* share_list_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kShareListReport.sql;
}

int32_t share_list_db(ReportArgs* args) {
  return run_statistics_report(kShareListReport, args);
}

}  // namespace vornreport
