#pragma once

#include "vornreport/report_args.hpp"

namespace vornreport {

// Every share with gathered files, its volume and the size of its files, largest share first.
int32_t share_list_db(ReportArgs* args);
const char* share_list_statement(const VLIBCSzHash* profile_hash);

}  // namespace vornreport
