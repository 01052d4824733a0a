// The duplicate file report, in one of two modes: files that share name and size (the default), or
// files of equal content (profile key `duplicate_compare` = true).
#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// The report. 0 or -1.
int32_t duplicate_file(ReportArgs* args);
const char* duplicate_file_statement(const VLIBCSzHash* profile_hash);

// Its query by name and size, and by size alone, in the report frame. 0 or -1.
int32_t duplicate_file_db(ReportArgs* args);
int32_t duplicate_file2_db(ReportArgs* args);

}  // namespace vornreport
