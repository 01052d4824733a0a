#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// Files not changed for more than 90 days, oldest first.
int32_t least_modify_db(ReportArgs* args);
const char* least_modify_statement(const VLIBCSzHash* profile_hash);
// Files changed within the last 7 days, newest first.
int32_t most_modify_db(ReportArgs* args);
const char* most_modify_statement(const VLIBCSzHash* profile_hash);

}  // namespace vornreport
