#include "rep_file_owner.hpp"

#include "report_frame.hpp"

namespace vornreport {
namespace {

constexpr ReportColumn kColumns[] = {owner_column(0), field_column(1), field_column(2),
                                     field_column(3)};

constexpr ReportColumn kFleetColumns[] = {path_column(0), path_column(1), field_column(2),
                                          field_column(3)};

constexpr StatisticsReport kFileOwnerReport{
    .format = report_format::kFileOwner,
    .module = "src/rep_file_owner",
    .sql =
        "select owner,share,count(id) as c,sum(size) as s from file_stat group by owner, share "
        "order by owner,s desc,c desc;",
    .csv_header = "Owner\tShare\tFile Count\tSize(Byte)",
    .share_paths = SharePaths::kLeftOut,
    .columns = kColumns,
    .fleet_sql =
        "select owner_name, concat(server, ':', share), count() as c, {sum} as s from file "
        "where {runs} and owner_name != '' group by owner, owner_name, server, share "
        "order by owner, s desc, c desc, server, share",
    .fleet_columns = kFleetColumns,
};

}  // namespace

const char* file_owner_statement(const VLIBCSzHash* /*profile_hash*/) {
  return kFileOwnerReport.sql;
}

int32_t file_owner_db(ReportArgs* args) {
  return run_statistics_report(kFileOwnerReport, args);
}

}  // namespace vornreport
