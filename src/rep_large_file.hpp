#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// The largest files, biggest first: 200 on the page, 10000 in the CSV file.
int32_t large_file_db(ReportArgs* args);
const char* large_file_statement(const VLIBCSzHash* profile_hash);

}  // namespace vornreport
