#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// The size of the files of each type and share: once over all files, then for each user named in
// the profile key `limit_user`; at most 100 rows in all. Its CSV file holds the header alone.
int32_t file_group_db(ReportArgs* args);
const char* file_group_statement(const VLIBCSzHash* profile_hash);  // of the first

// The row writer: an sqlite3_exec callback over a report_row_ctx. 0 to go on, -1 on bad arguments.
int FileGroupRowWriter(void* context, int columns, char** values, char** names) noexcept;

}  // namespace vornreport
