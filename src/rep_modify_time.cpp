#include "rep_modify_time.hpp"

#include "report_frame.hpp"

namespace vornreport {
namespace {

constexpr ReportColumn kColumns[] = {raw_column(0), path_column(1), field_column(2),
                                     time_column(3)};

constexpr ReportColumn kFleetColumns[] = {path_column(0), path_column(1), field_column(2),
                                          time_column(3)};

constexpr StatisticsReport kLeastModifyReport{
    .format = report_format::kLeastModify,
    .module = "src/rep_modify_time",
    .sql =
        "select share,path,size,mtime from file_stat where mtime < strftime('%s','now') - "
        "60*60*24*90 order by mtime asc limit 0, 10000;",
    .csv_header = "Share\tFile\tSize(Byte)\tModify Time",
    .share_paths = SharePaths::kLeftOut,
    .columns = kColumns,
    .fleet_sql =
        "select concat(server, ':', share), path, size, mtime from file where {runs} and "
        "mtime < toInt64(intDiv(run, 1000000)) - 60*60*24*90 "
        "order by mtime, id, server, profile limit 10000",
    .fleet_columns = kFleetColumns,
};

constexpr StatisticsReport kMostModifyReport{
    .format = report_format::kMostModify,
    .module = "src/rep_modify_time",
    .sql =
        "select share,path,size,mtime from file_stat where mtime > strftime('%s','now') - "
        "60*60*24*7 order by mtime desc limit 0, 10000;",
    .csv_header = "Share\tFile\tSize(Byte)\tModify Time",
    .share_paths = SharePaths::kImported,
    .columns = kColumns,
    .fleet_sql =
        "select concat(server, ':', share), path, size, mtime from file where {runs} and "
        "mtime > toInt64(intDiv(run, 1000000)) - 60*60*24*7 "
        "order by mtime desc, id, server, profile limit 10000",
    .fleet_columns = kFleetColumns,
};

}  // namespace

const char* least_modify_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kLeastModifyReport.sql;
}

int32_t least_modify_db(ReportArgs* args) {
  return run_statistics_report(kLeastModifyReport, args);
}

const char* most_modify_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kMostModifyReport.sql;
}

int32_t most_modify_db(ReportArgs* args) {
  return run_statistics_report(kMostModifyReport, args);
}

}  // namespace vornreport
