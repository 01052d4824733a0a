#include "rep_large_file.hpp"

#include "report_frame.hpp"

namespace vornreport {
namespace {

constexpr ReportColumn kColumns[] = {raw_column(0), path_column(1), field_column(2)};

constexpr ReportColumn kFleetColumns[] = {path_column(0), path_column(1), field_column(2)};

constexpr StatisticsReport kLargeFileReport{
    .format = report_format::kLargeFile,
    .module = "src/rep_large_file",
    .sql = "select share,path,size from file_stat order by size desc limit 0, 10000;",
    .csv_header = "Share\tFile\tSize(Byte)",
    .share_paths = SharePaths::kImported,
    .columns = kColumns,
    .fleet_sql =
        "select concat(server, ':', share), path, size from file where {runs} "
        "order by size desc, id, server, profile limit 10000",
    .fleet_columns = kFleetColumns,
};

}  // namespace

const char* large_file_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kLargeFileReport.sql;
}

int32_t large_file_db(ReportArgs* args) {
  return run_statistics_report(kLargeFileReport, args);
}

}  // namespace vornreport
