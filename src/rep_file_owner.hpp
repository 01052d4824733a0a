#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// For every owner and share the number of files and their bytes, largest first within each owner.
int32_t file_owner_db(ReportArgs* args);
const char* file_owner_statement(const VLIBCSzHash* profile_hash);

}  // namespace vornreport
